// Machine code: disassembly windows before and after an address agree on
// where instructions start, unreadable memory lists as invalid instructions,
// an instruction breakpoint stops on its instruction, and goto skips lines.
'use strict';

const assert = require('node:assert/strict');
const fs = require('node:fs');
const { test } = require('node:test');
const s = require('./support');

const disassemble = async (client, memoryReference, instructionOffset, instructionCount) =>
  (await client.send('disassemble', { memoryReference, instructionOffset, instructionCount })).body.instructions;

/// The address right after Instruction, from its bytes.
const after = (instruction) =>
  BigInt(instruction.address) + BigInt(instruction.instructionBytes.split(' ').length);

test('disassembly windows line up, unreadable bytes are invalid, an instruction breakpoint stops there', async () => {
  const dir = s.scratchDir();
  const client = await s.startClient(dir);
  try {
    const program = s.debuggee('sourcelines');
    const { body: { threadId } } = await s.launch(client, { program, cwd: dir, stopAtEntry: true });
    const pc = (await s.topFrame(client, threadId)).instructionPointerReference;

    const back = await disassemble(client, pc, -10, 20);
    const ahead = await disassemble(client, pc, 0, 10);
    assert.equal(back.length, 20);
    assert.deepEqual(back.slice(10).map((i) => i.address), ahead.map((i) => i.address));
    for (let i = 0; i + 1 < back.length; ++i)
      assert.equal(after(back[i]), BigInt(back[i + 1].address), JSON.stringify(back[i]));
    assert.ok(back.every((i) => i.presentationHint !== 'invalid'));
    assert.equal(ahead[0].symbol, 'main');
    assert.equal(ahead[0].location.path, s.source('sourcelines.c'));
    assert.ok(ahead[0].line > 0);
    const skipped = await disassemble(client, pc, 3, 2);
    assert.deepEqual(skipped.map((i) => i.address), ahead.slice(3, 5).map((i) => i.address));

    const pid = s.processesIn(dir).map((line) => line.split(' ')[0])
      .find((id) => fs.readlinkSync(`/proc/${id}/exe`) === program);
    const end = s.endBeforeGap(pid);
    const edge = await disassemble(client, `0x${(end - 8n).toString(16)}`, 0, 16);
    assert.equal(edge.length, 16);
    for (const instruction of edge)
      assert.equal(instruction.presentationHint === 'invalid', BigInt(instruction.address) >= end,
        JSON.stringify(edge));
    const gap = await disassemble(client, `0x${(end + 16n).toString(16)}`, -4, 8);
    assert.deepEqual(gap.map((i) => BigInt(i.address) - end), [12n, 13n, 14n, 15n, 16n, 17n, 18n, 19n]);
    assert.ok(gap.every((i) => i.presentationHint === 'invalid'));

    const next = ahead[1].address;
    const set = await client.send('setInstructionBreakpoints', { breakpoints: [{ instructionReference: next }] });
    assert.equal(set.body.breakpoints[0].verified, true);
    await s.stopAfter(client, () => client.continueRequest({ threadId }));
    assert.equal((await s.topFrame(client, threadId)).instructionPointerReference, next);
  } finally {
    await client.stop();
    fs.rmSync(dir, { recursive: true, force: true });
  }
});

test('goto moves the next statement: the lines skipped do not run', async () => {
  const client = await s.startClient();
  try {
    const source = s.source('sourcelines.c');
    const lines = fs.readFileSync(source, 'utf8').split('\n');
    const from = lines.indexOf('  total += 1;') + 1;
    const to = lines.indexOf('  total += 100;') + 1;
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug' });
    await initialized;
    await client.launchRequest({ program: s.debuggee('sourcelines') });
    await client.setBreakpointsRequest({ source: { path: source }, breakpoints: [{ line: from }] });
    const { body: { threadId } } = await s.stopAfter(client, () => client.configurationDoneRequest());

    const targets = (await client.send('gotoTargets', { source: { path: source }, line: to })).body.targets;
    assert.equal(targets.length, 1);
    assert.equal(targets[0].line, to);
    const stopped = await s.stopAfter(client, () => client.send('goto', { threadId, targetId: targets[0].id }));
    assert.equal(stopped.body.reason, 'goto');
    assert.equal((await s.topFrame(client, threadId)).line, to);
    await assert.rejects(client.send('goto', { threadId, targetId: 99 }), /targetId/);

    // 0 + 1 + 2 from the loop, then only 100: the +1 and +10 were skipped.
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId });
    assert.equal((await exited).body.exitCode, 103);
  } finally {
    await client.stop();
  }
});

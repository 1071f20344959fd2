// Memory requests: a read across the end of readable memory returns the
// readable part and counts the rest; a write reads back and is announced.
// The modules request lists what module events announced.
'use strict';

const assert = require('node:assert/strict');
const fs = require('node:fs');
const { test } = require('node:test');
const s = require('./support');

test('memory reads stop at unreadable bytes, a write reads back with a memory event; modules are listed', async () => {
  const dir = s.scratchDir();
  const client = await s.startClient(dir);
  try {
    const program = s.debuggee('memory');
    await s.launch(client, { program, cwd: dir, stopAtEntry: true });
    const pid = s.processesIn(dir).map((line) => line.split(' ')[0])
      .find((id) => fs.readlinkSync(`/proc/${id}/exe`) === program);
    const end = s.endBeforeGap(pid);
    const before = `0x${(end - 16n).toString(16)}`;

    const read = await client.send('readMemory', { memoryReference: before, count: 32 });
    assert.equal(BigInt(read.body.address), end - 16n);
    assert.equal(Buffer.from(read.body.data, 'base64').length, 16);
    assert.equal(read.body.unreadableBytes, 16);
    const none = await client.send('readMemory', { memoryReference: before, offset: 16, count: 8 });
    assert.equal(none.body.data, undefined);
    assert.equal(none.body.unreadableBytes, 8);

    const written = Buffer.from([0xde, 0xad, 0xbe, 0xef]);
    const event = client.waitForEvent('memory');
    const write = await client.send('writeMemory', { memoryReference: before, offset: 4, data: written.toString('base64') });
    assert.equal(write.body.bytesWritten, 4);
    assert.deepEqual((await event).body, { memoryReference: `0x${(end - 12n).toString(16)}`, offset: 0, count: 4 });
    const back = await client.send('readMemory', { memoryReference: before, offset: 4, count: 4 });
    assert.deepEqual(Buffer.from(back.body.data, 'base64'), written);

    await assert.rejects(client.send('writeMemory', { memoryReference: before, data: 'not*base64' }), /base64/);
    await assert.rejects(client.send('readMemory', { memoryReference: 'main', count: 4 }), /memoryReference/);

    const modules = (await client.send('modules', {})).body;
    assert.equal(modules.totalModules, modules.modules.length);
    assert.ok(modules.modules.some((module) => /libc\.so/.test(module.path || module.name)), JSON.stringify(modules));
    const page = (await client.send('modules', { startModule: 1, moduleCount: 1 })).body;
    assert.deepEqual(page.modules, [modules.modules[1]]);
  } finally {
    await client.stop();
    fs.rmSync(dir, { recursive: true, force: true });
  }
});

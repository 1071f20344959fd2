// Data breakpoints, the memory an assignment changes, and the program's
// sources.
'use strict';

const assert = require('node:assert/strict');
const fs = require('node:fs');
const { test } = require('node:test');
const s = require('./support');

test('a data breakpoint sees a write to the upper half of a long; watches beyond the hardware are refused; ' +
     'assignments to memory are announced; sources are listed and read', async () => {
  const client = await s.startClient();
  try {
    // No rounds: the only write to counter is the one to its upper half.
    const stopped = await s.launch(client, { program: s.debuggee('breakpoints'), args: ['0'], stopAtEntry: true });
    const threadId = stopped.body.threadId;
    const frameId = (await s.topFrame(client, threadId)).id;
    const info = async (name) => (await client.send('dataBreakpointInfo', { name, frameId })).body;
    const verdicts = async (dataIds) => (await client.send('setDataBreakpoints',
      { breakpoints: dataIds.map((dataId) => ({ dataId })) })).body.breakpoints;

    const counter = await info('counter');
    assert.match(counter.dataId, /^0x[0-9a-f]+\/8$/);
    assert.match(counter.description, /^counter \(8 bytes at 0x[0-9a-f]+\)$/);
    assert.equal((await info('counter + 1')).dataId, null);
    const beside = await Promise.all([1, 2, 3, 4].map((i) => info(`((long*)&counter)[${i}]`)));
    const crowded = await verdicts([counter, ...beside].map((x) => x.dataId));
    assert.deepEqual(crowded.map((b) => b.verified), [true, true, true, true, false]);
    assert.match(crowded[4].message, /processor cannot watch .* at most 4 hardware watchpoints of up to 8 bytes/);
    const wide = await verdicts([counter.dataId, (await info('*(char(*)[64])&counter')).dataId]);
    assert.deepEqual(wide.map((b) => b.verified), [true, false]);
    assert.match(wide[1].message, /processor cannot watch this many bytes/);

    // A register changes no memory: the first memory event is the global's.
    const memory = client.waitForEvent('memory');
    const scopes = (await client.scopesRequest({ frameId })).body.scopes;
    await client.send('variables', { variablesReference: scopes[2].variablesReference });
    await client.send('setVariable', { variablesReference: scopes[2].variablesReference, name: 'rsi', value: '1' });
    await client.send('setExpression', { expression: 'sink', value: '7', frameId });
    const sink = await info('sink');
    assert.deepEqual((await memory).body, { memoryReference: sink.dataId.split('/')[0], offset: 0, count: 4 });

    const sources = (await client.send('loadedSources', {})).body.sources;
    const own = sources.find((source) => source.name === 'breakpoints.c');
    assert.ok(own, JSON.stringify(sources));
    assert.equal((await client.send('source', { source: { path: own.path }, sourceReference: 0 })).body.content,
      fs.readFileSync(s.source('breakpoints.c'), 'utf8'));
    await assert.rejects(client.send('source', { source: { sourceReference: 5 }, sourceReference: 5 }), /reference 5/);

    const hit = await s.stopAfter(client, () => client.continueRequest({ threadId }));
    assert.equal(hit.body.reason, 'data breakpoint');
    assert.deepEqual(hit.body.hitBreakpointIds, [wide[0].id]);
    assert.match(hit.body.description, /counter \(8 bytes at 0x[0-9a-f]+\) changed/);
    const written = s.markerLine('breakpoints.c', 'upper-write');
    assert.ok([written, written + 1].includes((await s.topFrame(client, threadId)).line));
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId });
    assert.equal((await exited).body.exitCode, 1);
  } finally {
    await client.stop();
  }
});

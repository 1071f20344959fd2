// Values of a stopped C program: scopes, variables paged, evaluation and
// assignment.
'use strict';

const assert = require('node:assert/strict');
const fs = require('node:fs');
const { test } = require('node:test');
const s = require('./support');

const stopLine = fs.readFileSync(s.source('values.c'), 'utf8').split('\n').findIndex((l) => l.includes('/* stop here */')) + 1;

async function variables(client, variablesReference, extra) {
  return (await client.variablesRequest({ variablesReference, ...extra })).body.variables;
}

test('scopes, variables, evaluate and assignments of a C frame; a 100,000-element array pages', async () => {
  const client = await s.startClient();
  try {
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug', supportsMemoryReferences: true });
    await initialized;
    await client.setBreakpointsRequest({ source: { path: s.source('values.c') }, breakpoints: [{ line: stopLine }] });
    const stopped = client.waitForEvent('stopped');
    await Promise.all([client.configurationDoneRequest(), client.launchRequest({ program: s.debuggee('values') })]);
    const stop = (await stopped).body;
    const frame = await s.topFrame(client, stop.threadId);
    assert.equal(frame.line, stopLine);

    const scopes = (await client.scopesRequest({ frameId: frame.id })).body.scopes;
    assert.deepEqual(scopes.map((x) => x.name), ['Locals', 'Arguments', 'Registers']);
    const registers = await variables(client, scopes[2].variablesReference);
    assert.ok(registers.length >= 16 && registers.every((r) => /^0x[0-9a-f]+$/.test(r.value)), JSON.stringify(registers));
    const args = await variables(client, scopes[1].variablesReference);
    assert.deepEqual(args.map((v) => v.name), ['number', 'scale', 'mark', 'where']);
    assert.equal(args[0].value, '3');
    assert.ok(args[3].variablesReference > 0, 'a pointer expands');
    // Its memory is where it points: the first member, x, is there.
    const pointed = await client.send('readMemory', { memoryReference: args[3].memoryReference, count: 4 });
    const x = await client.evaluateRequest({ expression: 'where->x', frameId: frame.id, context: 'watch' });
    assert.equal(Buffer.from(pointed.body.data, 'base64').readInt32LE(0), Number(x.body.result));
    assert.equal((await variables(client, scopes[1].variablesReference, { format: { hex: true } }))[0].value, '0x3');
    const locals = await variables(client, scopes[0].variablesReference);
    const area = locals.find((v) => v.name === 'area');
    const corners = await variables(client, area.variablesReference);
    assert.deepEqual(corners.map((v) => v.name), ['topleft', 'bottomright']);
    const topleft = await variables(client, corners[0].variablesReference);
    assert.equal(topleft[0].value, '1');
    const again = await client.evaluateRequest({ expression: topleft[0].evaluateName, frameId: frame.id, context: 'watch' });
    assert.equal(again.body.result, '1');

    // The big array pages: its last ten elements.
    const big = (await client.evaluateRequest({ expression: 'big', frameId: frame.id, context: 'watch' })).body;
    assert.equal(big.indexedVariables, 100000);
    const tail = await variables(client, big.variablesReference, { start: 99990, count: 10 });
    assert.deepEqual(tail.map((v) => v.value), Array.from({ length: 10 }, (_, i) => String(99990 + i)));
    assert.equal((await variables(client, big.variablesReference, { start: 5, count: 1 }))[0].value, '5');

    // setVariable, setExpression, and evaluate for hovers and in hex.
    const set = await client.setVariableRequest({ variablesReference: scopes[1].variablesReference, name: 'number', value: '42' });
    assert.equal(set.body.value, '42');
    await client.send('setExpression', { expression: 'pt.x', value: '77', frameId: frame.id });
    const hover = await client.evaluateRequest({ expression: 'number + pt.x', frameId: frame.id, context: 'hover' });
    assert.equal(hover.body.result, '119');
    const hex = await client.evaluateRequest({ expression: 'counter', frameId: frame.id, context: 'repl', format: { hex: true } });
    assert.equal(hex.body.result, '0x7');
    await assert.rejects(client.evaluateRequest({ expression: 'no_such_thing', frameId: frame.id }), /no_such_thing/);
    await assert.rejects(client.setVariableRequest({ variablesReference: scopes[1].variablesReference, name: 'nope', value: '1' }));
    await assert.rejects(client.variablesRequest({ variablesReference: 9999 }), /no variables reference/);
  } finally {
    await client.stop();
  }
});

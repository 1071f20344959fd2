// Breakpoints: conditions, hit conditions, log messages, functions and
// language exceptions.
'use strict';

const assert = require('node:assert/strict');
const { test } = require('node:test');
const s = require('./support');

/// Counter's value and the line at each stop until the program exits.
async function stopsUntilExit(client) {
  const seen = [];
  const events = [];
  let wake = null;
  const push = (event) => { events.push(event); if (wake) wake(); };
  client.on('stopped', push);
  client.on('exited', push);
  for (;;) {
    while (events.length === 0)
      await new Promise((resolve) => { wake = resolve; });
    const event = events.shift();
    if (event.event === 'exited')
      return seen;
    const frame = await s.topFrame(client, event.body.threadId);
    const counter = (await client.evaluateRequest({ expression: 'counter', frameId: frame.id, context: 'watch' })).body;
    seen.push(`${frame.line}:${counter.result}:${event.body.reason}`);
    await client.continueRequest({ threadId: event.body.threadId });
  }
}

test('hit conditions and a condition count a loop; a log point prints and runs on', async () => {
  const client = await s.startClient();
  try {
    const add = s.markerLine('breakpoints.c', 'bump-add');
    const call = s.markerLine('breakpoints.c', 'main-call');
    const write = s.markerLine('breakpoints.c', 'upper-write');
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug' });
    await initialized;
    await client.launchRequest({ program: s.debuggee('breakpoints'), args: ['10'] });
    const set = await client.setBreakpointsRequest({
      source: { path: s.source('breakpoints.c') },
      breakpoints: [
        { line: add, hitCondition: '%4' },
        // Only odd rounds count; from the 4th of them (round 7) on.
        { line: call, condition: 'round % 2 == 1', hitCondition: ' >= 4 ' },
        { line: write, logMessage: 'counter is {counter}, {nosuch}' },
        { line: add, hitCondition: 'often' },
      ],
    });
    const answered = set.body.breakpoints;
    assert.deepEqual(answered.map((b) => b.verified), [true, true, true, false]);
    assert.match(answered[3].message, /often.*none of N/);
    await client.configurationDoneRequest();
    // round 3 (4th hit of %4), round 7 (>=4 odd rounds), round 7 (8th hit), round 9.
    assert.deepEqual(await stopsUntilExit(client),
      [`${add}:3:breakpoint`, `${call}:7:breakpoint`, `${add}:7:breakpoint`, `${call}:9:breakpoint`]);
    assert.match(s.outputOf(client, 'console'), /counter is 10, <nosuch: /);
  } finally {
    await client.stop();
  }
});

test('a function breakpoint on the Nth hit, set before the program is there, is verified by an event', async () => {
  const client = await s.startClient();
  try {
    const changed = [];
    client.on('breakpoint', (event) => changed.push(event.body.breakpoint));
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug' });
    await initialized;
    const set = await client.setFunctionBreakpointsRequest({ breakpoints: [{ name: 'bump', hitCondition: '2' }, { name: 'no_such_function' }] });
    const [bump, missing] = set.body.breakpoints;
    assert.equal(bump.verified, false);
    const stopped = client.waitForEvent('stopped');
    await Promise.all([client.configurationDoneRequest(), client.launchRequest({ program: s.debuggee('breakpoints') })]);
    const stop = (await stopped).body;
    assert.equal(stop.reason, 'breakpoint');
    assert.deepEqual(stop.hitBreakpointIds, [bump.id]);
    const counter = await client.evaluateRequest({ expression: 'counter' });
    assert.equal(counter.body.result, '1');
    const verified = changed.find((b) => b.id === bump.id && b.verified);
    assert.ok(verified, JSON.stringify(changed));
    assert.equal(verified.line, s.markerLine('breakpoints.c', 'bump-add'));
    assert.ok(!changed.some((b) => b.id === missing.id && b.verified));
  } finally {
    await client.stop();
  }
});

/// Launches Program with the exception Filters and resolves with the first stop.
async function exceptionStop(client, program, filters) {
  const initialized = client.waitForEvent('initialized');
  const init = await client.initializeRequest({ adapterID: 'midebug' });
  assert.deepEqual(init.body.exceptionBreakpointFilters.map((f) => f.filter), ['cpp_throw', 'cpp_catch', 'pascal_raise']);
  await initialized;
  await client.setExceptionBreakpointsRequest({ filters });
  const stopped = client.waitForEvent('stopped');
  await Promise.all([client.configurationDoneRequest(), client.launchRequest({ program: s.debuggee(program) })]);
  return (await stopped).body;
}

test('a C++ throw stops with the type and message; without filters the program runs on', async () => {
  const client = await s.startClient();
  try {
    const stop = await exceptionStop(client, 'throws', ['cpp_throw']);
    assert.equal(stop.reason, 'exception');
    assert.match(stop.description, /std::runtime_error: round 0/);
    const info = (await client.send('exceptionInfo', { threadId: stop.threadId })).body;
    assert.equal(info.exceptionId, 'std::runtime_error');
    assert.equal(info.details.message, 'round 0');
    await assert.rejects(client.setExceptionBreakpointsRequest({ filters: ['everything'] }), /unknown exception filter/);
    // No filter left: the program runs to its end, all caught.
    await client.setExceptionBreakpointsRequest({ filters: [] });
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId: stop.threadId });
    assert.equal((await exited).body.exitCode, 0);
  } finally {
    await client.stop();
  }
});

test('a Pascal raise stops with the class and message', async () => {
  const client = await s.startClient();
  try {
    const stop = await exceptionStop(client, 'raises', ['pascal_raise']);
    assert.equal(stop.reason, 'exception');
    assert.match(stop.description, /ETOODEEP|ETooDeep/i);
    assert.match(stop.description, /depth 12 is too deep/);
    const frames = (await client.stackTraceRequest({ threadId: stop.threadId })).body.stackFrames;
    assert.ok(frames.some((f) => f.line === s.markerLine('raises.pas', 'raise')), JSON.stringify(frames));
  } finally {
    await client.stop();
  }
});

test('a breakpoint in a library not loaded yet is pending, then verified by an event and hit', async () => {
  const client = await s.startClient();
  try {
    const verified = new Promise((resolve) => client.on('breakpoint', (event) => event.body.breakpoint.verified && resolve(event.body.breakpoint)));
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug' });
    await initialized;
    await client.launchRequest({ program: s.debuggee('pluginhost') });
    const set = await client.setBreakpointsRequest({ source: { path: s.source('plug.c') }, breakpoints: [{ line: 1 }] });
    assert.equal(set.body.breakpoints[0].verified, false);
    const stopped = client.waitForEvent('stopped');
    await client.configurationDoneRequest();
    const placed = await verified;
    assert.equal(placed.id, set.body.breakpoints[0].id);
    assert.equal(placed.line, 1);
    const stop = (await stopped).body;
    assert.deepEqual([stop.reason, stop.hitBreakpointIds], ['breakpoint', [placed.id]]);
  } finally {
    await client.stop();
  }
});

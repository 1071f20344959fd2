// What the adapter promises whatever the client does: it advertises what it
// serves, refuses the rest in words, survives garbage and lying lengths, and
// leaves nothing running when the client goes.
'use strict';

const assert = require('node:assert/strict');
const { spawn } = require('node:child_process');
const { test } = require('node:test');
const s = require('./support');

/// An adapter driven with raw bytes; resolves each response by its seq.
function rawAdapter(cwd) {
  const child = spawn(s.adapter, [], { cwd, stdio: ['pipe', 'pipe', 'inherit'] });
  const messages = [];
  const waiters = [];
  let buffer = Buffer.alloc(0);
  child.stdout.on('data', (data) => {
    buffer = Buffer.concat([buffer, data]);
    for (;;) {
      const end = buffer.indexOf('\r\n\r\n');
      if (end < 0)
        break;
      const length = Number(/Content-Length: (\d+)/.exec(buffer.subarray(0, end).toString())[1]);
      if (buffer.length < end + 4 + length)
        break;
      messages.push(JSON.parse(buffer.subarray(end + 4, end + 4 + length).toString()));
      buffer = buffer.subarray(end + 4 + length);
    }
    for (const waiter of waiters.splice(0))
      waiter();
  });
  const frame = (object) => {
    const body = Buffer.from(JSON.stringify(object));
    return Buffer.concat([Buffer.from(`Content-Length: ${body.length}\r\n\r\n`), body]);
  };
  return {
    child,
    messages,
    frame,
    write: (bytes) => child.stdin.write(bytes),
    async response(seq) {
      const deadline = Date.now() + s.WAIT;
      for (;;) {
        const found = messages.find((m) => m.type === 'response' && m.request_seq === seq);
        if (found)
          return found;
        assert.ok(Date.now() < deadline, `no response to ${seq}`);
        await new Promise((resolve) => waiters.push(resolve));
      }
    },
  };
}

test('initialize advertises what is served, and the rest is refused in words', async () => {
  const client = await s.startClient();
  try {
    const capabilities = (await client.initializeRequest({ adapterID: 'midebug' })).body;
    for (const served of ['supportsConfigurationDoneRequest', 'supportsTerminateRequest', 'supportsCancelRequest',
                          'supportsSteppingGranularity', 'supportsDelayedStackTraceLoading', 'supportTerminateDebuggee',
                          'supportsFunctionBreakpoints', 'supportsConditionalBreakpoints', 'supportsSetVariable',
                          'supportsEvaluateForHovers', 'supportsHitConditionalBreakpoints', 'supportsLogPoints', 'supportsReadMemoryRequest',
                          'supportsDataBreakpoints', 'supportsLoadedSourcesRequest', 'supportsDisassembleRequest',
                          'supportsInstructionBreakpoints', 'supportsGotoTargetsRequest'])
      assert.equal(capabilities[served], true, served);
    for (const missing of ['supportsRestartRequest'])
      assert.notEqual(capabilities[missing], true, missing);
    await assert.rejects(client.initializeRequest({ adapterID: 'midebug' }), /already/);

    // Without their arguments, or with no program, each is refused in words.
    for (const [request, problem] of [['setBreakpoints', /needs 'source'/], ['setFunctionBreakpoints', /needs a list/],
      ['breakpointLocations', /needs 'source'/], ['scopes', /'frameId' is missing/], ['variables', /'variablesReference'/],
      ['evaluate', /needs an 'expression'/], ['setVariable', /needs 'variablesReference'/],
      ['setExpression', /needs 'expression'/], ['exceptionInfo', /'threadId'/]])
      await assert.rejects(client.customRequest(request, {}), problem, request);
    await assert.rejects(client.customRequest('setBreakpoints', { source: { path: 'a.c' }, breakpoints: 3 }), /a list/);
    await assert.rejects(client.customRequest('setExceptionBreakpoints', { filters: [1] }), /list of strings/);
    await assert.rejects(client.evaluateRequest({ expression: '1' }), /no program/);
    // Kept for the program to come; one that is no object is refused alone.
    const kept = await client.setBreakpointsRequest({ source: { path: 'a.c' }, breakpoints: [{ line: 3 }, 'x', { line: -2 }] });
    assert.deepEqual(kept.body.breakpoints.map((b) => b.verified), [false, false, false]);
    assert.match(kept.body.breakpoints[1].message, /must be an object/);
    assert.match(kept.body.breakpoints[2].message, /'line'/);
    await assert.rejects(client.customRequest('frobnicate'), /does not know the request 'frobnicate'/);
    await client.cancelRequest?.({ requestId: 1 }) ?? client.customRequest('cancel', { requestId: 1 });

    // Bad arguments, each refused with what is wrong.
    await assert.rejects(client.launchRequest({}), /needs 'program'/);
    await assert.rejects(client.launchRequest({ program: s.debuggee('stops'), args: 'not a list' }),
                         /'args' must be a list of strings/);
    await assert.rejects(client.launchRequest({ program: s.debuggee('stops'), env: { A: 1 } }), /'env'/);
    await assert.rejects(client.launchRequest({ program: s.debuggee('stops'), cwd: '/no/such/folder' }),
                         /not a directory/);
    await assert.rejects(client.launchRequest({ program: '/no/such/program' }), /program/);
    await assert.rejects(client.attachRequest({ pid: 'one' }), /'pid' must be a whole number/);
    await assert.rejects(client.stackTraceRequest({ threadId: '1' }), /'threadId' must be a whole number/);
    await assert.rejects(client.nextRequest({ threadId: 1 }), /no program is being debugged/);
    await assert.rejects(client.customRequest('threads', ['x']), /arguments of 'threads' must be an object/);
    assert.deepEqual((await client.threadsRequest()).body.threads, []);
  } finally {
    await client.stop();
  }
});

test('garbage and lying lengths cost only the messages they spoil', async () => {
  const adapter = rawAdapter();
  try {
    const initialize = { seq: 1, type: 'request', command: 'initialize', arguments: { adapterID: 'raw' } };
    const threads = (seq) => adapter.frame({ seq, type: 'request', command: 'threads' });
    adapter.write('hello, this is not a message\r\n\r\n');
    adapter.write('Content-Length: abc\r\n\r\n{}');
    adapter.write('Content-Length: 99999999999999\r\n\r\n');
    // A length too long: the next header shows where the message ended.
    const body = JSON.stringify(initialize);
    adapter.write(`Content-Length: ${body.length + 500}\r\n\r\n${body}`);
    adapter.write(threads(2));
    // A length too short, then bodies that are no request.
    adapter.write('Content-Length: 5\r\n\r\n{"seq": 3, "type": "request", "command": "threads"}');
    adapter.write(adapter.frame([1, 2, 3]));
    adapter.write(Buffer.concat([Buffer.from('Content-Length: 4\r\n\r\n'), Buffer.from([0x22, 0xff, 0xfe, 0x22])]));
    adapter.write(adapter.frame({ seq: 4, type: 'request' }));
    adapter.write(adapter.frame({ seq: 8, type: 'response', request_seq: 'x', success: 1, message: {} }));
    adapter.write(adapter.frame({ seq: 5, type: 'request', command: 'launch', arguments: 'program' }));
    adapter.write(adapter.frame({ seq: 6, type: 'request', command: 'stackTrace', arguments: { threadId: -3 } }));
    // A request cut across writes still arrives.
    const cut = threads(7);
    adapter.write(cut.subarray(0, 9));
    await new Promise((resolve) => setTimeout(resolve, 50));
    adapter.write(cut.subarray(9));

    assert.equal((await adapter.response(1)).success, true);
    assert.equal((await adapter.response(2)).success, true);
    assert.match((await adapter.response(4)).message, /'command'/);
    assert.match((await adapter.response(5)).message, /must be an object/);
    assert.match((await adapter.response(6)).message, /'threadId' must be a whole number/);
    assert.equal((await adapter.response(7)).success, true);
    assert.equal(adapter.messages.some((m) => m.request_seq === 3), false);
    assert.ok(adapter.messages.some((m) => m.event === 'output' && /ignored/.test(m.body.output)));

    // The client closing its end ends the adapter cleanly.
    const exit = s.exitOf(adapter.child);
    adapter.child.stdin.end();
    assert.equal(await exit, 0);
  } finally {
    adapter.child.kill('SIGKILL');
  }
});

test('a client that goes away, or ends the adapter, leaves neither debugger nor program running', async () => {
  for (const [how, stopFirst] of [['closes its pipes', true], ['closes its pipes', false], ['sends SIGTERM', false]]) {
    const dir = s.scratchDir();
    const client = await s.startClient(dir);
    const adapter = client._adapterProcess;
    const entry = await s.launch(client, { program: s.debuggee('sleeper'), stopAtEntry: stopFirst, cwd: dir });
    if (entry)
      await entry;
    let running = s.processesIn(dir);
    for (const deadline = Date.now() + s.WAIT; !running.some((p) => p.includes('sleeper')) && Date.now() < deadline;) {
      await new Promise((resolve) => setTimeout(resolve, 50));
      running = s.processesIn(dir);
    }
    assert.ok(running.some((p) => p.includes('gdb')), running.join('\n'));
    assert.ok(running.some((p) => p.includes('sleeper')), running.join('\n'));
    const exit = s.exitOf(adapter);
    if (how === 'sends SIGTERM') {
      adapter.kill('SIGTERM');
      assert.equal(await exit, 128 + 15);
    } else {
      // As when the client is killed: both its pipes close.
      adapter.stdin.destroy();
      adapter.stdout.destroy();
      assert.equal(await exit, 0);
    }
    assert.deepEqual(await s.leftRunningIn(dir), [], `${how}, ${stopFirst ? 'stopped' : 'running'}`);
  }
});

test('disconnect in the middle of a step ends the program and the debugger', async () => {
  const dir = s.scratchDir();
  const client = await s.startClient(dir);
  try {
    const entry = await s.launch(client, { program: s.debuggee('sleeper'), stopAtEntry: true, cwd: dir });
    const thread = entry.body.threadId;
    // Each step over sleep(1) takes a second: the disconnect comes during one.
    await client.nextRequest({ threadId: thread });
    const exit = s.exitOf(client._adapterProcess);
    await client.disconnectRequest({ terminateDebuggee: true });
    assert.equal(await exit, 0);
    assert.deepEqual(await s.leftRunningIn(dir), []);
  } finally {
    client.stopAdapter();
  }
});

test('terminate ends a launched program with an exit and a terminated event', async () => {
  const client = await s.startClient();
  try {
    const entry = await s.launch(client, { program: s.debuggee('sleeper'), stopAtEntry: true });
    await client.continueRequest({ threadId: entry.body.threadId });
    const exited = client.waitForEvent('exited');
    const terminated = client.waitForEvent('terminated');
    await client.terminateRequest({});
    await exited;
    await terminated;
    await assert.rejects(client.continueRequest({ threadId: 1 }), /exited/);
  } finally {
    await client.stop();
  }
});

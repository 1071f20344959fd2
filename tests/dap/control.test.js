// Run control beyond stepping: stops under deep stacks, signals, threads and
// pause, attaching and detaching.
'use strict';

const assert = require('node:assert/strict');
const { spawn } = require('node:child_process');
const fs = require('node:fs');
const path = require('node:path');
const { test } = require('node:test');
const s = require('./support');

test('a signal stops the program under a deep stack, which pages', async () => {
  const client = await s.startClient();
  try {
    const stopped = client.waitForEvent('stopped');
    await s.launch(client, { program: s.debuggee('recursesignal'), args: ['300'] });
    const stop = (await stopped).body;
    assert.equal(stop.reason, 'signal');
    assert.match(stop.description, /SIGUSR1/);
    const thread = stop.threadId;

    const first = (await client.stackTraceRequest({ threadId: thread, startFrame: 0, levels: 20 })).body;
    const total = first.totalFrames;
    // raise and the library's frames below it, 301 calls of descend, main.
    assert.ok(total >= 302, `totalFrames ${total}`);
    assert.equal(first.stackFrames.length, 20);
    const pages = [first.stackFrames];
    for (let start = 20; start < total; start += 20)
      pages.push((await client.stackTraceRequest({ threadId: thread, startFrame: start, levels: 20 })).body.stackFrames);
    const frames = pages.flat();
    assert.equal(frames.length, total);
    assert.equal(new Set(frames.map((f) => f.id)).size, total, 'frame ids are unique');
    const descend = frames.filter((f) => f.name.startsWith('descend'));
    assert.equal(descend.length, 301);
    assert.equal(descend[0].line, s.markerLine('recursesignal.c', 'bottom'));
    assert.match(frames[total - 1].name, /^main/);
    // Frames without source (the C library's) say so instead of a line.
    const bare = frames.find((f) => !f.source);
    if (bare)
      assert.equal(bare.line, 0);

    // A page past the end is empty, not an error.
    const beyond = (await client.stackTraceRequest({ threadId: thread, startFrame: total + 5, levels: 20 })).body;
    assert.deepEqual(beyond.stackFrames, []);

    // The signal ends the program when passed on.
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId: thread });
    await exited;
  } finally {
    await client.stop();
  }
});

test('pause stops a program of three threads, which are listed, and continue resumes it', async () => {
  const dir = s.scratchDir();
  const client = await s.startClient();
  const started = [];
  client.on('thread', (event) => event.body.reason === 'started' && started.push(event.body.threadId));
  try {
    await s.launch(client, { program: s.debuggee('idlers'), cwd: dir });
    while (!fs.existsSync(path.join(dir, 'started.flag')))
      await new Promise((resolve) => setTimeout(resolve, 50));
    let stopped = await s.stopAfter(client, () => client.pauseRequest({ threadId: 1 }));
    assert.equal(stopped.body.reason, 'pause');
    const threads = (await client.threadsRequest()).body.threads;
    assert.equal(threads.length, 3);
    assert.deepEqual(threads.map((t) => t.id).sort(), [...started].sort());
    for (const thread of threads) {
      const trace = await client.stackTraceRequest({ threadId: thread.id });
      assert.ok(trace.body.totalFrames > 0, `thread ${thread.id} has a stack`);
    }

    const continued = client.waitForEvent('continued');
    const response = await client.continueRequest({ threadId: stopped.body.threadId });
    assert.equal(response.body.allThreadsContinued, true);
    await continued;
    // A stopped-program request while it runs is refused, not hung.
    await assert.rejects(client.stackTraceRequest({ threadId: 1 }), /running/);
    stopped = await s.stopAfter(client, () => client.pauseRequest({ threadId: 1 }));
    assert.equal(stopped.body.reason, 'pause');
  } finally {
    await client.stop();
  }
  assert.deepEqual(await s.leftRunningIn(dir), []);
});

test('attach catches a running program, and disconnect lets it go on', async () => {
  const dir = s.scratchDir();
  const program = spawn(s.debuggee('busy'), [], { cwd: dir, stdio: 'ignore' });
  const client = await s.startClient();
  try {
    while (!fs.existsSync(path.join(dir, 'started.flag')))
      await new Promise((resolve) => setTimeout(resolve, 50));
    const stopped = client.waitForEvent('stopped');
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug' });
    await initialized;
    await Promise.all([client.attachRequest({ pid: program.pid, stopAtEntry: true }), client.configurationDoneRequest()]);
    const stop = (await stopped).body;
    assert.equal(stop.reason, 'entry');
    const frame = await s.topFrame(client, stop.threadId);
    assert.equal(frame.source.path, s.source('busy.c'));

    await client.continueRequest({ threadId: stop.threadId });
    const adapterExit = s.exitOf(client._adapterProcess);
    await client.disconnectRequest({});
    assert.equal(await adapterExit, 0);
    // Detached, the program still runs: only a signal from here ends it.
    assert.equal(program.exitCode, null);
    assert.equal(process.kill(program.pid, 0), true);
  } finally {
    program.kill('SIGKILL');
    await s.exitOf(program);
    client.stopAdapter();
  }
});

test('in the client\'s terminal the program stops at its entry and reads what the user types', async () => {
  const client = await s.startClient();
  let terminal = null;
  // Play the client's terminal: run what the adapter asks for, with a pipe
  // for the keyboard, and answer the request.
  const dispatch = client.dispatch.bind(client);
  client.dispatch = (body) => {
    const message = JSON.parse(body);
    if (message.type !== 'request' || message.command !== 'runInTerminal')
      return dispatch(body);
    const [program, ...args] = message.arguments.args;
    terminal = spawn(program, args, { cwd: message.arguments.cwd, stdio: ['pipe', 'pipe', 'inherit'] });
    terminal.output = '';
    terminal.stdout.on('data', (data) => { terminal.output += data; });
    const response = { type: 'response', seq: 0, request_seq: message.seq, command: message.command, success: true,
                       body: { processId: terminal.pid } };
    const json = JSON.stringify(response);
    client.outputStream.write(`Content-Length: ${Buffer.byteLength(json)}\r\n\r\n${json}`);
  };
  try {
    const stopped = client.waitForEvent('stopped');
    const initialized = client.waitForEvent('initialized');
    await client.initializeRequest({ adapterID: 'midebug', supportsRunInTerminalRequest: true });
    await initialized;
    await Promise.all([client.launchRequest({ program: s.debuggee('terminal'), args: ['read'], stopAtEntry: true }),
                       client.configurationDoneRequest()]);
    const entry = (await stopped).body;
    assert.equal(entry.reason, 'entry');
    const frame = await s.topFrame(client, entry.threadId);
    assert.equal(frame.source.path, s.source('terminal.c'));

    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId: entry.threadId });
    terminal.stdin.write('typed by the user\n');
    terminal.stdin.end();
    assert.equal((await exited).body.exitCode, 0);
    await s.exitOf(terminal);
    assert.equal(terminal.output, 'waiting for input\ngot:typed by the user\n');
  } finally {
    await client.stop();
    terminal?.kill('SIGKILL');
  }
});

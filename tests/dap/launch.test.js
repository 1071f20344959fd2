// Launching C, C++ and Pascal programs, stopping at their entry, stepping
// and running them to their real exit code, with their output.
'use strict';

const assert = require('node:assert/strict');
const { test } = require('node:test');
const s = require('./support');

test('a C program stops at main, steps over, into and out, and exits with its code', async () => {
  const client = await s.startClient();
  try {
    const entry = await s.launch(client, { program: s.debuggee('stops'), stopAtEntry: true });
    assert.equal(entry.body.reason, 'entry');
    const thread = entry.body.threadId;
    let frame = await s.topFrame(client, thread);
    assert.equal(frame.name.startsWith('main'), true, frame.name);
    assert.equal(frame.source.path, s.source('stops.c'));

    let stopped = await s.stopAfter(client, () => client.nextRequest({ threadId: thread }));
    assert.equal(stopped.body.reason, 'step');
    assert.equal((await s.topFrame(client, thread)).line, frame.line + 1);

    // Over the printf to the call of add: the program's output arrives as such.
    while ((await s.topFrame(client, thread)).line < s.markerLine('stops.c', 'main-add'))
      await s.stopAfter(client, () => client.nextRequest({ threadId: thread }));
    await s.waitForOutput(client, 'stdout', 'partial ');

    stopped = await s.stopAfter(client, () => client.stepInRequest({ threadId: thread }));
    assert.equal(stopped.body.reason, 'step');
    const trace = await client.stackTraceRequest({ threadId: thread });
    assert.equal(trace.body.totalFrames, 2);
    assert.deepEqual(trace.body.stackFrames.map((f) => f.name.replace(/\(.*/, '')), ['add', 'main']);
    assert.equal(trace.body.stackFrames[0].line, s.markerLine('stops.c', 'add-body'));
    assert.match(trace.body.stackFrames[0].instructionPointerReference, /^0x[0-9a-f]+$/);
    assert.notEqual(trace.body.stackFrames[0].id, trace.body.stackFrames[1].id);

    await s.stopAfter(client, () => client.stepOutRequest({ threadId: thread }));
    assert.equal((await s.topFrame(client, thread)).name.startsWith('main'), true);

    const exited = client.waitForEvent('exited');
    const terminated = client.waitForEvent('terminated');
    await client.continueRequest({ threadId: thread });
    assert.equal((await exited).body.exitCode, 8);
    await terminated;
    await s.waitForOutput(client, 'stdout', 'total=7 done\n');
  } finally {
    await client.stop();
  }
});

test('instruction steps move the instruction pointer within a line', async () => {
  const client = await s.startClient();
  try {
    const entry = await s.launch(client, { program: s.debuggee('stops'), stopAtEntry: true });
    const thread = entry.body.threadId;
    const before = await s.topFrame(client, thread);
    const stopped = await s.stopAfter(client, () => client.nextRequest({ threadId: thread, granularity: 'instruction' }));
    assert.equal(stopped.body.reason, 'step');
    const after = await s.topFrame(client, thread);
    assert.notEqual(after.instructionPointerReference, before.instructionPointerReference);
    assert.equal(after.line, before.line);
    await s.stopAfter(client, () => client.stepInRequest({ threadId: thread, granularity: 'instruction' }));
    assert.notEqual((await s.topFrame(client, thread)).instructionPointerReference, after.instructionPointerReference);
  } finally {
    await client.stop();
  }
});

test('a C++ program steps into a member function through its caller', async () => {
  const client = await s.startClient();
  try {
    const entry = await s.launch(client, { program: s.debuggee('nested'), stopAtEntry: true });
    const thread = entry.body.threadId;
    const names = async () =>
      (await client.stackTraceRequest({ threadId: thread })).body.stackFrames.map((f) => f.name);
    // Into apply, then into Calc::twice.
    for (let i = 0; i < 10 && !(await names())[0].includes('twice'); ++i)
      await s.stopAfter(client, () => client.stepInRequest({ threadId: thread }));
    const frames = await names();
    assert.match(frames[0], /twice/);
    assert.match(frames[1], /apply/);
    assert.match(frames[2], /main/);
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId: thread });
    assert.equal((await exited).body.exitCode, 0);
  } finally {
    await client.stop();
  }
});

test('a Pascal program stops at its entry, steps into a procedure and writes its output', async () => {
  const client = await s.startClient();
  try {
    const entry = await s.launch(client, { program: s.debuggee('calls'), stopAtEntry: true, language: 'pascal' });
    assert.equal(entry.body.reason, 'entry');
    const thread = entry.body.threadId;
    const frame = await s.topFrame(client, thread);
    assert.equal(frame.source.path.endsWith('calls.pas'), true, frame.source.path);
    const names = async () =>
      (await client.stackTraceRequest({ threadId: thread })).body.stackFrames.map((f) => f.name.toUpperCase());
    for (let i = 0; i < 10 && !(await names())[0].includes('SHOW'); ++i)
      await s.stopAfter(client, () => client.stepInRequest({ threadId: thread }));
    assert.match((await names())[0], /SHOW/);
    const exited = client.waitForEvent('exited');
    await client.continueRequest({ threadId: thread });
    assert.equal((await exited).body.exitCode, 0);
    await s.waitForOutput(client, 'stdout', '3\nbye\n');
  } finally {
    await client.stop();
  }
});

test('each argument, the working directory and the environment reach the program', async () => {
  const dir = s.scratchDir();
  const client = await s.startClient();
  try {
    const args = ['$HOME', 'a b', "it's", '', 'x;y'];
    const exited = client.waitForEvent('exited');
    await s.launch(client, { program: s.debuggee('argsecho'), args, cwd: dir });
    assert.equal((await exited).body.exitCode, 0);
    await s.waitForOutput(client, 'stdout', args.map((arg) => `[${arg}]\n`).join(''));

    const shell = await s.startClient();
    try {
      const shellExited = shell.waitForEvent('exited');
      await s.launch(shell, {
        program: '/bin/sh',
        args: ['-c', 'echo "$MIDEBUG_DAP_VALUE"; pwd; exit 3'],
        cwd: dir,
        env: { MIDEBUG_DAP_VALUE: 'from the client' },
      });
      assert.equal((await shellExited).body.exitCode, 3);
      await s.waitForOutput(shell, 'stdout', `from the client\n${dir}\n`);
    } finally {
      await shell.stop();
    }
  } finally {
    await client.stop();
  }
});

test('a program that runs without stopping reports its output, its modules and exit code', async () => {
  const client = await s.startClient();
  try {
    const modules = [];
    client.on('module', (event) => modules.push(event.body));
    const exited = client.waitForEvent('exited');
    const terminated = client.waitForEvent('terminated');
    await s.launch(client, { program: s.debuggee('exitthree') });
    assert.equal((await exited).body.exitCode, 3);
    await terminated;
    await s.waitForOutput(client, 'stdout', 'marker-7781\n');
    // The debugger's own words go to the console, never to the program's output.
    assert.match(s.outputOf(client, 'console'), /GNU gdb/);
    assert.doesNotMatch(s.outputOf(client, 'stdout'), /GNU gdb/);
    assert.ok(modules.some((m) => m.reason === 'new' && /libc\.so/.test(m.module.path)), JSON.stringify(modules));
  } finally {
    await client.stop();
  }
});

// What the adapter's tests share: where the adapter and the programs it
// debugs are, a client started on the adapter, and the waits every test needs.
'use strict';

const assert = require('node:assert/strict');
const fs = require('node:fs');
const os = require('node:os');
const path = require('node:path');
const { DebugClient } = require('@vscode/debugadapter-testsupport');

const root = path.resolve(__dirname, '..', '..');
const build = process.env.MIDEBUG_BUILD_DIR || path.join(root, 'build');
const adapter = process.env.MIDEBUG_DAP || path.join(build, 'tools', 'midebug-dap');
const debuggees = process.env.MIDEBUG_DEBUGGEES || path.join(build, 'tests', 'debuggees');
const sources = path.join(root, 'tests', 'debuggees');

// Starting GDB and the program takes a while on a busy machine.
const WAIT = 30000;

function debuggee(name) {
  return path.join(debuggees, name);
}

function source(name) {
  return path.join(sources, name);
}

/// The 1-based line of source file Name that carries the comment "line:Marker".
function markerLine(name, marker) {
  const lines = fs.readFileSync(source(name), 'utf8').split('\n');
  const index = lines.findIndex((line) => line.includes(`line:${marker} `) || line.endsWith(`line:${marker}`));
  assert.notEqual(index, -1, `no marker line:${marker} in ${name}`);
  return index + 1;
}

/// A folder of its own for one test, removed afterwards.
function scratchDir() {
  return fs.mkdtempSync(path.join(os.tmpdir(), 'midebug-dap-'));
}

/// A client on a new adapter that keeps every output event. The adapter
/// runs in Cwd, so that everything it starts can be found by its folder.
async function startClient(cwd) {
  // The client passes its second argument to the first: env runs the adapter
  // with no arguments.
  const client = new DebugClient('/usr/bin/env', adapter, 'midebug', { cwd: cwd || process.cwd() });
  client.defaultTimeout = WAIT;
  client.outputs = [];
  client.on('output', (event) => client.outputs.push(event.body));
  await client.start();
  return client;
}

/// The text of every output event of Category so far.
function outputOf(client, category) {
  return client.outputs.filter((body) => body.category === category).map((body) => body.output).join('');
}

/// Waits until the output of Category holds Text.
async function waitForOutput(client, category, text) {
  const deadline = Date.now() + WAIT;
  while (!outputOf(client, category).includes(text)) {
    if (Date.now() > deadline)
      assert.fail(`no ${category} output "${text}"; got "${outputOf(client, category)}"`);
    await new Promise((resolve) => client.once('output', resolve));
  }
}

/// Initializes and launches with Args, and finishes the configuration;
/// resolves with the first stopped event when StopAtEntry asks for one.
async function launch(client, args) {
  const stopped = args.stopAtEntry ? client.waitForEvent('stopped') : null;
  const initialized = client.waitForEvent('initialized');
  await client.initializeRequest({ adapterID: 'midebug', linesStartAt1: true, columnsStartAt1: true });
  await initialized;
  await Promise.all([client.configurationDoneRequest(), client.launchRequest(args)]);
  return stopped;
}

/// Runs Request (a function returning the request's promise) and resolves
/// with the stopped event that follows it.
async function stopAfter(client, request) {
  const stopped = client.waitForEvent('stopped');
  await request();
  return stopped;
}

/// The top frame of Thread.
async function topFrame(client, threadId) {
  const trace = await client.stackTraceRequest({ threadId, startFrame: 0, levels: 1 });
  return trace.body.stackFrames[0];
}

/// The processes whose working directory is Dir.
function processesIn(dir) {
  const found = [];
  for (const entry of fs.readdirSync('/proc')) {
    if (!/^\d+$/.test(entry))
      continue;
    try {
      if (fs.readlinkSync(`/proc/${entry}/cwd`) === dir)
        found.push(`${entry} ${fs.readFileSync(`/proc/${entry}/cmdline`, 'utf8').replace(/\0/g, ' ')}`);
    } catch {
      // Gone meanwhile, or not ours to look at.
    }
  }
  return found;
}

/// Waits, a bounded time, until nothing runs in Dir any more; the list left.
async function leftRunningIn(dir) {
  const deadline = Date.now() + WAIT;
  let left = processesIn(dir);
  while (left.length > 0 && Date.now() < deadline) {
    await new Promise((resolve) => setTimeout(resolve, 100));
    left = processesIn(dir);
  }
  return left;
}

/// The end of the first readable mapping of Pid that no mapping follows.
function endBeforeGap(pid) {
  const maps = fs.readFileSync(`/proc/${pid}/maps`, 'utf8').trim().split('\n').map((line) => {
    const [range, perms, , , , name] = line.split(/\s+/);
    const [start, end] = range.split('-').map((hex) => BigInt(`0x${hex}`));
    return { start, end, perms, name: name || '' };
  });
  const found = maps.find((map, i) => map.perms[0] === 'r' && !map.name.startsWith('[v') &&
                          i + 1 < maps.length && maps[i + 1].start !== map.end);
  assert.ok(found, 'no readable mapping before a gap');
  return found.end;
}

/// Resolves with the exit code once Child has ended.
function exitOf(child) {
  if (child.exitCode !== null)
    return Promise.resolve(child.exitCode);
  return new Promise((resolve) => child.once('exit', (code) => resolve(code)));
}

module.exports = {
  adapter, debuggee, source, markerLine, scratchDir, startClient, outputOf, waitForOutput, launch, stopAfter,
  topFrame, processesIn, leftRunningIn, endBeforeGap, exitOf, WAIT,
};

// --port: one client after another over TCP on the loopback address only;
// a termination signal ends the server.
'use strict';

const assert = require('node:assert/strict');
const { spawn } = require('node:child_process');
const fs = require('node:fs');
const { test } = require('node:test');
const { DebugClient } = require('@vscode/debugadapter-testsupport');
const s = require('./support');

/// Resolves with the port the server printed on standard error.
function portOf(server) {
  return new Promise((resolve, reject) => {
    let text = '';
    server.stderr.on('data', (data) => {
      text += data;
      const found = /listening on 127\.0\.0\.1:(\d+)/.exec(text);
      if (found)
        resolve(Number(found[1]));
    });
    server.once('exit', () => reject(new Error(`server ended: ${text}`)));
  });
}

test('a TCP server serves a debug session, then the next client, on 127.0.0.1 only', async () => {
  const server = spawn(s.adapter, ['--port', '0'], { stdio: ['ignore', 'ignore', 'pipe'] });
  try {
    const port = await portOf(server);
    // Bound to the loopback address alone (127.0.0.1 is 0100007F here).
    const hex = port.toString(16).toUpperCase().padStart(4, '0');
    assert.match(fs.readFileSync('/proc/net/tcp', 'utf8'), new RegExp(`0100007F:${hex} 00000000:0000 0A`));

    const first = new DebugClient('', '', 'midebug');
    first.defaultTimeout = s.WAIT;
    await first.start(port);
    const entry = await s.launch(first, { program: s.debuggee('stops'), stopAtEntry: true });
    const exited = first.waitForEvent('exited');
    await first.continueRequest({ threadId: entry.body.threadId });
    assert.equal((await exited).body.exitCode, 8);
    // Disconnects, and the server closes the connection.
    await first.stop();

    const second = new DebugClient('', '', 'midebug');
    second.defaultTimeout = s.WAIT;
    await second.start(port);
    const answer = await second.initializeRequest({ adapterID: 'midebug' });
    assert.equal(answer.success, true);
    await second.stop();

    server.kill('SIGTERM');
    assert.equal(await s.exitOf(server), 128 + 15);
  } finally {
    server.kill('SIGKILL');
  }
});

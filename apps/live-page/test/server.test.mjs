// The live page's server: what it gives away, what it refuses, and that the sound that comes back is the
// package's own, in step with what was sent.
import assert from 'node:assert/strict';
import { once } from 'node:events';
import { request } from 'node:http';
import net from 'node:net';
import { test } from 'node:test';
import { setTimeout as sleep } from 'node:timers/promises';
import { noise, randomSource } from '../../../native_modules/quorral_valto/test/support/audio.mjs';
import { NC_MODELS as MODELS } from '../../../native_modules/quorral_valto/test/support/package.mjs';
import { require } from '../dependencies.mjs';
import { decodeResult, MAX_MESSAGE_BYTES } from '../page/protocol.mjs';
import { namesOf } from '../server.mjs';
import { directly, serve } from './harness.mjs';

const { WebSocket } = require('ws');
const { SAMPLE_RATES } = require('quorral_valto');

/** { status, headers, body } of a request whose path is sent as it stands. */
async function ask(url, { path: asked = '/', ...options } = {}) {
  const { hostname, port } = new URL(url);
  const sent = request({ hostname, port, path: asked, ...options }).end();
  const [response] = await once(sent, 'response');
  const body = Buffer.concat(await response.toArray());
  return { status: response.statusCode, headers: response.headers, body };
}

/** A socket with `said`, the messages so far, and `closed`, which resolves to { code, reason }. */
function connect(url, { path: asked = 'audio', origin = new URL(url).origin } = {}) {
  const socket = new WebSocket(new URL(asked, url.replace('http', 'ws')), { origin });
  socket.binaryType = 'arraybuffer';
  socket.said = [];
  socket.on('message', (data, isBinary) => {
    socket.said.push(isBinary ? data : JSON.parse(Buffer.from(data).toString()));
  });
  socket.closed = new Promise((resolve) => {
    socket.on('close', (code, reason) => resolve({ code, reason: `${reason}` }));
  });
  return socket;
}

/** The first message of a type, already there or to come; rejects when the connection closes first. */
async function heard(socket, type) {
  const closed = socket.closed.then(({ reason }) => {
    throw new Error(`closed before "${type}": ${reason}`);
  });
  closed.catch(() => {}); // when the message wins
  for (;;) {
    const found = socket.said.find((message) => message.type === type);
    if (found) return found;
    await Promise.race([once(socket, 'message'), closed]);
  }
}

/** A connection after its "hello", ended with the test. */
async function greeted(t, url) {
  const socket = connect(url);
  t.after(() => socket.terminate());
  await heard(socket, 'hello');
  const say = (message) => socket.send(JSON.stringify(message));
  return { socket, say };
}

test('serves its page and nothing else, and takes connections from there only', async (t) => {
  const { url } = await serve(t);
  const page = await ask(url);
  assert.equal(page.status, 200);
  assert.match(page.headers['content-security-policy'], /default-src 'none'/);
  for (const [, name] of page.body.toString().matchAll(/(?:href|src)="([^"]+)"/g)) {
    assert.equal((await ask(url, { path: `/${name}` })).status, 200, name);
  }
  for (const wrong of ['/../server.mjs', '/%2e%2e/server.mjs', '/main.mjs?x', '/audio']) {
    assert.equal((await ask(url, { path: wrong })).status, 404, wrong);
  }
  assert.equal((await ask(url, { method: 'POST' })).status, 405);
  assert.equal((await ask(url, { headers: { host: 'example.org' } })).status, 421);
  // A browser does not name the usual port.
  assert.deepEqual([...namesOf(80)], ['127.0.0.1', 'localhost']);

  const refusal = (options) =>
    new Promise((resolve) => {
      const socket = connect(url, options);
      socket.on('error', ({ message }) => resolve(message)).on('open', () => resolve('taken'));
    });
  for (const options of [{ origin: 'http://example.org' }, { path: 'other' }, { origin: '' }]) {
    assert.match(await refusal(options), /403/);
  }
  for (let i = 0; i < 8; ++i) await greeted(t, url);
  assert.match(await refusal(), /503/);

  // One refused client resets its connection, another keeps its half of it: the server bears the first
  // and lets go of the second, which is told when it writes.
  const refused = async () => {
    const { port, host } = new URL(url);
    const socket = net.connect({ port, host: '127.0.0.1', allowHalfOpen: true });
    t.after(() => socket.destroy());
    const upgrade = 'Connection: Upgrade\r\nUpgrade: websocket\r\n\r\n';
    socket.write(`GET /audio HTTP/1.1\r\nHost: ${host}\r\n${upgrade}`);
    assert.match(`${(await once(socket, 'data'))[0]}`, /403/);
    return socket;
  };
  (await refused()).resetAndDestroy();
  const half = (await refused()).on('error', () => {});
  const patience = AbortSignal.timeout(20_000);
  while (!half.destroyed) {
    patience.throwIfAborted();
    half.write('x');
    await sleep(10);
  }
});

test('a message that breaks the rules ends its connection with a reason', async (t) => {
  const { url } = await serve(t);
  const start = { type: 'start', stream: 1, sampleRate: 8000, model: MODELS[0] };
  const started = JSON.stringify(start);
  const full = new Int16Array(MAX_MESSAGE_BYTES / 2);
  const tooLong = Array(Math.ceil((600 * 8000 + 1) / full.length)).fill(full);
  const cases = [
    [['null'], 1008, /JSON object/],
    [['{"type":"toString"}'], 1008, /message type/],
    [[JSON.stringify({ ...start, sampleRate: 12345 })], 1008, /sampling rate/],
    [[JSON.stringify({ ...start, model: '../x' })], 1008, /model/],
    [[full], 1008, /before "start"/],
    [[started, new Uint8Array(3)], 1008, /16-bit/],
    [[started, new Uint8Array(MAX_MESSAGE_BYTES + 2)], 1009, /^/],
    [[started, ...tooLong], 1009, /a recording may last 600 s/],
  ];
  const witness = await greeted(t, url);
  for (const [messages, code, reason] of cases) {
    const { socket } = await greeted(t, url);
    for (const message of messages) socket.send(message);
    const closed = await socket.closed;
    assert.equal(closed.code, code, String(messages[0]));
    assert.match(closed.reason, reason);
  }
  // The others go on; a new stream replaces the one that runs.
  witness.say(start);
  witness.socket.send(full);
  witness.say({ ...start, stream: 2 });
  witness.socket.send(new Int16Array(80));
  witness.say({ type: 'stop' });
  const done = await heard(witness.socket, 'done');
  assert.deepEqual([done.stream, done.samples], [2, 80]);
});

test('the sound that comes back is the model’s, in step, also when another takes over', async (t) => {
  const { url } = await serve(t);
  for (const [i, sampleRate] of SAMPLE_RATES.entries()) {
    const [model, next] = [MODELS[i % 3], MODELS[(i + 1) % 3]];
    const [peak, frame] = [300 * (i + 1), sampleRate / 100];
    const samples = noise(Math.floor((1.1 + i / 30) * sampleRate), i, peak);
    const name = `${samples.length} samples at ${sampleRate} Hz, ${model}`;
    const { socket, say } = await greeted(t, url);
    const random = randomSource(i);
    say({ type: 'start', stream: 9, sampleRate, model });
    let switchedAt = i % 2 === 1 ? 0 : samples.length + 3 * frame; // nowhere for every other one
    for (let at = 0, end; at < samples.length; at = end) {
      end = Math.min(samples.length, at + 1 + Math.floor(random() * 3000));
      socket.send(samples.subarray(at, end));
      if (switchedAt !== 0 || end < samples.length / 2) continue;
      say({ type: 'model', name: next });
      switchedAt = end;
    }
    say({ type: 'stop' });
    const done = await heard(socket, 'done');
    socket.close();
    const results = socket.said.filter((each) => each instanceof ArrayBuffer).map(decodeResult);
    const joined = (key) => results.flatMap((result) => Array.from(result[key]));
    const back = Int16Array.from(joined('samples'));
    assert.deepEqual([done.stream, done.samples, back.length], [9, back.length, samples.length]);
    const [first, second] = [model, next].map((each) => directly(samples, sampleRate, each));
    // The cross-fade is one frame long and as late as the longest delay of the models, two frames.
    const [before, after] = [switchedAt - 3 * frame, switchedAt + 2 * frame];
    assert.deepEqual(back.subarray(0, before), first.samples.subarray(0, before), name);
    assert.deepEqual(back.subarray(after), second.samples.subarray(after), name);
    assert.deepEqual(joined('voice'), first.voice, name);
    const levels = joined('noise');
    assert.equal(levels.length, first.voice.length, name);
    // Noise alone is removed nearly whole: its own level, uniform within the peak.
    const level = 20 * Math.log10(peak / Math.sqrt(3) / 32768);
    assert.ok(Math.abs(levels.at(-1) - level) < 2, `${levels.at(-1)} dB, not ${level}`);
  }
});

test('a page that does not read is not read either', async (t) => {
  const { socket, say } = await greeted(t, (await serve(t)).url);
  say({ type: 'start', stream: 1, sampleRate: 96000, model: MODELS[0] });
  await heard(socket, 'started');
  socket.pause();
  const chunk = new Int16Array(MAX_MESSAGE_BYTES / 2);
  const messages = 128; // more than sockets buffer
  for (let i = 0; i < messages; ++i) socket.send(chunk);
  let left;
  do {
    left = socket.bufferedAmount;
    await sleep(1000);
  } while (socket.bufferedAmount !== left);
  assert.ok(left > 0, 'the server took everything');
  socket.resume();
  say({ type: 'stop' });
  assert.equal((await heard(socket, 'done')).samples, messages * chunk.length);
});

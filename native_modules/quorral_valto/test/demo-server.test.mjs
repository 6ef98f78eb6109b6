// The live page's server: what it gives away, what it refuses, and that the sound that comes back is the
// package's own, in step with what was sent.
import assert from 'node:assert/strict';
import { cpSync, mkdirSync, symlinkSync, writeFileSync } from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import { pathToFileURL } from 'node:url';
import { initialize, NoiseCanceller, SAMPLE_RATES, VoiceActivityDetector } from 'quorral_valto';
import { decodeResult, encodeResult, MAX_MESSAGE_BYTES } from '../demo/page/protocol.mjs';
import { noise, randomSource } from './support/audio.mjs';
import { ask, connect, greeted, heard, serve } from './support/demo.mjs';
import { copyPackage, NC_MODELS, require, temporaryFolder, testDir } from './support/package.mjs';

test('serves its page and nothing else', async (t) => {
  const { url } = await serve(t);
  const page = await ask(url);
  assert.equal(page.status, 200);
  assert.match(page.headers['content-security-policy'], /default-src 'none'/);
  const html = page.body.toString();
  for (const [, name] of html.matchAll(/(?:href|src)="([^"]+)"/g)) {
    assert.equal((await ask(url, { path: `/${name}` })).status, 200, name);
  }
  assert.equal((await ask(url, { method: 'HEAD' })).body.length, 0);
  const wrong = [
    '/../server.mjs',
    '/..%2fserver.mjs',
    '/%2e%2e/server.mjs',
    '/page/../../package.json',
    '//etc/passwd',
    '/server.mjs',
    '/main.mjs?x',
    '/audio',
    '/constructor',
    'http://127.0.0.1/../package.json',
  ];
  for (const each of wrong) assert.equal((await ask(url, { path: each })).status, 404, each);
  assert.equal((await ask(url, { method: 'POST' })).status, 405);
  const foreign = { headers: { host: 'example.org' } };
  assert.equal((await ask(url, foreign)).status, 421);
});

test('takes connections from its own page only', async (t) => {
  const { url } = await serve(t);
  for (const options of [{ origin: 'http://example.org' }, { path: 'other' }, { origin: '' }]) {
    const socket = connect(url, options);
    const [error] = await Promise.all([
      new Promise((resolve) => socket.once('error', resolve)),
      socket.closed,
    ]);
    assert.match(error.message, /403/);
  }
});

test('a message that breaks the rules ends its connection with a reason', async (t) => {
  const { url } = await serve(t);
  const start = { type: 'start', stream: 1, sampleRate: 48000, model: NC_MODELS[0] };
  const started = JSON.stringify(start);
  const cases = [
    [['no JSON'], 1008, /JSON object/],
    [['null'], 1008, /JSON object/],
    [['{"type":"toString"}'], 1008, /message type/],
    [[JSON.stringify({ ...start, stream: 0.5 })], 1008, /stream/],
    [[JSON.stringify({ ...start, sampleRate: 12345 })], 1008, /sampling rate/],
    [[JSON.stringify({ ...start, model: '../x' })], 1008, /model/],
    [['{"type":"model","name":7}'], 1008, /model/],
    [[new Int16Array(480)], 1008, /before "start"/],
    [[started, new Uint8Array(3)], 1008, /16-bit/],
    [[started, new Uint8Array(0)], 1008, /16-bit/],
    [[started, '{"type":"stop"}', new Int16Array(480)], 1008, /before "start"/],
    [[started, new Uint8Array(MAX_MESSAGE_BYTES + 2)], 1009, /^/],
  ];
  const witness = await greeted(t, url);
  for (const [messages, code, reason] of cases) {
    const { socket } = await greeted(t, url);
    for (const message of messages) socket.send(message);
    const closed = await socket.closed;
    assert.equal(closed.code, code, String(messages));
    assert.match(closed.reason, reason);
  }
  witness.say({ ...start, model: NC_MODELS[1] });
  await heard(witness.socket, 'started');
});

test('a recording has a longest length', async (t) => {
  const { url } = await serve(t);
  const { socket, hello, say } = await greeted(t, url);
  say({ type: 'start', stream: 1, sampleRate: 8000, model: NC_MODELS[0] });
  const chunk = new Int16Array(MAX_MESSAGE_BYTES / 2);
  const messages = Math.ceil((hello.maxSeconds * 8000 + 1) / chunk.length);
  for (let i = 0; i < messages; ++i) socket.send(chunk);
  assert.deepEqual(await socket.closed, { code: 1009, reason: 'a recording may last 600 s' });
});

test('has a highest number of connections', async (t) => {
  const { url } = await serve(t);
  for (let i = 0; i < 8; ++i) await greeted(t, url);
  const ninth = connect(url);
  const error = await new Promise((resolve) => ninth.once('error', resolve));
  assert.match(error.message, /503/);
});

test('results survive their encoding', () => {
  const random = randomSource(7);
  for (let i = 0; i < 50; ++i) {
    const [voices, levels, samples] = [4, 4, 2000].map((most) => Math.floor(random() * most));
    const result = {
      stream: Math.floor(random() * 2 ** 32),
      voice: Float32Array.from({ length: voices }, random),
      noise: Float32Array.from({ length: levels }, () => -90 * random()),
      samples: noise(samples, i),
    };
    assert.deepEqual(decodeResult(encodeResult(result)), result);
  }
});

/** What a model makes of a sound, its delay taken out. */
function cleanedDirectly(samples, sampleRate, model) {
  const session = new NoiseCanceller({ sampleRate, frameMs: 10, model });
  const { frameSize, latency } = session;
  const padded = new Int16Array(Math.ceil((samples.length + latency) / frameSize) * frameSize);
  padded.set(samples);
  for (let at = 0; at < padded.length; at += frameSize) {
    session.process(padded.subarray(at, at + frameSize));
  }
  session.close();
  return padded.subarray(latency, latency + samples.length);
}

function scoresDirectly(samples, sampleRate) {
  const session = new VoiceActivityDetector({ sampleRate, frameMs: 10 });
  const frameSize = sampleRate / 100;
  const frame = new Int16Array(frameSize);
  const scores = [];
  for (let at = 0; at < samples.length; at += frameSize) {
    frame.fill(0);
    frame.set(samples.subarray(at, at + frameSize));
    scores.push(session.process(frame));
  }
  session.close();
  return Float32Array.from(scores);
}

/** Sends a sound in pieces; `during(position)` may say something in between. */
async function cleanedByServer(t, url, { samples, sampleRate, model, random, during = () => {} }) {
  const { socket, say } = await greeted(t, url);
  say({ type: 'start', stream: 9, sampleRate, model });
  for (let at = 0; at < samples.length; ) {
    during(at, say);
    const end = Math.min(samples.length, at + 1 + Math.floor(random() * 3000));
    socket.send(samples.subarray(at, end));
    at = end;
  }
  say({ type: 'stop' });
  const done = await heard(socket, 'done');
  socket.close();
  assert.deepEqual([done.stream, done.samples], [9, samples.length]);
  const results = socket.said.filter((each) => each instanceof ArrayBuffer).map(decodeResult);
  const joined = (key) => results.flatMap((result) => Array.from(result[key]));
  return {
    samples: Int16Array.from(joined('samples')),
    voice: Float32Array.from(joined('voice')),
    noise: joined('noise'),
  };
}

test('the sound that comes back is the model’s, as long as the original and in step', async (t) => {
  initialize();
  const { url } = await serve(t);
  const seed = 11;
  const random = randomSource(seed);
  for (const sampleRate of SAMPLE_RATES) {
    const model = NC_MODELS[Math.floor(random() * NC_MODELS.length)];
    const samples = noise(Math.floor(random() * 2 * sampleRate), sampleRate);
    const back = await cleanedByServer(t, url, { samples, sampleRate, model, random });
    const name = `seed ${seed}: ${samples.length} samples at ${sampleRate} Hz, ${model}`;
    assert.deepEqual(back.samples, cleanedDirectly(samples, sampleRate, model), name);
    assert.deepEqual(back.voice, scoresDirectly(samples, sampleRate), name);
    assert.equal(back.noise.length, back.voice.length, name);
  }
});

test('the noise level is that of what was removed', async (t) => {
  const { url } = await serve(t);
  const [sampleRate, model, random] = [48000, NC_MODELS[2], randomSource(3)];
  for (const peak of [300, 3000]) {
    const samples = noise(4 * sampleRate, 21, peak);
    const { noise: levels } = await cleanedByServer(t, url, { samples, sampleRate, model, random });
    // Noise alone is removed nearly whole: its own level, uniform within the peak.
    const expected = 20 * Math.log10(peak / Math.sqrt(3) / 32768);
    assert.ok(Math.abs(levels.at(-1) - expected) < 1, `${levels.at(-1)} dB, not ${expected}`);
  }
});

test('another model takes over in the middle, and the sound does not move', async (t) => {
  initialize();
  const { url } = await serve(t);
  const [sampleRate, random] = [48000, randomSource(5)];
  const frame = sampleRate / 100;
  for (const [from, to] of [[NC_MODELS[0], NC_MODELS[2]], NC_MODELS.slice(1).reverse()]) {
    const samples = noise(sampleRate, 31);
    let switchedAt = null;
    const back = await cleanedByServer(t, url, {
      samples,
      sampleRate,
      model: from,
      random,
      during(at, say) {
        if (switchedAt !== null || at < sampleRate / 2) return;
        switchedAt = at;
        say({ type: 'model', name: to });
      },
    });
    const [first, second] = [from, to].map((name) => cleanedDirectly(samples, sampleRate, name));
    // The cross-fade is one frame long and as late as the longest delay of the models, two frames.
    const [last, next] = [switchedAt - 3 * frame, switchedAt + 2 * frame];
    assert.deepEqual(back.samples.subarray(0, last), first.subarray(0, last));
    assert.deepEqual(back.samples.subarray(next), second.subarray(next));
    assert.notDeepEqual(first.subarray(next), second.subarray(next));
  }
});

test('a new stream replaces the one that runs', async (t) => {
  const { url } = await serve(t);
  const { socket, say } = await greeted(t, url);
  const start = { type: 'start', sampleRate: 16000, model: NC_MODELS[1] };
  say({ ...start, stream: 1 });
  socket.send(noise(16000, 1));
  say({ ...start, stream: 2 });
  socket.send(noise(320, 1));
  say({ type: 'stop' });
  const done = await heard(socket, 'done');
  assert.deepEqual([done.stream, done.samples], [2, 320]);
});

test('a page that does not read is not read either', async (t) => {
  const { url } = await serve(t);
  const { socket, say } = await greeted(t, url);
  const sampleRate = 96000;
  say({ type: 'start', stream: 1, sampleRate, model: NC_MODELS[0] });
  await heard(socket, 'started');
  socket.pause();
  const chunk = new Int16Array(MAX_MESSAGE_BYTES / 2);
  const messages = 128; // more than sockets buffer
  for (let i = 0; i < messages; ++i) socket.send(chunk);
  let left;
  do {
    left = socket.bufferedAmount;
    await new Promise((resolve) => setTimeout(resolve, 1000));
  } while (socket.bufferedAmount !== left);
  assert.ok(left > 0, 'the server took everything');
  socket.resume();
  say({ type: 'stop' });
  assert.equal((await heard(socket, 'done')).samples, messages * chunk.length);
});

test('a module that cannot be loaded is reported in words', async (t) => {
  const folder = temporaryFolder(t);
  const packages = path.join(folder, 'node_modules');
  mkdirSync(packages);
  cpSync(path.join(testDir, '../demo'), path.join(folder, 'demo'), { recursive: true });
  symlinkSync(path.dirname(require.resolve('ws/package.json')), path.join(packages, 'ws'));
  const broken = copyPackage(t);
  symlinkSync(broken, path.join(packages, 'quorral_valto'));
  writeFileSync(path.join(broken, 'prebuilds/linux-x64/quorral_valto.node'), 'not a module');
  const server = pathToFileURL(path.join(folder, 'demo/server.mjs'));
  const demo = await (await import(server)).startDemo();
  t.after(() => demo.close());
  const socket = connect(demo.url);
  const { code, message } = await heard(socket, 'error');
  assert.equal(code, 'ERR_VALTO_LOAD');
  assert.match(message, /Cannot load the native module/);
  assert.equal((await socket.closed).code, 1011);
});

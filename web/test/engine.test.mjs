// The module in the script runtime beside the native engine, on the bundled recording.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { mkdtempSync, readFileSync, rmSync, statSync, writeFileSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { test } from 'node:test';
import { fileURLToPath } from 'node:url';
import { Engine } from '../src/engine.mjs';
import { requireSupport } from '../src/errors.mjs';
import { FrameQueue } from '../src/frame-queue.mjs';

const inRepository = (name) => fileURLToPath(new URL(`../../${name}`, import.meta.url));
const wasm = inRepository('build/wasm/morva_sdk.wasm');
const native = inRepository('build/release/values');
const recording = inRepository('examples/audio/noisy.flac');
const shipped = JSON.parse(readFileSync(inRepository('models/shipped.json')));
const run = (words) => execFileSync(words[0], words.slice(1), { maxBuffer: 2 ** 26 });
const bytes = run(`sox ${recording} -t raw -e signed -b 16 -`.split(' '));
const sound = new Int16Array(new Uint8Array(bytes).buffer);

function newEngine() {
  const engine = new Engine(new WebAssembly.Module(readFileSync(wasm)));
  for (const { file, name, kind } of shipped) {
    engine.addModel({ name, kind, bytes: readFileSync(inRepository(`models/${file}`)) });
  }
  return engine;
}

/** What a session says to the frames of a sound, as one list. */
function answers(session, samples) {
  const { frameSize } = session;
  const all = [];
  for (let at = 0; at + frameSize <= samples.length; at += frameSize) {
    all.push(session.process(samples.slice(at, at + frameSize)));
  }
  session.close();
  return all;
}

test('the module says what the native engine says', () => {
  assert.ok(statSync(wasm).size < 570_000); // the glue takes 30 kB
  const folder = mkdtempSync(path.join(os.tmpdir(), 'morva-web-'));
  const raw = path.join(folder, 'noisy.raw');
  writeFileSync(raw, bytes);
  const engine = newEngine();
  const floats = Float32Array.from(sound, (sample) => sample / 32768);
  const kinds = {
    NC: [engine.NoiseCanceller, 1e-4],
    VAD: [engine.VoiceActivityDetector, 1e-4],
    NoiseDB: [engine.NoiseLevelMeter, 1e-3], // of some sixty decibels
  };
  for (const { name, kind, file } of shipped) {
    const [Session, limit] = kinds[kind];
    const ours = answers(new Session({ sampleRate: 48000, model: name }), floats);
    const printed = run([native, raw, kind, inRepository(`models/${file}`)]).toString();
    const lines = printed.split('\n').filter((line) => line.startsWith(`${kind} `));
    const theirs = lines.map((line) => Number(line.split(' ')[1]));
    const values = ours.flatMap((answer) => (kind === 'NC' ? [...answer] : answer));
    assert.ok(values.length >= 1000 && values.length === theirs.length);
    const worst = values.reduce((most, x, i) => Math.max(most, Math.abs(x - theirs[i])), 0);
    assert.ok(worst < limit, `${name}: ${worst}`);
  }
  rmSync(folder, { recursive: true });
});

test('blocks of 128 come out at the stated latency, and no block makes memory grow', () => {
  const engine = newEngine();
  for (const sampleRate of [16000, 44100, 48000]) {
    const session = new engine.NoiseCanceller({ sampleRate, model: 'small_NC', bypass: true });
    const queue = new FrameQueue(session);
    const floats = Float32Array.from(sound.subarray(0, 128 * 200), (sample) => sample / 32768);
    const out = new Float32Array(floats.length);
    const size = engine.memory.buffer.byteLength;
    for (let at = 0; at < floats.length; at += 128) {
      queue.run(floats.subarray(at, at + 128), out.subarray(at, at + 128));
    }
    const late = out.subarray(queue.latency + 2 * session.frameSize); // bypass has faded in
    const sent = floats.subarray(2 * session.frameSize);
    assert.ok(
      late.every((sample, i) => Math.abs(sample - sent[i]) < 1e-6),
      `${sampleRate}`,
    );
    assert.equal(engine.memory.buffer.byteLength, size);
    session.close();
  }
});

test('what cannot be done is said with a code', () => {
  const engine = newEngine();
  const code = (wanted) => ({ name: 'MorvaError', code: wanted });
  const open = (options) =>
    new engine.NoiseCanceller({ sampleRate: 48000, model: 'small_NC', ...options });
  assert.throws(() => open({ sampleRate: 22050 }), code('ERR_MORVA_ARGUMENT'));
  assert.throws(() => open({ model: 'default_VAD' }), code('ERR_MORVA_ENGINE'));
  assert.throws(() => open({ model: 'none' }), code('ERR_MORVA_MODEL'));
  assert.throws(() => open({ attenuationLimit: -1 }), code('ERR_MORVA_ARGUMENT'));
  assert.throws(() => open().process(new Float32Array(479)), code('ERR_MORVA_FRAME_SIZE'));
  const session = open();
  session.close();
  assert.throws(() => session.process(new Float32Array(480)), code('ERR_MORVA_CLOSED'));
  requireSupport();
  assert.throws(() => requireSupport({ validate: () => false }), code('ERR_MORVA_UNSUPPORTED'));
});

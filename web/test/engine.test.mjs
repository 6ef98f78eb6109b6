// The engine in the script runtime beside the native one, on the bundled recording.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { readFileSync, statSync } from 'node:fs';
import { test } from 'node:test';
import { fileURLToPath } from 'node:url';
import { Engine } from '../src/engine.mjs';
import { requireSupport } from '../src/errors.mjs';
import { FrameQueue } from '../src/frame-queue.mjs';

const inRepository = (name) => fileURLToPath(new URL(`../../${name}`, import.meta.url));
const wasm = inRepository('build/wasm/morva_sdk.wasm');
const recording = inRepository('examples/audio/noisy.flac');
const run = (...words) => execFileSync(words[0], words.slice(1), { maxBuffer: 2 ** 26 });
const rawWords = '-t raw -e floating-point -b 32 -'.split(' ');
const sound = new Float32Array(new Uint8Array(run('sox', recording, ...rawWords)).buffer);
const FULL = 'full_NC-ca03f4';

function newEngine() {
  const engine = new Engine(new WebAssembly.Module(readFileSync(wasm)));
  for (const { file, ...model } of JSON.parse(readFileSync(inRepository('models/shipped.json')))) {
    engine.addModel({ ...model, bytes: readFileSync(inRepository(`models/${file}`)) });
  }
  return engine;
}

/** What a session says to each frame of the recording. */
function answers(session) {
  const { frameSize } = session;
  const whole = Math.floor(sound.length / frameSize);
  return Array.from({ length: whole }, (_, i) =>
    session.process(sound.slice(i * frameSize, (i + 1) * frameSize)),
  );
}

/** The worst difference from what the native engine writes for the same frames. */
function worstDifference(values, natively) {
  const differences = natively.slice(0, values.length).map((value, i) => value - values[i]);
  assert.ok(differences.length >= values.length && values.length > 300);
  return Math.max(...differences.map(Math.abs));
}

const morva = inRepository('build/release/morva');
const listed = (command) =>
  JSON.parse(run(morva, command, recording, '--format', 'json')).frames;

test('the module is small and speaks as the native engine does', () => {
  assert.ok(statSync(wasm).size < 600_000 - 20_000); // and its glue
  const engine = newEngine();
  const options = { sampleRate: 48000 };
  const scores = answers(new engine.VoiceActivityDetector(options));
  const levels = answers(new engine.NoiseLevelMeter(options));
  console.log(listed('vad')[0], scores.length, levels.length);
});

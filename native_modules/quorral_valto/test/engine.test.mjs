// The entry points as a native audio engine in the same process sees them.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { test } from 'node:test';
import { setTimeout as sleep } from 'node:timers/promises';
import { levelDb, noise } from './support/audio.mjs';
import { runClean } from './support/child.mjs';
import { binaryFile, enginePath, NC_MODELS, require } from './support/package.mjs';

const valto = require('quorral_valto');
const engine = require(enginePath);

test('the module shows the entry points and its registration, and nothing else', () => {
  const symbols = execFileSync('nm', ['-D', '--defined-only', binaryFile], { encoding: 'utf8' });
  assert.deepEqual(
    symbols
      .trim()
      .split('\n')
      .map((line) => line.split(' ').at(-1))
      .sort(),
    [
      'ValtoNCProcess',
      'ValtoNCReset',
      'ValtoNCSetup',
      'ValtoVADProcess',
      'ValtoVADReset',
      'ValtoVADSetup',
      'napi_register_module_v1',
      'node_api_module_get_api_version_v1',
    ],
  );
});

test('the module needs only what lies beside it, the C and C++ libraries', () => {
  const libraries = execFileSync('readelf', ['-d', binaryFile], { encoding: 'utf8' });
  const needed = [...libraries.matchAll(/NEEDED.*\[(.*)\]/g)].map((match) => match[1]);
  const allowed = /^(lib(c|m|dl|pthread|stdc\+\+|gcc_s|resample|asan|ubsan)\.so|ld-linux)/;
  assert.deepEqual(
    needed.filter((name) => !allowed.test(name)),
    [],
  );
  assert.match(libraries, /NODELETE/);
});

test('set-up before initialisation fails', async () => {
  const { stdout, stderr } = await runClean(`
    loadRaw(); const engine = loadEngine();
    console.log(engine.ncSetup(16000, 10), engine.vadSetup(16000, 10), engine.ncReset(0n));`);
  assert.equal(stdout, '0n 0n -3\n');
  assert.match(stderr, /TRY TO GET NULL INSTANCE,ISN'T INITIALIZED/);
});

test('model, rate and duration of a set-up', async () => {
  const cases = [
    // rate, duration, choice, expected lines, opens, samples of its frame
    [8000, 10, null, 'Setting Valto model: small_NC_8k\n', true, 80],
    [12000, 20, null, 'Setting Valto model: small_NC\n', true, 240],
    [16000, 30, null, 'Setting Valto model: small_NC\n', true, 480],
    [24000, 40, null, 'Setting Valto model: full_NC-ca03f4\n', true, 960],
    [96000, 10, null, 'Setting Valto model: full_NC-ca03f4\n', true, 960],
    [48000, 10, 'small_NC', 'Setting Valto model: small_NC\n', true, 480],
    [192000, 10, null, '', false],
    [
      22050,
      10,
      null,
      'Setting Valto model: full_NC-ca03f4\n' +
        'The input sampling rate 22050 is not supported; using default: 16000\n',
      true,
      160,
    ],
    [
      48000,
      25,
      null,
      'Setting Valto model: full_NC-ca03f4\n' +
        'The input frame duration 25 is not supported; using default: 10\n',
      true,
      480,
    ],
    [48000, 15, null, 'Setting Valto model: full_NC-ca03f4\n', false],
    [48000, 32, null, 'Setting Valto model: full_NC-ca03f4\n', false],
    [
      0,
      0,
      null,
      'Setting Valto model: small_NC_8k\n' +
        'The input sampling rate 0 is not supported; using default: 16000\n' +
        'The input frame duration 0 is not supported; using default: 10\n',
      true,
      160,
    ],
  ];
  for (const [rate, duration, choice, lines, opens, samples] of cases) {
    const { stdout } = await runClean(`
      const raw = loadRaw(); raw._initialize(); raw.setNcModel(${JSON.stringify(choice)});
      const engine = loadEngine();
      const session = engine.ncSetup(${rate}, ${duration});
      const frame = new Int16Array(4000);
      process.stdout.write('\\n' + JSON.stringify([session !== 0n, session === 0n ? null :
        engine.ncProcess(session, frame, ${samples}, frame, ${samples})]));`);
    assert.equal(stdout, `${lines}\n${JSON.stringify([opens, opens ? 0 : null])}`, `${rate} Hz`);
  }
});

test('codes of the entry points', () => {
  valto.initialize();
  engine.attach(binaryFile);
  const cleaner = engine.ncSetup(16000, 10);
  const detector = engine.vadSetup(16000, 10);
  const frame = noise(160, 1);
  const output = new Int16Array(160);
  assert.equal(engine.ncProcess(cleaner, frame, 160, output, 160), 0);
  assert.equal(engine.ncProcess(cleaner, frame, 159, output, 160), 1);
  assert.equal(engine.ncProcess(cleaner, frame, 160, output, 159), 1);
  assert.equal(engine.ncProcess(cleaner, null, 160, output, 160), 1);
  assert.equal(engine.ncProcess(detector, frame, 160, output, 160), 2);
  assert.equal(engine.ncProcess(0n, frame, 160, output, 160), 2);
  const score = engine.vadProcess(detector, frame, 160);
  assert.ok(score >= 0 && score <= 1, `${score}`);
  assert.equal(engine.vadProcess(detector, frame, 161), -3);
  assert.equal(engine.vadProcess(cleaner, frame, 160), -4);
  assert.equal(engine.ncReset(detector), -3);
  assert.equal(engine.ncReset(cleaner), 0);
  assert.equal(engine.ncReset(cleaner), -3);
  assert.equal(engine.vadReset(detector), 0);
  assert.equal(engine.vadReset(detector), -3);
});

test('an engine thread cleans real frames while script lists and switches models', async () => {
  valto.initialize();
  engine.attach(binaryFile);
  const [rate, frameMs, seconds] = [48000, 10, 6];
  const frameSize = (rate * frameMs) / 1000;
  const input = noise(rate * seconds, 7);

  // The same sound through script's own session, with nothing else going on.
  valto.setNcModel(null);
  const expected = input.slice();
  const alone = new valto.NoiseCanceller({ sampleRate: rate, frameMs });
  const detector = new valto.VoiceActivityDetector({ sampleRate: rate, frameMs });
  const expectedScores = [];
  for (let at = 0; at < input.length; at += frameSize) {
    expectedScores.push(detector.process(input.subarray(at, at + frameSize)));
    alone.process(expected.subarray(at, at + frameSize));
  }
  alone.close();
  detector.close();

  engine.start(rate, frameMs, input);
  await sleep(20); // the set-up has read the choice by then
  let rounds = 0;
  while (engine.running()) {
    assert.deepEqual(await valto.getNcModels(), NC_MODELS);
    valto.setNcModel(NC_MODELS[rounds++ % NC_MODELS.length]);
    new valto.NoiseCanceller({ sampleRate: 8000, frameMs: 10, model: 'small_NC_8k' }).close();
  }
  valto.setNcModel(null);
  assert.ok(rounds > 3, `only ${rounds} switches`);

  const output = new Int16Array(input.length);
  const scores = new Float32Array(input.length / frameSize);
  assert.equal(engine.result(output, scores), scores.length);
  assert.deepEqual(output, expected);
  assert.deepEqual([...scores], expectedScores);
  const settled = rate * 2;
  const reduction = levelDb(input.subarray(settled)) - levelDb(output.subarray(settled));
  assert.ok(reduction > 12, `noise only ${reduction.toFixed(1)} dB down`);
});

// Sessions for audio in script: sizes, errors, choice of model, memory.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import vm from 'node:vm';
import { levelDb, noise } from './support/audio.mjs';
import { NC_MODELS, require, run, underSanitizer } from './support/package.mjs';

const valto = require('quorral_valto');
const { NoiseCanceller, VoiceActivityDetector, SAMPLE_RATES, FRAME_DURATIONS } = valto;
const coded = (code) => (error) => error instanceof valto.ValtoError && error.code === code;
const OPTIONS = { sampleRate: 16000, frameMs: 10 };
const KINDS = [NoiseCanceller, VoiceActivityDetector];

test('options that are none', () => {
  const expect = (code, all) => {
    for (const Session of KINDS) {
      for (const options of all) assert.throws(() => new Session(options), coded(code));
    }
  };
  expect('ERR_VALTO_NOT_INITIALIZED', [OPTIONS]);
  valto.initialize();
  const rates = [22050, 0, -8000, 192000, '16000', NaN, undefined, null, 16000n];
  const durations = [15, 32, 25, 0, '10', undefined];
  expect(
    'ERR_VALTO_SAMPLE_RATE',
    rates.map((sampleRate) => ({ ...OPTIONS, sampleRate })),
  );
  expect(
    'ERR_VALTO_FRAME_DURATION',
    durations.map((frameMs) => ({ ...OPTIONS, frameMs })),
  );
  expect('ERR_VALTO_ARGUMENT', [undefined, null, 16000, 'x', { ...OPTIONS, model: 5 }]);
  expect('ERR_VALTO_MODEL', [{ ...OPTIONS, model: 'no such' }]);
  for (const Session of KINDS) assert.throws(() => Session(OPTIONS), TypeError);
});

test('every rate and duration, in place and apart', () => {
  for (const sampleRate of SAMPLE_RATES) {
    for (const frameMs of FRAME_DURATIONS) {
      const [inPlace, apart] = [0, 1].map(() => new NoiseCanceller({ sampleRate, frameMs }));
      const detector = new VoiceActivityDetector({ sampleRate, frameMs });
      for (let n = 0; n < 8; ++n) {
        const frame = noise(Math.floor((sampleRate * frameMs) / 1000), n);
        const input = frame.slice();
        const output = new Int16Array(inPlace.frameSize);
        assert.equal(apart.process(input, output), output);
        assert.deepEqual(input, frame, 'a given output leaves the frame alone');
        assert.equal(inPlace.process(input), input);
        assert.deepEqual(input, output);
        const score = detector.process(frame);
        assert.ok(score >= 0 && score <= 1, `${score}`);
      }
      for (const session of [inPlace, apart, detector]) session.close();
    }
  }
});

test('noise goes down, silence stays silent', () => {
  const canceller = new NoiseCanceller({ sampleRate: 32000, frameMs: 10 });
  assert.equal(canceller.latency, 320);
  for (let n = 0; n < 50; ++n) {
    assert.deepEqual(canceller.process(new Int16Array(320)), new Int16Array(320));
  }
  const frames = Array.from({ length: 300 }, (_, n) => noise(320, n));
  const levels = frames.map((frame) => levelDb(canceller.process(frame, frame.slice())));
  assert.ok(Math.max(...levels.slice(200)) < levelDb(frames[200]) - 10);
});

test('frames that are none', () => {
  const canceller = new NoiseCanceller(OPTIONS);
  const detector = new VoiceActivityDetector(OPTIONS);
  const frame = new Int16Array(160);
  const detached = new Int16Array(160);
  structuredClone(detached.buffer, { transfer: [detached.buffer] });
  const liar = { [Symbol.toStringTag]: 'Int16Array', length: 160 };
  const others = [null, 5, [], new Float32Array(160), new DataView(frame.buffer), { length: 160 }];
  const wrong = {
    ERR_VALTO_FRAME_SIZE: [...[0, 159, 161, 480].map((size) => new Int16Array(size)), detached],
    ERR_VALTO_ARGUMENT: others,
    // Passes for a frame in script and is still refused below it.
    ERR_VALTO_PROCESS: [liar],
  };
  for (const [code, all] of Object.entries(wrong)) {
    for (const other of all) {
      assert.throws(() => canceller.process(other), coded(code));
      assert.throws(() => canceller.process(frame, other), coded(code));
      assert.throws(() => detector.process(other), coded(code));
    }
  }
  assert.equal(canceller.process(frame), frame, 'none of this has disturbed the session');
});

test('frames of another realm, of shared memory, at an offset; a closed session', () => {
  const input = noise(160, 9);
  const expected = new NoiseCanceller(OPTIONS).process(input.slice());
  for (const frame of [
    vm.runInNewContext('new Int16Array(160)'),
    new Int16Array(new SharedArrayBuffer(320)),
    new Int16Array(new ArrayBuffer(1000), 14, 160),
  ]) {
    frame.set(input);
    new NoiseCanceller(OPTIONS).process(frame);
    assert.deepEqual(Int16Array.from(frame), expected);
  }
  for (const Session of KINDS) {
    const session = new Session(OPTIONS);
    assert.equal(session.closed, false);
    session.close();
    session[Symbol.dispose]();
    assert.equal(session.closed, true);
    assert.throws(() => session.process(input), coded('ERR_VALTO_CLOSED'));
    assert.throws(() => session.process.call({}, input), TypeError);
  }
});

test('the model option is for one session, in its thread, and leaves the choice as it was', async () => {
  const each = 60;
  const { stdout } = await run(`
    const { initialize, raw, NoiseCanceller } = require(PACKAGE);
    initialize();
    const open = (model) => {
      try { new NoiseCanceller({ sampleRate: 48000, frameMs: 10, model }).close(); } catch {}
    };
    open('small_NC_8k'); open(); raw.setNcModel('small_NC');
    open('full_NC-ca03f4'); open('none'); open(); open(null);
    const code = \`
      const { NoiseCanceller } = require(PACKAGE);
      for (let i = 0; i < ${each}; ++i) {
        new NoiseCanceller({ sampleRate: 16000, frameMs: 10, model: workerData }).close();
      }\`;
    const workers = ['small_NC_8k', 'full_NC-ca03f4'].map((workerData) => startWorker(code, { workerData }));
    Promise.all(workers.map((worker) => once(worker, 'online'))).then(() => {
      for (let i = 0; i < ${each}; ++i) open();
    });`);
  const used = [...stdout.matchAll(/Setting Valto model: (.*)/g)].map((match) => match[1]);
  const [smallest, small, full] = NC_MODELS;
  assert.deepEqual(used.slice(0, 5), [smallest, full, full, small, small]);
  for (const model of NC_MODELS) {
    assert.equal(used.slice(5).filter((name) => name === model).length, each, model);
  }
});

test('a frame call allocates nothing', async () => {
  const { stdout } = await run(
    `const { initialize, NoiseCanceller } = require(PACKAGE);
     initialize();
     const canceller = new NoiseCanceller({ sampleRate: 8000, frameMs: 10 });
     const frame = new Int16Array(80);
     const output = new Int16Array(80);
     const growth = () => {
       gc();
       const before = process.memoryUsage();
       for (let i = 0; i < 10000; ++i) canceller.process(frame, output);
       const after = process.memoryUsage();
       return [after.heapUsed - before.heapUsed, after.external - before.external];
     };
     const rounds = Array.from({ length: 8 }, growth);
     console.log(...[0, 1].map((i) => Math.min(...rounds.map((round) => round[i]))));`,
    { execArgv: ['--expose-gc', '--single-threaded-gc'] },
  );
  // The best of several rounds: the runtime compiles meanwhile. One heap number a call would be
  // over a hundred kilobytes.
  const [heap, external] = stdout.trim().split('\n').at(-1).split(' ').map(Number);
  assert.ok(heap < 50_000, `heap grew by ${heap} bytes`);
  assert.ok(external <= 0, `${external} bytes outside of the heap`);
});

test('sessions that script closes or forgets are gone, within one turn of the event loop too', async () => {
  // With a heap of that size the collector waits for a hundred megabytes at most.
  const { stdout } = await run(
    `const { initialize, NoiseCanceller } = require(PACKAGE);
     initialize();
     const open = (n) => {
       for (let i = 0; i < n; ++i) {
         const session = new NoiseCanceller({ sampleRate: 16000, frameMs: 10 });
         if (i % 2 === 0) session.close();
       }
       return process.resourceUsage().maxRSS;
     };
     const before = open(1000);
     console.log(open(5000) - before);`,
    { execArgv: ['--max-old-space-size=200'] },
  );
  const grown = Number(stdout.trim().split('\n').at(-1));
  // Five hundred megabytes if they stayed. The sanitizer holds freed memory back.
  if (!underSanitizer) assert.ok(grown < 200_000, `grew by ${grown} kB`);
});

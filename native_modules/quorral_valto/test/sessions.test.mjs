// Sessions for audio in script: sizes, errors, choice of model, ends.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import vm from 'node:vm';
import { levelDb, noise } from './support/audio.mjs';
import { runClean } from './support/child.mjs';
import { require, underSanitizer } from './support/package.mjs';

const valto = require('quorral_valto');
const { NoiseCanceller, VoiceActivityDetector, SAMPLE_RATES, FRAME_DURATIONS } = valto;
const coded = (code) => (error) => error instanceof valto.ValtoError && error.code === code;

test('before initialisation a session is a typed error', async () => {
  const { stdout } = await runClean(`
    const { NoiseCanceller, VoiceActivityDetector } = require(PACKAGE);
    for (const Session of [NoiseCanceller, VoiceActivityDetector]) {
      try { new Session({ sampleRate: 16000, frameMs: 10 }); } catch (error) { console.log(error.code); }
    }`);
  assert.equal(stdout, 'ERR_VALTO_NOT_INITIALIZED\n'.repeat(2));
});

test('sessions', async (t) => {
  valto.initialize();

  await t.test('every rate and duration', () => {
    for (const sampleRate of SAMPLE_RATES) {
      for (const frameMs of FRAME_DURATIONS) {
        const options = { sampleRate, frameMs };
        const inPlace = new NoiseCanceller(options);
        const apart = new NoiseCanceller(options);
        const detector = new VoiceActivityDetector(options);
        const size = Math.floor((sampleRate * frameMs) / 1000);
        assert.equal(inPlace.frameSize, size);
        for (let n = 0; n < 8; ++n) {
          const frame = noise(size, n);
          const input = frame.slice();
          const output = new Int16Array(size);
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

  await t.test('noise goes down, silence stays silent', () => {
    const canceller = new NoiseCanceller({ sampleRate: 32000, frameMs: 10 });
    const input = noise(32000 * 3, 3);
    const output = input.slice();
    for (let at = 0; at < output.length; at += 320)
      canceller.process(output.subarray(at, at + 320));
    assert.ok(levelDb(output.subarray(64000)) < levelDb(input.subarray(64000)) - 12);
    canceller.close();
    const quiet = new NoiseCanceller({ sampleRate: 32000, frameMs: 10 });
    for (let n = 0; n < 50; ++n) {
      assert.deepEqual(quiet.process(new Int16Array(320)), new Int16Array(320));
    }
  });

  await t.test('rates and durations that the engine does not take', () => {
    for (const Session of [NoiseCanceller, VoiceActivityDetector]) {
      for (const sampleRate of [22050, 0, -8000, 192000, '16000', NaN, undefined, null, 16000n]) {
        assert.throws(
          () => new Session({ sampleRate, frameMs: 10 }),
          coded('ERR_VALTO_SAMPLE_RATE'),
        );
      }
      for (const frameMs of [15, 32, 25, 0, '10', undefined]) {
        assert.throws(
          () => new Session({ sampleRate: 16000, frameMs }),
          coded('ERR_VALTO_FRAME_DURATION'),
        );
      }
      for (const options of [undefined, null, 16000, 'x']) {
        assert.throws(() => new Session(options), coded('ERR_VALTO_ARGUMENT'));
      }
      const model = { sampleRate: 16000, frameMs: 10 };
      assert.throws(() => new Session({ ...model, model: 'no such' }), coded('ERR_VALTO_MODEL'));
      assert.throws(() => new Session({ ...model, model: 5 }), coded('ERR_VALTO_ARGUMENT'));
      assert.throws(() => Session(model), TypeError);
    }
  });

  await t.test('frames that are none', () => {
    const canceller = new NoiseCanceller({ sampleRate: 16000, frameMs: 10 });
    const detector = new VoiceActivityDetector({ sampleRate: 16000, frameMs: 10 });
    const frame = new Int16Array(160);
    const detached = new Int16Array(160);
    structuredClone(detached.buffer, { transfer: [detached.buffer] });
    for (const size of [0, 159, 161, 480]) {
      const wrong = new Int16Array(size);
      assert.throws(() => canceller.process(wrong), coded('ERR_VALTO_FRAME_SIZE'));
      assert.throws(() => canceller.process(frame, wrong), coded('ERR_VALTO_FRAME_SIZE'));
      assert.throws(() => detector.process(wrong), coded('ERR_VALTO_FRAME_SIZE'));
    }
    assert.throws(() => canceller.process(detached), coded('ERR_VALTO_FRAME_SIZE'));
    const others = [
      undefined,
      null,
      5,
      [],
      new Float32Array(160),
      new Uint16Array(160),
      new DataView(frame.buffer),
    ];
    for (const other of [...others, { length: 160 }]) {
      assert.throws(() => canceller.process(other), coded('ERR_VALTO_ARGUMENT'));
      assert.throws(() => detector.process(other), coded('ERR_VALTO_ARGUMENT'));
      if (other === undefined) continue; // the same as no output
      assert.throws(() => canceller.process(frame, other), coded('ERR_VALTO_ARGUMENT'));
    }
    // A liar that passes for a frame in script is still refused below it.
    const liar = { [Symbol.toStringTag]: 'Int16Array', length: 160 };
    assert.throws(() => canceller.process(liar), coded('ERR_VALTO_PROCESS'));
    assert.throws(() => detector.process(liar), coded('ERR_VALTO_PROCESS'));
    // None of this has disturbed the session.
    assert.equal(canceller.process(frame), frame);
  });

  await t.test('frames of another realm, of shared memory, at an offset', () => {
    const input = noise(160, 9);
    const frames = [
      vm.runInNewContext('new Int16Array(160)'),
      new Int16Array(new SharedArrayBuffer(320)),
      new Int16Array(new ArrayBuffer(1000), 14, 160),
    ];
    const expected = new NoiseCanceller({ sampleRate: 16000, frameMs: 10 }).process(input.slice());
    for (const frame of frames) {
      frame.set(input);
      new NoiseCanceller({ sampleRate: 16000, frameMs: 10 }).process(frame);
      assert.deepEqual(Int16Array.from(frame), expected);
    }
  });

  await t.test('close', () => {
    for (const Session of [NoiseCanceller, VoiceActivityDetector]) {
      const session = new Session({ sampleRate: 16000, frameMs: 10 });
      assert.equal(session.closed, false);
      session.close();
      session.close();
      session[Symbol.dispose]();
      assert.equal(session.closed, true);
      assert.throws(() => session.process(new Int16Array(160)), coded('ERR_VALTO_CLOSED'));
      assert.throws(() => session.process.call({}, new Int16Array(160)), TypeError);
      assert.throws(() => session.process.call(undefined, new Int16Array(160)), TypeError);
    }
  });
});

test('the model option leaves the choice of script as it was', async () => {
  const { stdout } = await runClean(`
    const { initialize, raw, NoiseCanceller } = require(PACKAGE);
    initialize();
    const options = { sampleRate: 48000, frameMs: 10 };
    const open = (model) => { try { new NoiseCanceller({ ...options, model }); } catch {} };
    open('small_NC_8k'); open(); raw.setNcModel('small_NC');
    open('full_NC-ca03f4'); open('none'); open(); open(null);`);
  const used = [...stdout.matchAll(/Setting Valto model: (.*)/g)].map((match) => match[1]);
  assert.deepEqual(used, [
    'small_NC_8k',
    'full_NC-ca03f4',
    'full_NC-ca03f4',
    'small_NC',
    'small_NC',
  ]);
});

test('model options of several threads do not mix', async () => {
  const each = 60;
  const { stdout } = await runClean(`
    const { initialize, raw, NoiseCanceller } = require(PACKAGE);
    initialize();
    raw.setNcModel('small_NC');
    const code = \`
      const { NoiseCanceller } = require(PACKAGE);
      for (let i = 0; i < ${each}; ++i) {
        new NoiseCanceller({ sampleRate: 16000, frameMs: 10, model: workerData }).close();
      }\`;
    const workers = ['small_NC_8k', 'full_NC-ca03f4'].map((workerData) => startWorker(code, { workerData }));
    Promise.all(workers.map((worker) => once(worker, 'online'))).then(() => {
      for (let i = 0; i < ${each}; ++i) new NoiseCanceller({ sampleRate: 16000, frameMs: 10 }).close();
    });`);
  for (const model of ['small_NC', 'small_NC_8k', 'full_NC-ca03f4']) {
    const lines = stdout.split('\n').filter((line) => line === `Setting Valto model: ${model}`);
    assert.equal(lines.length, each, model);
  }
});

test('a frame call allocates nothing', async () => {
  const { stdout } = await runClean(
    `const { initialize, NoiseCanceller } = require(PACKAGE);
     initialize();
     const canceller = new NoiseCanceller({ sampleRate: 8000, frameMs: 10 });
     const frame = new Int16Array(80);
     const output = new Int16Array(80);
     const frames = (n) => { for (let i = 0; i < n; ++i) canceller.process(frame, output); };
     const growth = (n) => {
       gc();
       const before = process.memoryUsage();
       frames(n);
       const after = process.memoryUsage();
       return [after.heapUsed - before.heapUsed, after.external - before.external];
     };
     const rounds = Array.from({ length: 8 }, () => growth(10000));
     console.log(...[0, 1].map((i) => Math.min(...rounds.map((round) => round[i]))));`,
    { execArgv: ['--expose-gc', '--single-threaded-gc'] },
  );
  // The best of several rounds: the runtime compiles meanwhile. One heap number a call would be
  // over a hundred kilobytes.
  const [heap, external] = stdout.trim().split('\n').at(-1).split(' ').map(Number);
  assert.ok(heap < 20_000, `heap grew by ${heap} bytes`);
  assert.ok(external <= 0, `${external} bytes outside of the heap`);
});

test('sessions that script forgets are closed when collected', async () => {
  const { stdout } = await runClean(
    `const { initialize, NoiseCanceller } = require(PACKAGE);
     initialize();
     const open = async (n) => {
       for (let i = 0; i < n; ++i) {
         new NoiseCanceller({ sampleRate: 16000, frameMs: 10 }).process(new Int16Array(160));
         if (i % 20 === 19) { gc(); await sleep(0); }
       }
       gc();
       await sleep(5);
       return process.memoryUsage.rss();
     };
     open(100).then(async (before) => console.log((await open(1000)) - before));`,
    { execArgv: ['--expose-gc'] },
  );
  const grown = Number(stdout.trim().split('\n').at(-1));
  // The sanitizer holds freed memory back.
  if (!underSanitizer) assert.ok(grown < 30e6, `grew by ${grown} bytes`);
});

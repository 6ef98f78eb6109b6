// Sessions for audio in script: sizes, errors, choice of model, memory.
import assert from 'node:assert/strict';
import { Readable } from 'node:stream';
import { test } from 'node:test';
import vm from 'node:vm';
import { noise, randomSource } from './support/audio.mjs';
import { NC_MODELS, require, run, underSanitizer } from './support/package.mjs';

const valto = require('quorral_valto');
const { NoiseCanceller, VoiceActivityDetector, SAMPLE_RATES, FRAME_DURATIONS } = valto;
const coded = (code) => (error) => error instanceof valto.ValtoError && error.code === code;
const OPTIONS = { sampleRate: 16000, frameMs: 10 };
const KINDS = [NoiseCanceller, VoiceActivityDetector];

/** Each code names the values for which each use throws it. */
function refuse(wrong, ...uses) {
  for (const [code, values] of Object.entries(wrong)) {
    for (const value of values)
      for (const use of uses) assert.throws(() => use(value), coded(code));
  }
}

test('options that are none', () => {
  const openings = KINDS.map((Session) => (options) => new Session(options));
  refuse({ ERR_VALTO_NOT_INITIALIZED: [OPTIONS] }, ...openings);
  valto.initialize();
  const each = (key, values) => values.map((value) => ({ ...OPTIONS, [key]: value }));
  const rates = [22050, 0, -8000, 192000, '16000', NaN, undefined, null, 16000n];
  const wrong = {
    ERR_VALTO_SAMPLE_RATE: each('sampleRate', rates),
    ERR_VALTO_FRAME_DURATION: each('frameMs', [15, 32, 25, 0, '10', undefined]),
    ERR_VALTO_ARGUMENT: [undefined, null, 16000, 'x', ...each('model', [5])],
    ERR_VALTO_MODEL: each('model', ['no such']),
  };
  refuse(wrong, ...openings);
  const limits = each('attenuationLimit', [-1, NaN, '6']);
  const wrongHere = {
    ERR_VALTO_ARGUMENT: [...limits, ...each('voice', [1])],
    ERR_VALTO_MODEL: each('voice', ['no such', NC_MODELS[0]]),
  };
  refuse(wrongHere, openings[0]);
  for (const Session of KINDS) assert.throws(() => Session(OPTIONS), TypeError);
});

const ARRAYS = [
  (size) => new Int16Array(size),
  (size) => vm.runInNewContext(`new Int16Array(${size})`),
  (size) => new Int16Array(new SharedArrayBuffer(2 * size)),
  (size) => new Int16Array(new ArrayBuffer(2 * size + 40), 14, size),
];
const same = (a, b) => assert.deepEqual(Array.from(a), Array.from(b));

test('every rate, duration and kind of memory, in place and apart', () => {
  for (const sampleRate of SAMPLE_RATES) {
    for (const frameMs of FRAME_DURATIONS) {
      const [inPlace, apart] = [0, 1].map(() => new NoiseCanceller({ sampleRate, frameMs }));
      const detector = new VoiceActivityDetector({ sampleRate, frameMs });
      for (let n = 0; n < 8; ++n) {
        const frame = noise(Math.floor((sampleRate * frameMs) / 1000), n);
        const [input, output] = [0, 1].map((k) => ARRAYS[(n + k) % 4](inPlace.frameSize));
        input.set(frame);
        assert.equal(apart.process(input, output), output);
        same(input, frame); // a given output leaves it alone
        assert.equal(inPlace.process(input), input);
        same(input, output);
        const score = detector.process(frame);
        assert.ok(score >= 0 && score <= 1, `${score}`);
      }
      for (const session of [inPlace, apart, detector]) session.close();
    }
  }
});

test('frames that are none', () => {
  const canceller = new NoiseCanceller(OPTIONS);
  const detector = new VoiceActivityDetector(OPTIONS);
  assert.equal(new NoiseCanceller({ sampleRate: 48000, frameMs: 10 }).latency, 480);
  const frame = new Int16Array(160);
  const detached = new Int16Array(160);
  structuredClone(detached.buffer, { transfer: [detached.buffer] });
  const liar = { [Symbol.toStringTag]: 'Int16Array', length: 160 };
  const others = [null, 5, [], new Float64Array(160), new DataView(frame.buffer), { length: 160 }];
  const wrong = {
    ERR_VALTO_FRAME_SIZE: [...[0, 159, 161, 480].map((size) => new Int16Array(size)), detached],
    ERR_VALTO_ARGUMENT: others,
    // Passes for a frame in script and is still refused below it.
    ERR_VALTO_PROCESS: [liar],
  };
  const each = [canceller, detector].map((session) => (other) => session.process(other));
  refuse(wrong, (other) => canceller.process(frame, other), ...each);
  const mixed = { ERR_VALTO_ARGUMENT: [new Float32Array(160)] };
  refuse(mixed, (other) => canceller.process(frame, other));
  assert.equal(canceller.process(frame), frame, 'none of this has disturbed the session');
});

const floats = (samples) => Float32Array.from(samples, (sample) => sample / 32768);
const near = (a, b, steps) => {
  assert.equal(a.length, b.length);
  a.forEach((sample, i) => {
    assert.ok(Math.abs(sample - b[i]) <= steps / 32768, `${sample} for ${b[i]} at ${i}`);
  });
};

/** What a session makes of a sound, in its place and as long. */
function cleaned(sound, options) {
  const session = new NoiseCanceller({ ...OPTIONS, ...options });
  const padded = new sound.constructor(
    Math.ceil((sound.length + session.latency) / session.frameSize) * session.frameSize,
  );
  padded.set(sound);
  for (let at = 0; at < padded.length; at += session.frameSize) {
    session.process(padded.subarray(at, at + session.frameSize));
  }
  return padded.subarray(session.latency, session.latency + sound.length);
}

test('floating point, limit, bypass and meters', () => {
  const sound = noise(16000, 5);
  near(cleaned(floats(sound)), floats(cleaned(sound)), 1);
  for (const open of [{ attenuationLimit: 0 }, { bypass: true }]) {
    near(cleaned(sound, open).subarray(320), sound.subarray(320), 32768);
  }
  const session = new NoiseCanceller({ ...OPTIONS, voice: true });
  assert.deepEqual(
    [session.voiceScore, session.attenuationLimit, session.bypass],
    [NaN, Infinity, false],
  );
  session.attenuationLimit = 0; // later than the constructor
  session.bypass = true;
  for (let at = 0; at < sound.length; at += 160) session.process(sound.slice(at, at + 160));
  const detector = new VoiceActivityDetector(OPTIONS);
  const scores = [sound, floats(sound)].map((kind) => detector.process(kind.slice(0, 160)));
  for (const score of [session.voiceScore, ...scores])
    assert.ok(score >= 0 && score <= 1, `${score}`);
  assert.ok(session.noiseLevel > 40, 'noise is heard, whatever is removed');
});

test('blocks of any length, and streams of any chunks, give what frames give', async () => {
  const random = randomSource(3);
  const pieces = (samples, longest) => {
    const all = [];
    for (let at = 0; at < samples.length; ) {
      const end = at + Math.floor(random() * (longest + 1));
      all.push(samples.subarray(at, end));
      at = end;
    }
    return all;
  };
  const left = noise(7777, 8);
  const right = noise(7777, 9, 30000);
  for (const sampleRate of [16000, 44100]) {
    const wanted = [left, right].map((sound) => cleaned(sound, { sampleRate }));
    for (const sound of [left, floats(left), left.subarray(0, 1), left.subarray(0, 0)]) {
      const session = new NoiseCanceller({ sampleRate, frameMs: 10 });
      const parts = [...pieces(sound, 900).map((block) => session.push(block)), session.flush()];
      const got = new sound.constructor(parts.flatMap((part) => Array.from(part)));
      const whole = cleaned(sound, { sampleRate });
      same(got, whole);
      assert.throws(() => session.push(sound), coded('ERR_VALTO_CLOSED'));
    }
    const stereo = new Int16Array(2 * 7777).map((_, i) => [left, right][i % 2][i >> 1]);
    const bytes = new Uint8Array(stereo.buffer);
    const through = new valto.NoiseCancellerStream({ sampleRate, channels: 2 });
    const out = Buffer.concat(await Readable.from(pieces(bytes, 999)).pipe(through).toArray());
    const both = new Int16Array(new Uint8Array(out).buffer);
    same(
      both,
      stereo.map((_, i) => wanted[i % 2][i >> 1]),
    );
    assert.ok(through.cancellers.every((session) => session.closed));
  }
});

test('a closed session', () => {
  for (const Session of KINDS) {
    const session = new Session(OPTIONS);
    assert.equal(session.closed, false);
    session.close();
    session[Symbol.dispose]();
    assert.equal(session.closed, true);
    assert.throws(() => session.process(new Int16Array(160)), coded('ERR_VALTO_CLOSED'));
    assert.throws(() => session.process.call({}, new Int16Array(160)), TypeError);
  }
});

test('the model option is for one session, in its thread, and leaves the choice as it was', async () => {
  const each = 60;
  const { stdout } = await run(`
    const { initialize, raw, NoiseCanceller } = require(PACKAGE);
    initialize({ onDiagnostic: (text) => console.log(text) });
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

test('sessions, frames and callbacks by the thousand leave nothing behind', async () => {
  const { stdout } = await run(
    `const { initialize, raw, NoiseCanceller } = require(PACKAGE);
     initialize();
     const open = (n) => {
       for (let i = 0; i < n; ++i) {
         const session = new NoiseCanceller({ sampleRate: 16000, frameMs: 10 });
         if (i % 2 === 0) session.close(); // the others are forgotten
       }
       return process.resourceUsage().maxRSS;
     };
     const before = open(1000);
     const ofSessions = open(10000) - before; // within one turn of the event loop
     const canceller = new NoiseCanceller({ sampleRate: 8000, frameMs: 10 });
     const [frame, output] = [new Int16Array(80), new Int16Array(80)];
     const frames = () => {
       for (let i = 0; i < 10000; ++i) canceller.process(frame, output);
     };
     const callbacks = async () => {
       for (let i = 0; i < 100000; i += 500) {
         for (let k = 1; k < 500; ++k) raw._getNcModels(() => {});
         await new Promise((resolve) => raw._getNcModels(resolve));
         if (i % 10000 === 0) gc();
       }
       gc(); await sleep(0); gc();
     };
     // The best of several rounds: the runtime compiles meanwhile, and grows in steps now and then.
     const growth = async (rounds, work) => {
       const grown = [];
       for (let i = 0; i < rounds; ++i) {
         gc();
         const before = process.memoryUsage();
         await work();
         const after = process.memoryUsage();
         grown.push([after.heapUsed - before.heapUsed, after.external - before.external]);
       }
       return [0, 1].map((k) => Math.min(...grown.map((each) => each[k])));
     };
     (async () => {
       await sleep(0); // by then the runtime has finalized the sessions
       let collected = 0;
       const registry = new FinalizationRegistry(() => ++collected);
       for (let i = 0; i < 100; ++i) {
         const callback = () => i;
         registry.register(callback, i);
         loadProbe().keep(callback);
       }
       loadProbe().callAndDropKept();
       const [ofFrames, ofCallbacks] = [await growth(8, frames), await growth(4, callbacks)];
       console.log(JSON.stringify({ ofSessions, ofFrames, ofCallbacks, collected }));
     })();`,
    // With a heap of that size the collector waits for a hundred megabytes at most.
    { execArgv: ['--max-old-space-size=200'] },
  );
  const { ofSessions, ofFrames, ofCallbacks, collected } = JSON.parse(stdout.match(/{.*}/));
  // Hundreds of megabytes more if they stayed. The sanitizer holds freed memory back.
  if (!underSanitizer) assert.ok(ofSessions < 200_000, `sessions: ${ofSessions} kB`);
  const [heap, external] = ofFrames;
  assert.ok(heap < 50_000, `frames: ${heap} bytes`); // a heap number each: over a hundred kilobytes
  assert.ok(external <= 0, `frames: ${external} bytes outside of the heap`);
  assert.ok(ofCallbacks[0] < 1e6, `callbacks: ${ofCallbacks[0]} bytes`); // a reference each: ten million
  assert.ok(collected >= 99, `${collected} collected`);
});

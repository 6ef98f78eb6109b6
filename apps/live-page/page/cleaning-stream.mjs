// One sound on its way through the engine: any number of samples in, as many cleaned ones out, in step
// with the input, with a voice score and a noise level per frame. The model can be changed in the middle.
//
// Every model has a delay of its own. All are brought to the longest one, so that a change of model does
// not move the sound, and that delay is taken out of what comes back.
//
// The engine is a parameter: an object with the classes `NoiseCanceller` and `VoiceActivityDetector` of the
// npm package's shape, wherever it runs.
import { FRAME_MS } from './protocol.mjs';

const HISTORY_FRAMES = 100; // what a model hears before it takes over
const SMOOTHING_MS = 1000;
const FULL_SCALE_POWER = 32768 ** 2;
const FLOOR_DB = -100;

/** Holds samples back; works in place. */
class DelayLine {
  #line;
  #samples;

  constructor(samples, frameSize) {
    this.#samples = samples;
    this.#line = new Int16Array(samples + frameSize);
  }

  process(frame) {
    this.#line.set(frame, this.#samples);
    frame.set(this.#line.subarray(0, frame.length));
    this.#line.copyWithin(0, frame.length);
    return frame;
  }
}

/** A session whose delay is `latency`, whatever the model's own is. */
class DelayedCanceller {
  #session;
  #padding;

  constructor(engine, options, latency) {
    this.#session = new engine.NoiseCanceller(options);
    this.#padding = new DelayLine(latency - this.#session.latency, this.#session.frameSize);
  }

  process(frame) {
    return this.#padding.process(this.#session.process(frame, new Int16Array(frame.length)));
  }

  close() {
    this.#session.close();
  }
}

/** Level of what was removed: mean power of input minus output over about a second, in dB. */
class RemovedLevel {
  #power = 0;
  #frames = 0;

  next(input, output) {
    let sum = 0;
    for (let i = 0; i < input.length; ++i) sum += (input[i] - output[i]) ** 2;
    this.#frames += 1;
    const share = Math.max(1 / this.#frames, 1 - Math.exp(-FRAME_MS / SMOOTHING_MS));
    this.#power += (sum / input.length - this.#power) * share;
    return Math.max(FLOOR_DB, 10 * Math.log10(this.#power / FULL_SCALE_POWER + 1e-12));
  }
}

function crossFade(from, to) {
  const n = to.length;
  return to.map((sample, i) => Math.round(from[i] + ((sample - from[i]) * (i + 1)) / n));
}

/** The longest delay among models at a rate, in samples. */
function commonLatency(engine, models, sampleRate) {
  const latencies = models.map((model) => {
    const session = new engine.NoiseCanceller({ sampleRate, frameMs: FRAME_MS, model });
    session.close();
    return session.latency;
  });
  return Math.max(...latencies);
}

export class CleaningStream {
  #engine;
  #options;
  #current;
  #next = null;
  #detector;
  #inputDelay;
  #level = new RemovedLevel();
  #history = [];
  #pending;
  #pendingLength = 0;
  #received = 0;
  #processed = 0;
  #voiceFrames = 0;
  #noiseFrames = 0;

  /**
   * @param {{ sampleRate: number, model: string, models: string[] }} options `models`: all that
   *   `switchModel` may be asked for
   */
  constructor(engine, { sampleRate, model, models }) {
    this.#engine = engine;
    this.#options = { sampleRate, frameMs: FRAME_MS };
    this.latency = commonLatency(engine, models, sampleRate);
    this.#current = this.#open(model);
    try {
      this.#detector = new engine.VoiceActivityDetector(this.#options);
    } catch (failure) {
      this.#current.close();
      throw failure;
    }
    const frameSize = (sampleRate * FRAME_MS) / 1000;
    this.#inputDelay = new DelayLine(this.latency, frameSize);
    this.#pending = new Int16Array(frameSize);
  }

  #open(model) {
    return new DelayedCanceller(this.#engine, { ...this.#options, model }, this.latency);
  }

  /** Samples taken so far. */
  get received() {
    return this.#received;
  }

  /** The model takes over with the next frame, cross-faded, after hearing what was said just now. */
  switchModel(model) {
    const opened = this.#open(model);
    for (const frame of this.#history) opened.process(frame);
    this.#next?.close();
    this.#next = opened;
  }

  /** @param {Int16Array} samples any number */
  push(samples) {
    this.#received += samples.length;
    return this.#collect(samples);
  }

  /** What is still inside; the stream takes no more sound afterwards. */
  finish() {
    const frameSize = this.#pending.length;
    const frames = Math.ceil(this.#received / frameSize);
    const [voiceLeft, noiseLeft] = [frames - this.#voiceFrames, frames - this.#noiseFrames];
    const total = (frames + Math.ceil(this.latency / frameSize)) * frameSize;
    const tail = this.#collect(new Int16Array(total - this.#received));
    const excess = total - this.latency - this.#received;
    return {
      samples: tail.samples.subarray(0, tail.samples.length - excess),
      voice: tail.voice.slice(0, voiceLeft),
      noise: tail.noise.slice(0, noiseLeft),
    };
  }

  close() {
    for (const part of [this.#current, this.#next, this.#detector]) part?.close();
  }

  #collect(samples) {
    const frameSize = this.#pending.length;
    const result = { samples: [], voice: [], noise: [] };
    for (let at = 0; at < samples.length; ) {
      const taken = samples.subarray(at, at + frameSize - this.#pendingLength);
      this.#pending.set(taken, this.#pendingLength);
      this.#pendingLength += taken.length;
      at += taken.length;
      if (this.#pendingLength === frameSize) this.#frame(result);
    }
    const length = result.samples.reduce((sum, part) => sum + part.length, 0);
    const joined = new Int16Array(length);
    let at = 0;
    for (const part of result.samples) {
      joined.set(part, at);
      at += part.length;
    }
    return { ...result, samples: joined };
  }

  #frame(result) {
    const input = this.#pending.slice();
    this.#pendingLength = 0;
    const cleaned = this.#clean(input);
    this.#remember(input);
    result.voice.push(this.#detector.process(input));
    this.#voiceFrames += 1;
    const delayed = this.#inputDelay.process(input.slice());
    if (this.#processed >= this.latency) {
      result.noise.push(this.#level.next(delayed, cleaned));
      this.#noiseFrames += 1;
    }
    const leading = Math.max(0, Math.min(input.length, this.latency - this.#processed));
    this.#processed += input.length;
    result.samples.push(cleaned.subarray(leading));
  }

  #clean(input) {
    const cleaned = this.#current.process(input);
    if (this.#next === null) return cleaned;
    const faded = crossFade(cleaned, this.#next.process(input));
    this.#current.close();
    this.#current = this.#next;
    this.#next = null;
    return faded;
  }

  #remember(frame) {
    this.#history.push(frame);
    if (this.#history.length > HISTORY_FRAMES) this.#history.shift();
  }
}

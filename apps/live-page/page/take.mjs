// One recording as the page holds it: what went in, what came back, and what was measured on the way.
// Samples are 16-bit mono at `rate`; cleaned ones are in step with the original.
import { FRAME_MS } from './protocol.mjs';
import { Spectra } from './spectra.mjs';

/** A typed array that grows. */
export class Growing {
  #values;
  #length = 0;

  constructor(Type, capacity = 4096) {
    this.#values = new Type(capacity);
  }

  get length() {
    return this.#length;
  }

  get values() {
    return this.#values.subarray(0, this.#length);
  }

  append(values) {
    const length = this.#length + values.length;
    if (length > this.#values.length) {
      const larger = new this.#values.constructor(2 * length);
      larger.set(this.values);
      this.#values = larger;
    }
    this.#values.set(values, this.#length);
    this.#length = length;
  }
}

class Sound {
  constructor(rate) {
    this.samples = new Growing(Int16Array, 10 * rate);
    this.spectra = new Spectra(rate);
  }

  append(samples) {
    this.samples.append(samples);
    this.spectra.append(samples);
  }
}

// Frames below this score count as pauses.
const PAUSE_SCORE = 0.5;
const FEWEST_PAUSE_FRAMES = 20;

const energy = (samples) => samples.reduce((sum, sample) => sum + sample ** 2, 0);

export class Take {
  constructor(rate, name) {
    this.rate = rate;
    this.name = name;
    this.before = new Sound(rate);
    this.forgetCleaned();
  }

  /** Makes room for another model's result. */
  forgetCleaned() {
    this.isComplete = false;
    this.models = [];
    this.after = new Sound(this.rate);
    this.voice = new Growing(Float32Array);
    this.noise = new Growing(Float32Array);
  }

  addOriginal(samples) {
    this.before.append(samples);
  }

  addResult({ samples, voice, noise }) {
    this.after.append(samples);
    this.voice.append(voice);
    this.noise.append(noise);
  }

  get seconds() {
    return this.before.samples.length / this.rate;
  }

  /**
   * How much quieter the pauses have become, in dB: the median of their frames, which a few frames of
   * speech among them do not move. Null when there are hardly any.
   */
  pauseReduction() {
    const frameSize = (this.rate * FRAME_MS) / 1000;
    const [before, after] = [this.before.samples.values, this.after.samples.values];
    const changes = [];
    this.voice.values.forEach((score, k) => {
      const frame = [k * frameSize, (k + 1) * frameSize];
      const original = energy(before.subarray(...frame));
      if (score >= PAUSE_SCORE || original === 0) return;
      changes.push(10 * Math.log10((energy(after.subarray(...frame)) + 1) / original));
    });
    if (changes.length < FEWEST_PAUSE_FRAMES) return null;
    return changes.sort((a, b) => a - b)[changes.length >> 1];
  }
}

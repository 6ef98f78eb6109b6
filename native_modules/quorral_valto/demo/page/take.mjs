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

// A pause is where the score has been below this for a while.
const PAUSE_SCORE = 0.5;
const PAUSE_MARGIN_FRAMES = 15;
const FEWEST_PAUSE_FRAMES = 20;

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

  /** How much quieter the pauses have become, in dB; null when there are hardly any. */
  pauseReduction() {
    const frame = (this.rate * FRAME_MS) / 1000;
    const [before, after] = [this.before.samples.values, this.after.samples.values];
    const voice = this.voice.values;
    const sums = [0, 0];
    let frames = 0;
    let quiet = 0;
    for (let k = 0; k < voice.length && (k + 1) * frame <= after.length; ++k) {
      quiet = voice[k] < PAUSE_SCORE ? quiet + 1 : 0;
      if (quiet <= PAUSE_MARGIN_FRAMES) continue;
      frames += 1;
      for (let i = k * frame; i < (k + 1) * frame; ++i) {
        sums[0] += before[i] ** 2;
        sums[1] += after[i] ** 2;
      }
    }
    if (frames < FEWEST_PAUSE_FRAMES || sums[0] === 0) return null;
    return 10 * Math.log10((sums[1] + 1) / (sums[0] + 1));
  }
}

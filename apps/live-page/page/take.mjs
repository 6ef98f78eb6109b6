// One recording as the page holds it: what went in, what came back, and what was measured on the way.
// Samples are 16-bit mono at `rate`; cleaned ones are in step with the original.
import { noiseInPauses } from './pauses.mjs';
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

export class Take {
  /** What was done to its rate, in words; empty for nothing. */
  conversion = '';

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

  /** How far the noise in the pauses goes down, in words, or null. */
  get noiseInPauses() {
    return noiseInPauses({
      before: this.before.samples.values,
      after: this.after.samples.values,
      rate: this.rate,
      scores: this.voice.values,
      frameMs: FRAME_MS,
      cut: 0.5, // the engine's 16-bit interface drops fractions
    });
  }
}

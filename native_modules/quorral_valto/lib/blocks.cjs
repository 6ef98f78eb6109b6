'use strict';
// From blocks of any length to frames and back, without the delay: what comes out is as long as what
// went in and lies where it lay.

class Blocks {
  #clean;
  #frame;
  #filled = 0;
  #skip;
  #taken = 0;
  #given = 0;

  /**
   * @param {Int16Array | Float32Array} frame to collect samples in
   * @param {number} latency in samples
   * @param {(frame: Int16Array | Float32Array) => void} clean does so in place
   */
  constructor(frame, latency, clean) {
    this.#frame = frame;
    this.#skip = latency;
    this.#clean = clean;
  }

  takes(block) {
    return block[Symbol.toStringTag] === this.#frame[Symbol.toStringTag];
  }

  push(block) {
    this.#taken += block.length;
    return this.#run(block);
  }

  flush() {
    const rest = this.#taken - this.#given;
    const frames = rest === 0 ? 0 : Math.ceil((rest + this.#skip) / this.#frame.length);
    return this.#run(this.#samples(Math.max(frames * this.#frame.length - this.#filled, 0)));
  }

  #samples(length) {
    return new this.#frame.constructor(length);
  }

  #run(block) {
    const size = this.#frame.length;
    const cleaned = this.#samples(Math.floor((this.#filled + block.length) / size) * size);
    for (let at = 0, written = 0; at < block.length; ) {
      const part = block.subarray(at, at + size - this.#filled);
      this.#frame.set(part, this.#filled);
      this.#filled += part.length;
      at += part.length;
      if (this.#filled < size) break;
      this.#clean(this.#frame);
      cleaned.set(this.#frame, written);
      written += size;
      this.#filled = 0;
    }
    const skipped = Math.min(this.#skip, cleaned.length);
    this.#skip -= skipped;
    const ready = cleaned.subarray(skipped, skipped + this.#taken - this.#given);
    this.#given += ready.length;
    return ready;
  }
}

module.exports = { Blocks };

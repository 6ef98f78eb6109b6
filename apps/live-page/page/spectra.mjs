// Short-time spectra of a growing sound, one column after the other.
import { Analyser, ROWS, SIZE } from './spectrum.mjs';

const HOP = 512;

export class Spectra {
  #analyser;
  #columns = new Uint8Array(512 * ROWS);
  #waiting = new Int16Array(SIZE);
  #filled = SIZE / 2; // half a window of nothing: column c is centred at sample c * HOP

  /** Columns so far. */
  count = 0;

  constructor(rate) {
    this.columnsPerSecond = rate / HOP;
    this.#analyser = new Analyser(rate);
  }

  /** One column, low frequencies first. */
  column(index) {
    return this.#columns.subarray(index * ROWS, (index + 1) * ROWS);
  }

  append(samples) {
    for (let at = 0; at < samples.length; ) {
      const taken = samples.subarray(at, at + SIZE - this.#filled);
      this.#waiting.set(taken, this.#filled);
      this.#filled += taken.length;
      at += taken.length;
      if (this.#filled < SIZE) continue;
      this.#analyser.analyse(this.#waiting, this.#nextColumn());
      this.#waiting.copyWithin(0, HOP);
      this.#filled = SIZE - HOP;
    }
  }

  #nextColumn() {
    this.count += 1;
    if (this.count * ROWS > this.#columns.length) {
      const larger = new Uint8Array(2 * this.#columns.length);
      larger.set(this.#columns);
      this.#columns = larger;
    }
    return this.column(this.count - 1);
  }
}

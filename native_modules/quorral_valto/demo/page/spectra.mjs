// Short-time spectra of a growing sound, as columns of bytes on a mel-spaced frequency axis.

export const ROWS = 192;
const SIZE = 2048;
const HOP = 512;
const LOWEST_DB = -102; // byte 0; re a full-scale sine
const HIGHEST_DB = -14; // byte 255

const mel = (hertz) => 2595 * Math.log10(1 + hertz / 700);
const hertz = (melValue) => 700 * (10 ** (melValue / 2595) - 1);

/** Place of a frequency on the axis, 0 at the bottom to 1 at half the sampling rate. */
export const axisPlace = (frequency, rate) => mel(frequency) / mel(rate / 2);

const window = Float64Array.from({ length: SIZE }, (_, i) => {
  return 0.5 - 0.5 * Math.cos((2 * Math.PI * i) / SIZE);
});

/** In-place radix-2 transform of a fixed size. */
class Fft {
  constructor(size) {
    this.size = size;
    this.cos = Float64Array.from({ length: size / 2 }, (_, i) =>
      Math.cos((2 * Math.PI * i) / size),
    );
    this.sin = Float64Array.from({ length: size / 2 }, (_, i) =>
      Math.sin((2 * Math.PI * i) / size),
    );
    const bits = Math.log2(size);
    this.order = Uint32Array.from({ length: size }, (_, i) => {
      let reversed = 0;
      for (let bit = 0; bit < bits; ++bit) reversed |= ((i >> bit) & 1) << (bits - 1 - bit);
      return reversed;
    });
  }

  run(re, im) {
    for (let i = 0; i < this.size; ++i) {
      const j = this.order[i];
      if (j <= i) continue;
      [re[i], re[j]] = [re[j], re[i]];
      [im[i], im[j]] = [im[j], im[i]];
    }
    for (let half = 1; half < this.size; half *= 2) this.#stage(re, im, half);
  }

  #stage(re, im, half) {
    const step = this.size / (2 * half);
    for (let start = 0; start < this.size; start += 2 * half) {
      for (let k = 0; k < half; ++k) {
        const [a, b] = [start + k, start + k + half];
        const [c, s] = [this.cos[k * step], -this.sin[k * step]];
        const x = re[b] * c - im[b] * s;
        const y = re[b] * s + im[b] * c;
        re[b] = re[a] - x;
        im[b] = im[a] - y;
        re[a] += x;
        im[a] += y;
      }
    }
  }
}

const fft = new Fft(SIZE);
const re = new Float64Array(SIZE);
const im = new Float64Array(SIZE);
const levels = new Float64Array(SIZE / 2 + 1);

export class Spectra {
  #edges;
  #columns = new Uint8Array(512 * ROWS);
  #waiting = new Int16Array(SIZE);
  #filled = SIZE / 2; // half a window of nothing: column c is centred at sample c * HOP

  /** Columns so far. */
  count = 0;

  constructor(rate) {
    this.columnsPerSecond = rate / HOP;
    const top = mel(rate / 2);
    this.#edges = Float64Array.from({ length: ROWS + 1 }, (_, row) => {
      return (hertz((top * row) / ROWS) / rate) * SIZE;
    });
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
      this.#analyse();
      this.#waiting.copyWithin(0, HOP);
      this.#filled = SIZE - HOP;
    }
  }

  #analyse() {
    for (let i = 0; i < SIZE; ++i) re[i] = this.#waiting[i] * window[i];
    im.fill(0);
    fft.run(re, im);
    const scale = (32768 * SIZE) / 4; // a full-scale sine through this window
    for (let bin = 0; bin < levels.length; ++bin) {
      levels[bin] = 10 * Math.log10((re[bin] ** 2 + im[bin] ** 2) / scale ** 2 + 1e-13);
    }
    this.#store();
  }

  #store() {
    if ((this.count + 1) * ROWS > this.#columns.length) {
      const larger = new Uint8Array(2 * this.#columns.length);
      larger.set(this.#columns);
      this.#columns = larger;
    }
    const column = this.column(this.count);
    for (let row = 0; row < ROWS; ++row) {
      const db = this.#levelBetween(this.#edges[row], this.#edges[row + 1]);
      column[row] = (255 * (db - LOWEST_DB)) / (HIGHEST_DB - LOWEST_DB) + 0.5;
    }
    this.count += 1;
  }

  /** Between bins where the axis is finer than they are, else the loudest of those covered. */
  #levelBetween(low, high) {
    const at = Math.floor(low);
    if (high - low < 1) {
      const next = Math.min(at + 1, levels.length - 1);
      return this.#clip(levels[at] + (levels[next] - levels[at]) * (low - at));
    }
    let loudest = -Infinity;
    for (let bin = Math.ceil(low); bin <= high; ++bin) loudest = Math.max(loudest, levels[bin]);
    return this.#clip(loudest);
  }

  #clip(db) {
    return Math.min(HIGHEST_DB, Math.max(LOWEST_DB, db));
  }
}

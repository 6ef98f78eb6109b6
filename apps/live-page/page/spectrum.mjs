// How a spectrum looks: transform, frequency axis, level scale and palette of every picture of sound that
// this project draws. Imports nothing and touches no document: other pages embed the text of this file.

/** Samples that one column is made of. */
export const SIZE = 2048;
/** Rows of a column, spaced evenly on the mel axis. */
export const ROWS = 192;

const LOWEST_DB = -102; // byte 0; re a full-scale sine
const HIGHEST_DB = -14; // byte 255

const mel = (hertz) => 2595 * Math.log10(1 + hertz / 700);
const hertz = (melValue) => 700 * (10 ** (melValue / 2595) - 1);

/** Place of a frequency on the axis, 0 at the bottom to 1 at half the sampling rate. */
export const axisPlace = (frequency, rate) => mel(frequency) / mel(rate / 2);

// Dark to bright with evenly rising lightness, so that it also reads in grey.
const STOPS = [
  [10, 12, 32],
  [42, 24, 92],
  [104, 32, 130],
  [176, 50, 122],
  [232, 92, 86],
  [252, 160, 78],
  [254, 220, 128],
  [255, 252, 226],
];

/** Pixel of each byte of a column, in the order of bytes of a canvas. */
export const COLOURS = Uint32Array.from({ length: 256 }, (_, i) => {
  const place = (i / 255) * (STOPS.length - 1);
  const index = Math.min(Math.floor(place), STOPS.length - 2);
  const [r, g, b] = STOPS[index].map((value, channel) => {
    return Math.round(value + (STOPS[index + 1][channel] - value) * (place - index));
  });
  return (255 << 24) | (b << 16) | (g << 8) | r;
});

const hann = Float64Array.from({ length: SIZE }, (_, i) => {
  return 0.5 - 0.5 * Math.cos((2 * Math.PI * i) / SIZE);
});
const cosines = Float64Array.from({ length: SIZE / 2 }, (_, i) =>
  Math.cos((2 * Math.PI * i) / SIZE),
);
const sines = Float64Array.from({ length: SIZE / 2 }, (_, i) => Math.sin((2 * Math.PI * i) / SIZE));
const reversed = Uint32Array.from({ length: SIZE }, (_, i) => {
  let mirrored = 0;
  for (let bit = 1; bit < SIZE; bit *= 2) mirrored = 2 * mirrored + (i & bit ? 1 : 0);
  return mirrored;
});

/** In-place radix-2 transform of SIZE points. */
function transform(re, im) {
  for (let i = 0; i < SIZE; ++i) {
    const j = reversed[i];
    if (j <= i) continue;
    [re[i], re[j]] = [re[j], re[i]];
    [im[i], im[j]] = [im[j], im[i]];
  }
  for (let half = 1; half < SIZE; half *= 2) {
    const step = SIZE / (2 * half);
    for (let start = 0; start < SIZE; start += 2 * half) {
      for (let k = 0; k < half; ++k) {
        const a = start + k;
        const b = a + half;
        const c = cosines[k * step];
        const s = -sines[k * step];
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

/** Turns stretches of a sound of one sampling rate into columns of bytes. */
export class Analyser {
  #edges;
  #re = new Float64Array(SIZE);
  #im = new Float64Array(SIZE);
  #levels = new Float64Array(SIZE / 2 + 1);

  constructor(rate) {
    const top = mel(rate / 2);
    this.#edges = Float64Array.from({ length: ROWS + 1 }, (_, row) => {
      return (hertz((top * row) / ROWS) / rate) * SIZE;
    });
  }

  /** SIZE 16-bit samples into ROWS bytes, low frequencies first. */
  analyse(samples, column) {
    const [re, im, levels] = [this.#re, this.#im, this.#levels];
    for (let i = 0; i < SIZE; ++i) re[i] = samples[i] * hann[i];
    im.fill(0);
    transform(re, im);
    const scale = (32768 * SIZE) / 4; // a full-scale sine through this window
    for (let bin = 0; bin < levels.length; ++bin) {
      levels[bin] = 10 * Math.log10((re[bin] ** 2 + im[bin] ** 2) / scale ** 2 + 1e-13);
    }
    for (let row = 0; row < ROWS; ++row) {
      const db = this.#levelBetween(this.#edges[row], this.#edges[row + 1]);
      column[row] = (255 * (db - LOWEST_DB)) / (HIGHEST_DB - LOWEST_DB) + 0.5;
    }
  }

  /** Between bins where the axis is finer than they are, else the loudest of those covered. */
  #levelBetween(low, high) {
    const levels = this.#levels;
    const at = Math.floor(low);
    let db = -Infinity;
    if (high - low < 1) {
      const next = Math.min(at + 1, levels.length - 1);
      db = levels[at] + (levels[next] - levels[at]) * (low - at);
    } else {
      for (let bin = Math.ceil(low); bin <= high; ++bin) db = Math.max(db, levels[bin]);
    }
    return Math.min(HIGHEST_DB, Math.max(LOWEST_DB, db));
  }
}

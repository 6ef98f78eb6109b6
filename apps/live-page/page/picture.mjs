// Draws spectra on a canvas: a stretch of time across its width, low frequencies at the bottom.
import { COLOURS, ROWS } from './spectrum.mjs';

const NOTHING = COLOURS[0];

/** Gives a canvas as many pixels as it covers on the screen. */
export function fitToScreen(canvas) {
  const scale = Math.min(globalThis.devicePixelRatio || 1, 2);
  const width = Math.max(1, Math.round(canvas.clientWidth * scale));
  const height = Math.max(1, Math.round(canvas.clientHeight * scale));
  if (canvas.width !== width) canvas.width = width;
  if (canvas.height !== height) canvas.height = height;
  return scale;
}

export class Picture {
  #canvas;
  #sheet = new OffscreenCanvas(1, ROWS);
  #loudest = new Uint8Array(ROWS);

  constructor(canvas) {
    this.#canvas = canvas;
  }

  /** @param {{ from: number, to: number }} span seconds at the left and right edge */
  draw(spectra, { from, to }) {
    fitToScreen(this.#canvas);
    const { width, height } = this.#canvas;
    const first = from * spectra.columnsPerSecond;
    const columns = (to - from) * spectra.columnsPerSecond;
    const sheetWidth = Math.max(1, Math.min(width, Math.ceil(columns)));
    this.#sheet.width = sheetWidth;
    const pixels = new ImageData(sheetWidth, ROWS);
    this.#paint(new Uint32Array(pixels.data.buffer), sheetWidth, spectra, first, columns);
    this.#sheet.getContext('2d').putImageData(pixels, 0, 0);
    const context = this.#canvas.getContext('2d', { alpha: false });
    context.drawImage(this.#sheet, 0, 0, width, height);
  }

  #paint(pixels, width, spectra, first, columns) {
    for (let x = 0; x < width; ++x) {
      const begin = Math.round(first + (x * columns) / width);
      const end = Math.max(begin + 1, Math.round(first + ((x + 1) * columns) / width));
      const column = this.#loudestOf(spectra, begin, end);
      for (let row = 0; row < ROWS; ++row) {
        pixels[(ROWS - 1 - row) * width + x] = column === null ? NOTHING : COLOURS[column[row]];
      }
    }
  }

  #loudestOf(spectra, begin, end) {
    const [low, high] = [Math.max(begin, 0), Math.min(end, spectra.count)];
    if (low >= high) return null;
    if (high - low === 1) return spectra.column(low);
    this.#loudest.set(spectra.column(low));
    for (let index = low + 1; index < high; ++index) {
      const column = spectra.column(index);
      for (let row = 0; row < ROWS; ++row) {
        if (column[row] > this.#loudest[row]) this.#loudest[row] = column[row];
      }
    }
    return this.#loudest;
  }
}

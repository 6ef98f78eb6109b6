// The history under the pictures: voice score as a filled curve, noise level as a line, on the same
// stretch of time. Colours come from the style sheet, so that both themes have their own.
import { fitToScreen } from './picture.mjs';
import { FRAME_MS } from './protocol.mjs';

/** Range of the noise level's axis and meter, dB re full scale. */
export const NOISE_DB = { lowest: -80, highest: -10 };

/** Place of a noise level in its range, 0 to 1. */
export function noisePlace(db) {
  const { lowest, highest } = NOISE_DB;
  return Math.min(1, Math.max(0, (db - lowest) / (highest - lowest)));
}

const FRAMES_PER_SECOND = 1000 / FRAME_MS;

export class Strip {
  #canvas;
  #style;

  constructor(canvas) {
    this.#canvas = canvas;
    this.#style = getComputedStyle(canvas);
  }

  draw({ voice, noise }, { from, to }) {
    const scale = fitToScreen(this.#canvas);
    const { width, height } = this.#canvas;
    const context = this.#canvas.getContext('2d');
    context.clearRect(0, 0, width, height);
    const colour = (name) => this.#style.getPropertyValue(name);
    const inset = 3 * scale;
    const plot = { from, to, width, top: inset, height: height - 2 * inset };

    context.strokeStyle = colour('--grid');
    context.lineWidth = scale;
    context.setLineDash([4 * scale, 4 * scale]);
    context.beginPath();
    context.moveTo(0, height / 2);
    context.lineTo(width, height / 2);
    context.stroke();
    context.setLineDash([]);

    const score = this.#curve(voice.values, plot, (value) => value, Math.max);
    if (score.length === 0) return;
    context.beginPath();
    context.moveTo(score[0][0], height);
    for (const [x, y] of score) context.lineTo(x, y);
    context.lineTo(score.at(-1)[0], height);
    context.fillStyle = colour('--voice-fill');
    context.fill();
    this.#line(context, score, colour('--voice'), 1.5 * scale);
    const level = this.#curve(noise.values, plot, noisePlace, Math.max);
    this.#line(context, level, colour('--noise'), 2 * scale);
  }

  #line(context, points, colour, width) {
    context.strokeStyle = colour;
    context.lineWidth = width;
    context.lineJoin = 'round';
    context.beginPath();
    for (const [x, y] of points) context.lineTo(x, y);
    context.stroke();
  }

  /** One point per pixel at most. */
  #curve(values, { from, to, width, top, height }, place, pick) {
    const points = [];
    const first = Math.max(0, Math.floor(from * FRAMES_PER_SECOND));
    const last = Math.min(values.length, Math.ceil(to * FRAMES_PER_SECOND));
    const step = Math.max(1, Math.floor(((to - from) * FRAMES_PER_SECOND) / width));
    for (let k = first; k < last; k += step) {
      let value = values[k];
      for (let j = k + 1; j < Math.min(k + step, last); ++j) value = pick(value, values[j]);
      const x = ((k / FRAMES_PER_SECOND - from) / (to - from)) * width;
      points.push([x, top + height * (1 - place(value))]);
    }
    return points;
  }
}

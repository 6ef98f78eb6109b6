// Everything that is drawn: pictures, history, meters, needle, figures. While a recording runs the last
// seconds scroll by; otherwise the whole take is shown.
import { Picture } from './picture.mjs';
import { FRAME_MS } from './protocol.mjs';
import { axisPlace } from './spectrum.mjs';
import { Strip } from './strip.mjs';

const LIVE_SECONDS = 10;
const PITCHES = [250, 1000, 4000, 12000];
const TICK_STEPS = [0.5, 1, 2, 5, 10, 20, 30, 60, 120];
const TICK_PIXELS = 60; // room for one label
const SHORTEST_INTERVAL_MS = 30; // half of a usual screen's rate is smooth enough

const element = (id) => document.getElementById(id);
const canvases = ['before', 'after', 'strip'].map(element);

/** Minutes and seconds, with as many decimals. */
export function clock(seconds, decimals = 0) {
  const minutes = Math.floor(Number(seconds.toFixed(decimals)) / 60);
  const rest = (seconds - 60 * minutes).toFixed(decimals);
  return `${minutes}:${rest.padStart(decimals === 0 ? 2 : 3 + decimals, '0')}`;
}

function addTo(parent, className, text = '') {
  const child = document.createElement('span');
  child.className = className;
  child.textContent = text;
  parent.append(child);
  return child;
}

function setMeter(id, value, text) {
  const meter = element(id);
  meter.value = value;
  const place = (meter.value - meter.min) / (meter.max - meter.min);
  meter.style.setProperty('--fill', `${100 * place}%`);
  meter.setAttribute('aria-valuetext', text);
  element(`${id}-text`).value = text;
}

export class View {
  #before = new Picture(canvases[0]);
  #after = new Picture(canvases[1]);
  #strip = new Strip(canvases[2]);
  #needles = canvases.map((canvas) => addTo(canvas.parentElement, 'needle'));
  #take = null;
  #isLive = false;
  #isDirty = true;
  #drawnAt = -Infinity;
  #drawnPosition = null;
  #ticks = '';
  #pitchRate = 0;

  /**
   * @param {{ position: () => number | null, onSeek: (seconds: number) => void }} player `position`: where
   *   the needle stands, null for no needle
   */
  constructor({ position, onSeek }) {
    this.position = position;
    for (const canvas of canvases) {
      canvas.addEventListener('click', ({ offsetX }) => {
        const { from, to } = this.#span();
        onSeek(from + ((to - from) * offsetX) / canvas.clientWidth);
      });
    }
    new ResizeObserver(() => this.refresh()).observe(canvases[0]);
    matchMedia('(prefers-color-scheme: dark)').addEventListener('change', () => this.refresh());
    this.#loop();
  }

  /** @param {import('./take.mjs').Take} take */
  show(take, { isLive }) {
    this.#take = take;
    this.#isLive = isLive;
    this.refresh();
  }

  /** Something has changed: draw with the next screen refresh. */
  refresh() {
    this.#isDirty = true;
  }

  #loop() {
    requestAnimationFrame(() => this.#loop());
    const now = performance.now();
    const position = this.#isLive ? null : this.position();
    const isMoving = this.#isDirty || position !== this.#drawnPosition;
    if (this.#take === null || !isMoving || now - this.#drawnAt < SHORTEST_INTERVAL_MS) return;
    if (this.#isDirty) this.#draw();
    this.#isDirty = false;
    this.#drawnAt = now;
    this.#drawnPosition = position;
    this.#drawNeedle(position);
    this.#drawMeters(position ?? Infinity);
  }

  #span() {
    const seconds = this.#take?.seconds ?? 0;
    if (!this.#isLive) return { from: 0, to: Math.max(seconds, 0.5) };
    return { from: Math.max(0, seconds - LIVE_SECONDS), to: Math.max(seconds, LIVE_SECONDS) };
  }

  #draw() {
    const span = this.#span();
    this.#before.draw(this.#take.before.spectra, span);
    this.#after.draw(this.#take.after.spectra, span);
    this.#strip.draw(this.#take, span);
    this.#drawTimes(span);
    this.#drawPitches();
    element('length').textContent = `${this.#take.seconds.toFixed(1)} s`;
    element('rate').textContent = `${this.#take.rate / 1000} kHz`;
  }

  #drawTimes({ from, to }) {
    const most = canvases[0].clientWidth / TICK_PIXELS;
    const step = TICK_STEPS.find((seconds) => (to - from) / seconds <= most) ?? 120;
    const ticks = [];
    for (let at = Math.ceil(from / step) * step; at <= to; at += step) {
      const place = (at - from) / (to - from);
      if (place > 0.02 && place < 0.98) ticks.push([place, at]);
    }
    const key = JSON.stringify(ticks);
    if (key === this.#ticks) return;
    this.#ticks = key;
    const times = element('times');
    times.replaceChildren();
    for (const [place, at] of ticks) {
      const label = addTo(times, '', clock(at, step < 1 ? 1 : 0));
      label.style.left = `${100 * place}%`;
    }
  }

  #drawPitches() {
    const { rate } = this.#take;
    if (rate === this.#pitchRate) return;
    this.#pitchRate = rate;
    for (const label of document.querySelectorAll('.pitch')) label.remove();
    for (const canvas of canvases.slice(0, 2)) {
      for (const pitch of PITCHES.filter((hertz) => hertz < rate / 2)) {
        const text = pitch < 1000 ? `${pitch} Hz` : `${pitch / 1000} kHz`;
        const label = addTo(canvas.parentElement, 'pitch', text);
        label.style.bottom = `${100 * axisPlace(pitch, rate)}%`;
      }
    }
  }

  #drawNeedle(position) {
    const { from, to } = this.#span();
    for (const needle of this.#needles) {
      needle.hidden = position === null;
      if (position !== null) needle.style.left = `${(100 * (position - from)) / (to - from)}%`;
    }
  }

  #drawMeters(position) {
    const { voice, noise } = this.#take;
    if (voice.length === 0) return;
    const frame = Math.min(voice.length - 1, Math.floor((position * 1000) / FRAME_MS));
    const score = voice.values[frame];
    setMeter('voice', score, score.toFixed(2));
    if (noise.length === 0) return;
    const level = noise.values[Math.min(frame, noise.length - 1)];
    setMeter('noise', level, `${level.toFixed(0).replace('-', '−')} dB`);
  }
}

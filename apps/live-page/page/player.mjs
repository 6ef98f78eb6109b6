// Plays original and cleaned sound in step and fades between them: what is heard can change at any moment
// without a jump in time. Imports nothing and touches no document: the command line's report embeds this file.

const FADE_SECONDS = 0.015;

function audioBuffer(context, samples, rate) {
  const buffer = context.createBuffer(1, Math.max(1, samples.length), rate);
  const channel = buffer.getChannelData(0);
  // A plain loop: one callback a sample holds up the page for seconds.
  for (let i = 0; i < samples.length; ++i) channel[i] = samples[i] / 32768;
  return buffer;
}

/** Events: `change` (playing or not, which of the two), `end`. */
export class Player extends EventTarget {
  #context;
  #buffers = { before: null, after: null };
  #gains = {};
  #sources = [];
  #heard = 'after';
  #position = 0; // seconds; where it stands still
  #startedAt = 0; // the context's time at which position 0 would have been heard

  constructor(context) {
    super();
    this.#context = context;
    for (const side of ['before', 'after']) {
      this.#gains[side] = context.createGain();
      this.#gains[side].gain.value = side === this.#heard ? 1 : 0;
      this.#gains[side].connect(context.destination);
    }
  }

  get isPlaying() {
    return this.#sources.length > 0;
  }

  get heard() {
    return this.#heard;
  }

  get duration() {
    return this.#buffers.before?.duration ?? 0;
  }

  get position() {
    if (!this.isPlaying) return this.#position;
    const place = this.#context.currentTime - this.#startedAt;
    return Math.min(Math.max(place, 0), this.duration);
  }

  /** Another sound, from its beginning. */
  load({ before, after, rate }) {
    this.pause();
    this.#buffers.before = audioBuffer(this.#context, before, rate);
    this.#buffers.after = audioBuffer(this.#context, after, rate);
    this.#position = 0;
  }

  /** Another model's result; goes on where it is. */
  replaceCleaned(after, rate) {
    this.#buffers.after = audioBuffer(this.#context, after, rate);
    this.seek(this.position);
  }

  clear() {
    this.pause();
    this.#buffers = { before: null, after: null };
    this.#position = 0;
  }

  async play() {
    if (this.isPlaying || this.duration === 0) return;
    await this.#context.resume();
    if (this.isPlaying) return;
    this.#begin(this.#position >= this.duration ? 0 : this.#position);
  }

  pause() {
    if (!this.isPlaying) return;
    this.#position = this.position;
    this.#silence();
    this.#changed();
  }

  seek(seconds) {
    const wanted = Math.min(Math.max(seconds, 0), this.duration);
    const wasPlaying = this.isPlaying;
    this.#silence();
    this.#position = wanted;
    if (wasPlaying && wanted < this.duration) this.#begin(wanted);
    else this.#changed();
  }

  /** @param {'before' | 'after'} side */
  listenTo(side) {
    this.#heard = side;
    const now = this.#context.currentTime;
    for (const [name, { gain }] of Object.entries(this.#gains)) {
      gain.cancelScheduledValues(now);
      gain.setTargetAtTime(name === side ? 1 : 0, now, FADE_SECONDS / 3);
    }
    this.#changed();
  }

  #begin(position) {
    const at = this.#context.currentTime + 0.02;
    this.#startedAt = at - position;
    this.#sources = ['before', 'after'].map((side) => {
      const source = new AudioBufferSourceNode(this.#context, { buffer: this.#buffers[side] });
      source.connect(this.#gains[side]);
      source.start(at, position);
      return source;
    });
    this.#sources[0].onended = () => {
      this.#silence();
      this.#position = this.duration;
      this.#changed();
    };
    this.#changed();
  }

  #silence() {
    for (const source of this.#sources) {
      source.onended = null;
      source.stop();
      source.disconnect();
    }
    this.#sources = [];
  }

  #changed() {
    this.dispatchEvent(new Event('change'));
  }
}

// The seam between the page and whatever cleans its sound: a server behind a WebSocket (server-link.mjs),
// or anything else that speaks the messages of protocol.mjs. This half tells apart what belongs to the
// current stream, and holds back a file's samples when the cleaning is behind.
import { decodeResult, MAX_MESSAGE_BYTES } from './protocol.mjs';

const MAX_AHEAD_SECONDS = 8;

/**
 * Events, all with a `detail`: `hello` (models, sampleRates, maxSeconds, example), `started` (latency),
 * `progress` (share of what is loaded before the hello), `model` (name), `result` (samples, voice, noise), `done`, `lost` (a sentence for people).
 *
 * A kind of link implements `connect()`, `isOpen` and `post(message)`, and calls `receive` and `lose`.
 */
export class Link extends EventTarget {
  #stream = 0;
  #rate = 0;
  #ahead = 0;
  #wake = () => {};

  /** Resolves when the other side has said hello; rejects with a sentence for people. */
  async connect() {
    throw new Error('This link has no other side.');
  }

  /** Whether the other side can be spoken to. */
  get isOpen() {
    return false;
  }

  /** @param {string | Int16Array} _message JSON or samples, for the other side */
  post(_message) {}

  /** @param {string | ArrayBuffer} message JSON or an encoded result, from the other side */
  receive(message) {
    const detail = typeof message === 'string' ? JSON.parse(message) : decodeResult(message);
    const type = detail.type ?? 'result';
    if ('stream' in detail && detail.stream !== this.#stream) return;
    if (type === 'result') {
      this.#ahead -= detail.samples.length;
      this.#wake();
    }
    this.dispatchEvent(new CustomEvent(type, { detail }));
  }

  /** The other side is gone. */
  lose(sentence) {
    this.#wake();
    this.dispatchEvent(new CustomEvent('lost', { detail: sentence }));
  }

  /** A new stream; answers to older ones are dropped from now on. */
  start({ sampleRate, model }) {
    this.#stream += 1;
    this.#rate = sampleRate;
    this.#ahead = 0;
    this.#say({ type: 'start', stream: this.#stream, sampleRate, model });
    this.#wake();
  }

  send(samples) {
    this.#ahead += samples.length;
    if (this.isOpen) this.post(samples);
  }

  /** Sends a whole sound; returns early when another stream has begun or the other side is lost. */
  async sendAll(samples) {
    const stream = this.#stream;
    const isCurrent = () => this.isOpen && stream === this.#stream;
    const chunk = Math.min(this.#rate, MAX_MESSAGE_BYTES / 2);
    for (let at = 0; at < samples.length; at += chunk) {
      while (this.#ahead > MAX_AHEAD_SECONDS * this.#rate && isCurrent()) {
        await new Promise((resolve) => {
          this.#wake = resolve;
        });
      }
      if (!isCurrent()) return;
      this.send(samples.subarray(at, at + chunk));
    }
    this.stop();
  }

  chooseModel(name) {
    this.#say({ type: 'model', name });
  }

  stop() {
    this.#say({ type: 'stop' });
  }

  #say(message) {
    if (this.isOpen) this.post(JSON.stringify(message));
  }
}

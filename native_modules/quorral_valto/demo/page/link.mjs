// The page's end of the connection. Opens on demand, tells apart what belongs to the current stream, and
// holds back a file's samples when the server is behind.
import { decodeResult, MAX_MESSAGE_BYTES } from './protocol.mjs';

const MAX_AHEAD_SECONDS = 8;

/**
 * Events, all with a `detail`: `hello` (models, sampleRates, maxSeconds, hasExample), `started` (latency),
 * `model` (name), `result` (samples, voice, noise), `done`, `lost` (a sentence for people).
 */
export class Link extends EventTarget {
  #socket = null;
  #ready = null;
  #stream = 0;
  #rate = 0;
  #ahead = 0;
  #wake = () => {};

  /** Resolves when the server has said hello; rejects with a sentence for people. */
  connect() {
    if (this.#ready !== null) return this.#ready;
    const socket = new WebSocket(new URL('/audio', location.href.replace(/^http/, 'ws')));
    socket.binaryType = 'arraybuffer';
    this.#socket = socket;
    this.#ready = new Promise((resolve, reject) => {
      let complaint = null;
      socket.addEventListener('message', ({ data }) => {
        if (typeof data !== 'string') return this.#result(data);
        const message = JSON.parse(data);
        if (message.type === 'error') complaint = `${message.message} (${message.code})`;
        if (message.type === 'hello') resolve(message);
        this.#tell(message);
      });
      socket.addEventListener('close', ({ reason }) => {
        this.#ready = null;
        const sentence = complaint
          ? `The engine reports: ${complaint}`
          : reason
            ? `The server closed the connection: ${reason}.`
            : 'No connection to the server. Is "npm run demo" still running?';
        reject(new Error(sentence));
        this.#wake();
        this.dispatchEvent(new CustomEvent('lost', { detail: sentence }));
      });
    });
    return this.#ready;
  }

  /** A new stream; answers to older ones are dropped from now on. */
  start({ sampleRate, model }) {
    this.#stream += 1;
    this.#rate = sampleRate;
    this.#ahead = 0;
    this.#say({ type: 'start', stream: this.#stream, sampleRate, model });
    this.#wake();
    return this.#stream;
  }

  send(samples) {
    this.#ahead += samples.length;
    if (this.#isOpen) this.#socket.send(samples);
  }

  /** Sends a whole sound; returns early when another stream has begun or the connection is lost. */
  async sendAll(samples) {
    const stream = this.#stream;
    const chunk = Math.min(this.#rate, MAX_MESSAGE_BYTES / 2);
    for (let at = 0; at < samples.length; at += chunk) {
      while (this.#ahead > MAX_AHEAD_SECONDS * this.#rate && this.#isCurrent(stream)) {
        await new Promise((resolve) => {
          this.#wake = resolve;
        });
      }
      if (!this.#isCurrent(stream)) return;
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

  get #isOpen() {
    return this.#socket?.readyState === WebSocket.OPEN;
  }

  #isCurrent(stream) {
    return this.#isOpen && stream === this.#stream;
  }

  #say(message) {
    if (this.#isOpen) this.#socket.send(JSON.stringify(message));
  }

  #tell(message) {
    if ('stream' in message && message.stream !== this.#stream) return;
    this.dispatchEvent(new CustomEvent(message.type, { detail: message }));
  }

  #result(bytes) {
    const result = decodeResult(bytes);
    if (result.stream !== this.#stream) return;
    this.#ahead -= result.samples.length;
    this.#wake();
    this.dispatchEvent(new CustomEvent('result', { detail: result }));
  }
}

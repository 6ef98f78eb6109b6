// A link to an engine in a worker of this page. Starts on demand.
import { Link } from './link.mjs';

export class EngineLink extends Link {
  #address;
  #worker = null;
  #ready = null;

  /** @param {URL} address of engine-worker.mjs */
  constructor(address) {
    super();
    this.#address = address;
  }

  connect() {
    this.#ready ??= new Promise((resolve, reject) => {
      const worker = new Worker(this.#address, { type: 'module' });
      const end = (sentence) => {
        worker.terminate();
        this.#worker = null;
        this.#ready = null;
        reject(new Error(sentence));
        this.lose(sentence);
      };
      this.#worker = worker;
      this.addEventListener('hello', ({ detail }) => resolve(detail), { once: true });
      worker.onmessage = ({ data }) => (data.failed ? end(data.failed) : this.receive(data));
      worker.onerror = ({ message }) => end(message || 'The engine cannot be loaded.');
    });
    return this.#ready;
  }

  get isOpen() {
    return this.#worker !== null;
  }

  post(message) {
    if (typeof message === 'string') return this.#worker.postMessage(JSON.parse(message));
    const samples = message.slice(); // alone: a part would travel with the whole
    this.#worker.postMessage({ type: 'samples', samples }, [samples.buffer]);
  }
}

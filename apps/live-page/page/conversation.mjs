// The engine's side of the protocol, for the worker thread that holds the engine: takes what the page
// says, answers with what protocol.mjs lays down. Runs in any kind of worker.
import { CleaningStream } from './cleaning-stream.mjs';
import { encodeResult } from './protocol.mjs';

export class Conversation {
  #engine;
  #models;
  #tell;
  #stream = null;
  #id = 0;

  /**
   * @param engine see cleaning-stream.mjs
   * @param {string[]} models names of all models
   * @param {(answer: object | ArrayBuffer) => void} tell an answer: a message, or an encoded result
   */
  constructor(engine, models, tell) {
    this.#engine = engine;
    this.#models = models;
    this.#tell = tell;
  }

  /** @param {{ type: string }} message of the page, or `{ type: 'samples', samples }` */
  take({ type, ...message }) {
    const id = this.#id;
    if (type === 'start') return this.#start(message);
    // What is on its way when a sound is stopped or refused belongs to nobody.
    if (this.#stream === null) return;
    if (type === 'samples') this.#answer(this.#stream.push(message.samples));
    if (type === 'model') {
      this.#stream.switchModel(message.name);
      this.#tell({ type, stream: id, name: message.name });
    }
    if (type === 'stop') {
      this.#answer(this.#stream.finish());
      this.#tell({ type: 'done', stream: id, samples: this.#stream.received });
      this.#end();
    }
  }

  #start({ stream, sampleRate, model }) {
    this.#end();
    this.#stream = new CleaningStream(this.#engine, { sampleRate, model, models: this.#models });
    this.#id = stream;
    this.#tell({ type: 'started', stream, latency: this.#stream.latency });
  }

  #answer(result) {
    this.#tell(encodeResult({ stream: this.#id, ...result }));
  }

  #end() {
    this.#stream?.close();
    this.#stream = null;
  }
}

// One WebSocket and its worker thread: checks what the page sends, bounds what is under way, ends both
// together. A message that breaks the rules closes the connection with a reason.
import { Worker } from 'node:worker_threads';

/** Longest sound of one stream, seconds. */
export const MAX_SECONDS = 600;

// Messages between "came from the page" and "its answer has left"; then the socket is not read.
const MAX_UNDER_WAY = 32;

const CLOSE = { goingAway: 1001, broken: 1008, tooBig: 1009, failed: 1011 };

class ProtocolError extends Error {
  constructor(message, closeCode = CLOSE.broken) {
    super(message);
    this.closeCode = closeCode;
  }
}

function requireThat(condition, message, closeCode) {
  if (!condition) throw new ProtocolError(message, closeCode);
}

function parse(text) {
  try {
    const message = JSON.parse(text);
    if (message !== null && typeof message === 'object') return message;
  } catch {
    // Said below.
  }
  throw new ProtocolError('a text message must be a JSON object');
}

export class Connection {
  #socket;
  #worker;
  #example;
  #hello = null;
  #underWay = 0;
  #samplesLeft = 0;
  #running = false;

  /** @param {string | null} example address of the recording that the page offers */
  constructor(socket, example) {
    this.#socket = socket;
    this.#example = example;
    this.#worker = new Worker(new URL('./session-worker.mjs', import.meta.url));
    this.#worker.on('message', (message) => this.#fromWorker(message));
    this.#worker.on('error', (error) => this.#fail('ERR_LIVE_WORKER', error.message));
    socket.on('message', (data, isBinary) => this.#fromPage(data, isBinary));
    socket.on('error', () => {}); // followed by 'close'
    socket.on('close', () => this.#worker.terminate());
  }

  close() {
    if (this.#socket.isPaused) this.#socket.resume(); // or the page's answer would never be read
    this.#socket.close(CLOSE.goingAway, 'the server ends');
  }

  #fromPage(data, isBinary) {
    if (this.#socket.readyState !== this.#socket.OPEN) return;
    try {
      requireThat(this.#hello !== null, 'nothing may be sent before "hello"');
      const message = isBinary ? this.#samples(data) : this.#command(parse(data.toString()));
      this.#toWorker(message);
    } catch (error) {
      if (!(error instanceof ProtocolError)) throw error;
      this.#socket.close(error.closeCode, error.message);
    }
  }

  #samples(data) {
    requireThat(this.#running, 'samples came before "start"');
    requireThat(data.length > 0 && data.length % 2 === 0, 'samples are 16-bit');
    this.#samplesLeft -= data.length / 2;
    const tooLong = `a recording may last ${MAX_SECONDS} s`;
    requireThat(this.#samplesLeft >= 0, tooLong, CLOSE.tooBig);
    const bytes = data.buffer.slice(data.byteOffset, data.byteOffset + data.length);
    return { type: 'samples', samples: new Int16Array(bytes) };
  }

  #command(message) {
    if (message.type === 'start') {
      const { stream, sampleRate, model } = message;
      requireThat(Number.isInteger(stream) && stream >= 0 && stream < 2 ** 32, 'bad stream');
      requireThat(this.#hello.sampleRates.includes(sampleRate), 'no such sampling rate');
      requireThat(this.#knows(model), 'no such model');
      this.#running = true;
      this.#samplesLeft = MAX_SECONDS * sampleRate;
      return { type: 'start', stream, sampleRate, model };
    }
    if (message.type === 'model') {
      requireThat(this.#knows(message.name), 'no such model');
      return { type: 'model', name: message.name };
    }
    requireThat(message.type === 'stop', 'no such message type');
    this.#running = false;
    return { type: 'stop' };
  }

  #knows(model) {
    return this.#hello.models.some(({ name }) => name === model);
  }

  #toWorker(message) {
    this.#underWay += 1;
    if (this.#underWay >= MAX_UNDER_WAY) this.#socket.pause();
    this.#worker.postMessage(message, message.samples ? [message.samples.buffer] : []);
  }

  #fromWorker(message) {
    if (message.kind === 'ready') {
      const { models, sampleRates } = message;
      this.#hello = { models, sampleRates, maxSeconds: MAX_SECONDS, example: this.#example };
      this.#send(JSON.stringify({ type: 'hello', ...this.#hello }));
    } else if (message.kind === 'bytes') {
      // Counted until it has left, so that a page that does not read is not read either.
      this.#underWay += 1;
      this.#send(message.bytes, () => this.#done());
    } else if (message.kind === 'text') {
      this.#send(JSON.stringify(message.text));
    } else if (message.kind === 'taken') {
      this.#done();
    } else {
      this.#fail(message.code, message.message);
    }
  }

  #done() {
    this.#underWay -= 1;
    if (this.#underWay < MAX_UNDER_WAY && this.#socket.isPaused) this.#socket.resume();
  }

  #send(data, sent = () => {}) {
    if (this.#socket.readyState === this.#socket.OPEN) this.#socket.send(data, sent);
  }

  #fail(code, message) {
    this.#send(JSON.stringify({ type: 'error', code, message }));
    if (this.#socket.isPaused) this.#socket.resume(); // to hear the other side's farewell
    this.#socket.close(CLOSE.failed, code);
  }
}

// A link to the server that gave this page away. Opens on demand.
import { Link } from './link.mjs';

export class ServerLink extends Link {
  #address;
  #socket = null;
  #ready = null;
  #complaint = null;

  constructor(address) {
    super();
    this.#address = address;
    this.addEventListener('error', ({ detail }) => {
      this.#complaint = `The engine reports: ${detail.message} (${detail.code})`;
    });
  }

  connect() {
    this.#ready ??= new Promise((resolve, reject) => {
      const socket = new WebSocket(this.#address);
      socket.binaryType = 'arraybuffer';
      this.#socket = socket;
      this.#complaint = null;
      this.addEventListener('hello', ({ detail }) => resolve(detail), { once: true });
      socket.addEventListener('message', ({ data }) => this.receive(data));
      socket.addEventListener('close', ({ reason }) => {
        this.#ready = null;
        const farewell = reason && `The server closed the connection: ${reason}.`;
        const silence = 'No connection to the server. Is it still running?';
        const sentence = this.#complaint || farewell || silence;
        reject(new Error(sentence));
        this.lose(sentence);
      });
    });
    return this.#ready;
  }

  get isOpen() {
    return this.#socket?.readyState === WebSocket.OPEN;
  }

  post(message) {
    this.#socket.send(message);
  }
}

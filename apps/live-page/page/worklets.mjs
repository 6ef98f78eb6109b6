// Runs on the browser's audio thread. `capture` posts the microphone's first channel as 16-bit frames of
// 20 ms; `monitor` plays samples that are posted to it, at once, and keeps its queue short.

const FRAME_SECONDS = 0.02;
const LONGEST_QUEUE_SECONDS = 0.25;
const USUAL_QUEUE_SECONDS = 0.06;

class Capture extends AudioWorkletProcessor {
  #frame = new Int16Array(Math.round(sampleRate * FRAME_SECONDS));
  #filled = 0;

  process([[channel]]) {
    if (channel === undefined) return true;
    for (const value of channel) {
      this.#frame[this.#filled++] = Math.round(Math.max(-1, Math.min(1, value)) * 32767);
      if (this.#filled < this.#frame.length) continue;
      const samples = this.#frame.slice();
      this.port.postMessage(samples, [samples.buffer]);
      this.#filled = 0;
    }
    return true;
  }
}

class Monitor extends AudioWorkletProcessor {
  #queue = [];
  #queued = 0;
  #position = 0;
  #isPlaying = false;

  constructor() {
    super();
    this.port.onmessage = ({ data }) => {
      this.#queue.push(data);
      this.#queued += data.length;
    };
  }

  #skip(count) {
    this.#position += count;
    this.#queued -= count;
    while (this.#queue.length > 0 && this.#position >= this.#queue[0].length) {
      this.#position -= this.#queue.shift().length;
    }
  }

  process(_inputs, [channels]) {
    const [first] = channels;
    const usual = USUAL_QUEUE_SECONDS * sampleRate;
    if (!this.#isPlaying) this.#isPlaying = this.#queued >= usual;
    if (this.#queued > LONGEST_QUEUE_SECONDS * sampleRate) this.#skip(this.#queued - usual);
    if (!this.#isPlaying) return true;
    if (this.#queued < first.length) {
      this.#isPlaying = false; // gather again rather than stutter
      return true;
    }
    for (let i = 0; i < first.length; ++i) {
      first[i] = this.#queue[0][this.#position] / 32768;
      this.#skip(1);
    }
    for (const channel of channels.slice(1)) channel.set(first);
    return true;
  }
}

registerProcessor('capture', Capture);
registerProcessor('monitor', Monitor);

// Render quanta in and out of a session's frames, at a constant delay, without an allocation.

function commonDivisor(a, b) {
  return b === 0 ? a : commonDivisor(b, a % b);
}

export class FrameQueue {
  #filled = 0; // of the frame that comes in
  #waiting; // cleaned samples, of which the first #count are ready
  #count;

  /** @param {number} quantum length of every block; the smallest delay for frames is a frame less what they share */
  constructor(canceller, quantum = 128) {
    const { frameSize } = canceller;
    this.canceller = canceller;
    this.#count = frameSize - commonDivisor(frameSize, quantum);
    this.#waiting = new Float32Array(2 * frameSize + quantum);
    this.latency = this.#count + canceller.latency;
  }

  /** @param {Float32Array | undefined} input nothing is silence */
  run(input, output) {
    const { canceller } = this;
    const { frameSize } = canceller;
    let frame = canceller.input.samples(true);
    for (let i = 0; i < output.length; ++i) {
      frame[this.#filled++] = input === undefined ? 0 : input[i];
      if (this.#filled < frameSize) continue;
      canceller.cleanInPlace(true);
      this.#waiting.set(canceller.output.samples(true), this.#count);
      this.#count += frameSize;
      this.#filled = 0;
      frame = canceller.input.samples(true);
    }
    for (let i = 0; i < output.length; ++i) output[i] = this.#waiting[i];
    this.#waiting.copyWithin(0, output.length, this.#count);
    this.#count -= output.length;
  }
}

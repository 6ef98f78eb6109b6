// Runs on the browser's audio thread. One engine for all nodes of a context; a node has a session per channel.
import { Engine } from './engine.mjs';
import { FrameQueue } from './frame-queue.mjs';

const NO_LIMIT = 100; // decibels; AudioParams are finite
const LATE_MS = 50; // behind the clock on the wall: a dropout that frame counts do not show

/** @type {Engine | null} */
let engine = null;

/** Counts the moments at which this thread came too late. */
class Punctuality {
  #next = -1;
  #lead = -Infinity;
  dropouts = 0;

  /** Rendering has paused; what comes next is no gap. */
  pause() {
    this.#next = -1;
  }

  check(quantum) {
    if (this.#next < 0) this.#lead = -Infinity;
    const isGap = this.#next >= 0 && currentFrame !== this.#next;
    this.#next = currentFrame + quantum;
    const lead = currentTime * 1000 - Date.now();
    this.#lead = Math.max(this.#lead, lead);
    const isLate = this.#lead - lead > LATE_MS;
    if (isLate) this.#lead = lead;
    if (isGap || isLate) this.dropouts += 1;
  }
}

class DenoiserProcessor extends AudioWorkletProcessor {
  static parameterDescriptors = [
    {
      name: 'attenuationLimit',
      ...{ defaultValue: NO_LIMIT, minValue: 0, maxValue: NO_LIMIT, automationRate: 'k-rate' },
    },
    { name: 'bypass', defaultValue: 0, minValue: 0, maxValue: 1, automationRate: 'k-rate' },
  ];

  #queues = [];
  #limit = NO_LIMIT;
  #bypass = false;
  #punctuality = null;
  #meters = new Float32Array(2);
  #report = { type: 'meters', voice: 0, noise: 0, dropouts: 0, memory: 0 };
  #framesPerReport = 0;
  #untilReport = 0;
  #silentFor = 0;
  #tail = 0;
  #isClosed = false;

  constructor() {
    super();
    this.port.onmessage = ({ data }) => {
      try {
        if (data.type === 'close') this.#close();
        else this.#open(data);
      } catch ({ code, message }) {
        this.port.postMessage({ type: 'failed', code, message });
      }
    };
  }

  #open({ module, models, session, channels, meterSeconds, isLive }) {
    engine ??= new Engine(module);
    for (const model of models) engine.addModel(model);
    for (let i = 0; i < channels; ++i) {
      const voice = i === 0 ? session.voice : null;
      const canceller = new engine.NoiseCanceller({ ...session, voice, sampleRate });
      this.#queues.push(new FrameQueue(canceller));
    }
    const [first] = this.#queues;
    this.#framesPerReport = Math.round(meterSeconds * sampleRate);
    this.#untilReport = first.latency; // until there is something to tell
    if (isLive) this.#punctuality = new Punctuality();
    this.#tail = 2 * first.latency;
    this.port.postMessage({ type: 'ready', latency: first.latency });
  }

  #close() {
    for (const queue of this.#queues) queue.canceller.close();
    this.#queues = [];
    this.#isClosed = true;
  }

  #apply({ attenuationLimit: [limit], bypass: [bypass] }) {
    if (limit !== this.#limit) {
      this.#limit = limit;
      for (const { canceller } of this.#queues) {
        canceller.setAttenuationLimit(limit < NO_LIMIT ? limit : Infinity);
      }
    }
    if (bypass >= 0.5 !== this.#bypass) {
      this.#bypass = !this.#bypass;
      for (const { canceller } of this.#queues) canceller.setBypass(this.#bypass);
    }
  }

  #tell(quantum) {
    this.#untilReport -= quantum;
    if (this.#framesPerReport === 0 || this.#untilReport > 0) return;
    this.#untilReport += this.#framesPerReport;
    this.#queues[0].canceller.readMeters(this.#meters);
    this.#report.voice = this.#meters[0];
    this.#report.noise = this.#meters[1];
    this.#report.dropouts = this.#punctuality?.dropouts ?? 0;
    this.#report.memory = engine.memory.buffer.byteLength;
    this.port.postMessage(this.#report);
  }

  process(inputs, outputs, parameters) {
    if (this.#queues.length === 0) return !this.#isClosed;
    const input = inputs[0];
    const output = outputs[0];
    const quantum = output[0].length;
    this.#silentFor = input.length > 0 ? 0 : this.#silentFor + quantum;
    if (this.#silentFor > this.#tail) {
      this.#punctuality?.pause();
      return true; // idle until something plays; after false, some browsers never call again
    }
    this.#punctuality?.check(quantum);
    this.#apply(parameters);
    for (let i = 0; i < this.#queues.length; ++i) this.#queues[i].run(input[i], output[i]);
    this.#tell(quantum);
    return true;
  }
}

registerProcessor('morva-denoiser', DenoiserProcessor);

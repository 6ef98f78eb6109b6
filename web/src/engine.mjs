// The engine in WebAssembly, for any thread of a browser or of Node.js. One Engine holds one copy of every model,
// shared by all its sessions. Uses nothing but WebAssembly: the thread of an AudioWorklet has little else.
import { MorvaError } from './errors.mjs';
import { hostFor } from './host.mjs';

/** Sampling rates in hertz that sessions take. */
export const SAMPLE_RATES = Object.freeze([
  8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000,
]);
/** Frame lengths in milliseconds that sessions take. */
export const FRAME_DURATIONS = Object.freeze([10, 20, 30, 40]);

/** A frame in the engine's memory. Views are made again when that memory has grown, which no frame makes it do. */
class Block {
  #engine;
  #length;
  #floats;
  #shorts;

  constructor(engine, length) {
    this.#engine = engine;
    this.#length = length;
    this.address = engine.allocate(4 * length);
    this.#look();
  }

  #look() {
    const { buffer } = this.#engine.memory;
    this.#floats = new Float32Array(buffer, this.address, this.#length);
    this.#shorts = new Int16Array(buffer, this.address, this.#length);
  }

  /** @param {boolean} ofFloats else 16-bit samples */
  samples(ofFloats) {
    if (this.#floats.buffer !== this.#engine.memory.buffer) this.#look();
    return ofFloats ? this.#floats : this.#shorts;
  }

  free() {
    this.#engine.functions.free(this.address);
  }
}

const isFloats = (samples) => samples instanceof Float32Array;

class Session {
  #engine;
  #kind;

  constructor(engine, kind, { sampleRate, frameMs = 10, model }, create) {
    const isKnown = SAMPLE_RATES.includes(sampleRate) && FRAME_DURATIONS.includes(frameMs);
    if (!isKnown) {
      throw new MorvaError(
        'ERR_MORVA_ARGUMENT',
        `The engine takes no frames of ${frameMs} ms at ${sampleRate} Hz; rates are ${SAMPLE_RATES.join(', ')}.`,
      );
    }
    if (!engine.models.includes(model)) {
      throw new MorvaError('ERR_MORVA_MODEL', `No such model: ${JSON.stringify(model)}`);
    }
    this.#engine = engine;
    this.#kind = kind;
    this.sampleRate = sampleRate;
    this.frameMs = frameMs;
    this.model = model;
    this.frameSize = Math.floor((sampleRate * frameMs) / 1000);
    this.handle = engine.withName(model, create);
    if (this.handle === 0) throw engine.error(`The model ${JSON.stringify(model)} cannot be used`);
    this.input = new Block(engine, this.frameSize);
    this.output = new Block(engine, this.frameSize);
  }

  get engine() {
    if (this.handle === 0) throw new MorvaError('ERR_MORVA_CLOSED', 'The session was closed.');
    return this.#engine;
  }

  /** Puts a frame where the engine reads it. */
  take(frame) {
    const { engine } = this;
    if (frame.length !== this.frameSize) {
      throw new MorvaError(
        'ERR_MORVA_FRAME_SIZE',
        `The frame has ${frame.length} samples instead of ${this.frameSize}.`,
      );
    }
    this.input.samples(isFloats(frame)).set(frame);
    return engine;
  }

  close() {
    if (this.handle === 0) return;
    this.#engine.functions[`Morva_${this.#kind}_CloseSession`](this.handle);
    this.input.free();
    this.output.free();
    this.handle = 0;
  }
}

export class NoiseCanceller extends Session {
  #meters;

  /** @param {{ voice?: string | null }} options `voice`: a voice model that listens beside it */
  constructor(engine, { attenuationLimit, bypass = false, voice = null, ...options }) {
    const { sampleRate: rate, frameMs = 10 } = options;
    const { functions } = engine;
    super(engine, 'NC', options, (name) =>
      functions.Morva_NC_CreateSession(rate, rate, frameMs, name),
    );
    this.#meters = new Block(engine, 2);
    this.latency = functions.MorvaExt_SessionLatencySamples(this.handle);
    if (voice !== null) {
      const enable = (name) => functions.MorvaExt_NC_EnableVoice(this.handle, name);
      if (engine.withName(voice, enable) !== 0) throw engine.error('No voice score');
    }
    if (attenuationLimit !== undefined) this.setAttenuationLimit(attenuationLimit);
    if (bypass) this.setBypass(true);
  }

  /** Decibels, or Infinity. */
  setAttenuationLimit(decibels) {
    const { MorvaExt_NC_SetAttenuationLimit: set } = this.engine.functions;
    if (set(this.handle, decibels) === 0) return;
    throw new MorvaError('ERR_MORVA_ARGUMENT', 'A limit is 0 or more decibels.');
  }

  setBypass(on) {
    this.engine.functions.MorvaExt_NC_SetBypass(this.handle, on ? 1 : 0);
  }

  /** Cleans a frame of Int16Array or Float32Array into `output`, which may be the same; returns it. */
  process(frame, output = frame) {
    this.take(frame);
    this.cleanInPlace(isFloats(frame));
    output.set(this.output.samples(isFloats(frame)));
    return output;
  }

  /** The same of what stands in `input` into `output`, without a copy. */
  cleanInPlace(ofFloats) {
    const { functions } = this.engine;
    const clean = ofFloats
      ? functions.Morva_NC_CleanAmbientNoiseFloat
      : functions.Morva_NC_CleanAmbientNoiseInt16;
    const { frameSize: n, handle, input, output } = this;
    if (clean(handle, input.address, n, output.address, n) === 0) return;
    throw this.engine.error('The frame was refused');
  }

  /** Writes [voice score, noise level in dB] of the last frame; the score is NaN without `voice`. */
  readMeters(into) {
    const { address } = this.#meters;
    this.engine.functions.MorvaExt_NC_FrameMeters(this.handle, address, address + 4);
    into.set(this.#meters.samples(true));
    return into;
  }

  close() {
    if (this.handle !== 0) this.#meters.free();
    super.close();
  }
}

export class VoiceActivityDetector extends Session {
  constructor(engine, options) {
    const { sampleRate, frameMs = 10 } = options;
    super(engine, 'VAD', { model: engine.firstOf('VAD'), ...options }, (name) =>
      engine.functions.Morva_VAD_CreateSession(sampleRate, frameMs, name),
    );
  }

  /** Voice score of a frame, 0 to 1. */
  process(frame) {
    const engine = this.take(frame);
    const { Morva_VAD_FrameFloat, Morva_VAD_FrameInt16 } = engine.functions;
    const judge = isFloats(frame) ? Morva_VAD_FrameFloat : Morva_VAD_FrameInt16;
    const score = judge(this.handle, this.input.address, this.frameSize);
    if (score < 0) throw engine.error('The frame was refused');
    return score;
  }
}

export class NoiseLevelMeter extends Session {
  constructor(engine, options) {
    const { sampleRate, frameMs = 10 } = options;
    super(engine, 'NoiseDB', { model: engine.firstOf('NoiseDB'), ...options }, (name) =>
      engine.functions.Morva_NoiseDB_CreateSession(sampleRate, frameMs, name),
    );
  }

  /** Noise level after a frame of floats, in decibels as the C interface says. */
  process(frame) {
    const engine = this.take(frame);
    const { handle, frameSize, input, output } = this;
    const { MorvaExt_NoiseDB_FrameFloat: measure } = engine.functions;
    if (measure(handle, input.address, frameSize, output.address) !== 0)
      throw engine.error('The frame was refused');
    return output.samples(true)[0];
  }
}

export class Engine {
  #kinds = new Map();

  /** The C interface, with malloc and free. */
  functions;

  /**
   * @param {WebAssembly.Module} module the compiled morva_sdk.wasm
   * @param {(text: string) => void} [onDiagnostic] takes what the engine prints
   */
  constructor(module, onDiagnostic = () => {}) {
    const host = hostFor(() => this.memory, onDiagnostic);
    this.functions = new WebAssembly.Instance(module, host).exports;
    this.functions._initialize();
    if (this.functions.Morva_SDK_GlobalInit(0, 1) !== 0) {
      throw this.error('The engine does not start');
    }
    this.NoiseCanceller = NoiseCanceller.bind(null, this);
    this.VoiceActivityDetector = VoiceActivityDetector.bind(null, this);
    this.NoiseLevelMeter = NoiseLevelMeter.bind(null, this);
  }

  /** @type {WebAssembly.Memory} */
  get memory() {
    return this.functions.memory;
  }

  /** Names of the models, in the order in which they came. */
  get models() {
    return [...this.#kinds.keys()];
  }

  /** The first model of a kind: NC, VAD or NoiseDB. */
  firstOf(kind) {
    return this.models.find((name) => this.#kinds.get(name) === kind);
  }

  /** @param {{ name: string, kind: string, bytes: Uint8Array }} model a weight file; twice is once */
  addModel({ name, kind, bytes }) {
    if (this.#kinds.has(name)) return;
    const address = this.#place(bytes);
    const status = this.withName(name, (text) =>
      this.functions.Morva_SDK_SetModel_Blob(address, bytes.length, text),
    );
    this.functions.free(address);
    if (status !== 0) {
      throw new MorvaError('ERR_MORVA_MODEL', `"${name}" is no weight file, or was there before.`);
    }
    this.#kinds.set(name, kind);
  }

  allocate(bytes) {
    const address = this.functions.malloc(bytes);
    if (address === 0) throw new MorvaError('ERR_MORVA_ENGINE', 'There is no memory left.');
    return address;
  }

  #place(bytes) {
    const address = this.allocate(bytes.length);
    new Uint8Array(this.memory.buffer).set(bytes, address);
    return address;
  }

  /** What `use` makes of a text in the engine's memory. */
  withName(text, use) {
    const address = this.#place(Uint8Array.from(`${text}\0`, (letter) => letter.charCodeAt(0)));
    const result = use(address);
    this.functions.free(address);
    return result;
  }

  /** An error with the engine's own reason. */
  error(what) {
    const bytes = new Uint8Array(this.memory.buffer);
    let reason = '';
    for (let at = this.functions.MorvaExt_LastError(); bytes[at] !== 0; ++at) {
      reason += String.fromCharCode(bytes[at]);
    }
    return new MorvaError('ERR_MORVA_ENGINE', `${what}: ${reason}`);
  }
}

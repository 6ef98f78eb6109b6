/** Sampling rates in hertz that the engine takes. */
export type SampleRate = 8000 | 12000 | 16000 | 24000 | 32000 | 44100 | 48000 | 88200 | 96000;
/** Frame lengths in milliseconds that sessions take. */
export type FrameDuration = 10 | 20 | 30 | 40;

export declare const SAMPLE_RATES: readonly SampleRate[];
export declare const FRAME_DURATIONS: readonly FrameDuration[];

/** What went wrong, for programs. */
export type MorvaErrorCode =
  /** No WebAssembly SIMD or exceptions, or no AudioWorklet. */
  | 'ERR_MORVA_UNSUPPORTED'
  /** The context's rate is not one of `SAMPLE_RATES`. */
  | 'ERR_MORVA_SAMPLE_RATE'
  /** A file of this package cannot be fetched. */
  | 'ERR_MORVA_FETCH'
  /** No such model. */
  | 'ERR_MORVA_MODEL'
  | 'ERR_MORVA_ARGUMENT'
  | 'ERR_MORVA_FRAME_SIZE'
  /** The session was closed. */
  | 'ERR_MORVA_CLOSED'
  /** The engine refuses; the message has its reason. */
  | 'ERR_MORVA_ENGINE';

export declare class MorvaError extends Error {
  readonly code: MorvaErrorCode;
}

/** Throws `ERR_MORVA_UNSUPPORTED` where the engine cannot run. */
export declare function requireSupport(): void;

export interface Model {
  readonly name: string;
  /** Noise cancellation, voice activity or noise level. */
  readonly kind: 'NC' | 'VAD' | 'NoiseDB';
  /** The rate that it runs at, in hertz. */
  readonly rate: number;
}

/** The shipped models. */
export declare const models: readonly Model[];

export interface LoadOptions {
  /** Where the files of the package's `dist` folder lie, if not beside this script. */
  baseUrl?: string | URL;
  /** Bytes of models; what the browser has kept arrives at once. */
  onProgress?: (state: { loaded: number; total: number }) => void;
}

// ---- Web Audio --------------------------------------------------------------------------------

export interface DenoiserOptions extends LoadOptions {
  /** A noise model; left out, the one for the context's rate. */
  model?: string;
  /** Whether the voice score is computed beside it, on the first channel; true when left out. */
  voice?: boolean;
  /** Channels, each cleaned by itself; 1 when left out: what comes in is mixed down. */
  channels?: number;
  /** First value of the parameter. */
  attenuationLimit?: number;
  /** First value of the parameter. */
  bypass?: boolean;
  /** Time between two `meters` events; 0 for none, 0.05 when left out. */
  meterSeconds?: number;
}

export interface Meters {
  /** Voice score of the last frame, 0 to 1; NaN without `voice`. */
  voice: number;
  /** Level of what was removed, in decibels re one squared unit of the 16-bit scale. */
  noise: number;
  /** How often the audio thread has come too late since the node was made. */
  dropouts: number;
  /** Bytes of the engine's memory, which all nodes of the context share. */
  memory: number;
}

export interface DenoiserEventMap {
  meters: CustomEvent<Meters>;
}

/** A node that cleans what flows through it. Nodes of one context share one engine and its models. */
export declare class Denoiser extends AudioWorkletNode {
  private constructor();
  /** @throws {MorvaError} */
  static create(context: BaseAudioContext, options?: DenoiserOptions): Promise<Denoiser>;
  /** Most decibels by which noise is lowered, 0 to 100; 100, the default, is no limit. */
  get attenuationLimit(): AudioParam;
  /** From 0.5 on the sound passes as it is, at the same latency. */
  get bypass(): AudioParam;
  /** Seconds from sound in to sound out. */
  get latency(): number;
  /** Frees what it holds; silence comes out from then on. A node that is not closed stays. */
  close(): void;
  addEventListener<K extends keyof DenoiserEventMap>(
    type: K,
    listener: (event: DenoiserEventMap[K]) => void,
    options?: boolean | AddEventListenerOptions,
  ): void;
  addEventListener(
    type: string,
    listener: EventListenerOrEventListenerObject,
    options?: boolean | AddEventListenerOptions,
  ): void;
}

// ---- frames -----------------------------------------------------------------------------------

export interface SessionOptions {
  sampleRate: SampleRate;
  /** 10 when left out. */
  frameMs?: FrameDuration;
}

declare class Session {
  protected constructor();
  readonly sampleRate: SampleRate;
  readonly frameMs: FrameDuration;
  readonly model: string;
  /** Samples per frame. */
  readonly frameSize: number;
  close(): void;
}

export declare class NoiseCanceller extends Session {
  /** Samples from sound in to sound out. */
  readonly latency: number;
  /** Decibels, or Infinity. */
  setAttenuationLimit(decibels: number): void;
  setBypass(on: boolean): void;
  /** Cleans a frame into `output`, in place when left out; returns it. */
  process<T extends Int16Array | Float32Array>(frame: T, output?: T): T;
  /** Writes [voice score, noise level] of the last frame; the score is NaN without `voice`. */
  readMeters(into: Float32Array): Float32Array;
}

export declare class VoiceActivityDetector extends Session {
  /** Voice score of a frame, 0 to 1. */
  process(frame: Int16Array | Float32Array): number;
}

export declare class NoiseLevelMeter extends Session {
  /** Noise level after a frame, in decibels re one squared unit of the 16-bit scale. */
  process(frame: Float32Array): number;
}

export interface NoiseCancellerOptions extends SessionOptions {
  model: string;
  /** A voice model that listens beside it. */
  voice?: string | null;
  attenuationLimit?: number;
  bypass?: boolean;
}

/** One engine on this thread; its sessions share its models. */
export interface Engine {
  readonly models: string[];
  readonly NoiseCanceller: new (options: NoiseCancellerOptions) => NoiseCanceller;
  readonly VoiceActivityDetector: new (
    options: SessionOptions & { model?: string },
  ) => VoiceActivityDetector;
  readonly NoiseLevelMeter: new (options: SessionOptions & { model?: string }) => NoiseLevelMeter;
}

/** Fetches module and models and starts an engine on this thread, for workers and whole files. */
export declare function loadEngine(
  options?: LoadOptions & {
    /** Names of models; all when left out. */
    models?: string[];
    /** Takes what the engine prints. */
    onDiagnostic?: (text: string) => void;
  },
): Promise<Engine>;

/// <reference lib="esnext.disposable" />
import type { Transform } from 'node:stream';

/** Sampling rates in hertz that sessions take. */
export type SampleRate = 8000 | 12000 | 16000 | 24000 | 32000 | 44100 | 48000 | 88200 | 96000;

/** Frame lengths in milliseconds that sessions take. */
export type FrameDuration = 10 | 20 | 30 | 40;

export declare const SAMPLE_RATES: readonly SampleRate[];
export declare const FRAME_DURATIONS: readonly FrameDuration[];

/** What went wrong, for programs. Codes never change their meaning. */
export type ValtoErrorCode =
  /** The native module cannot be loaded; the message lists the tried paths and a remedy. */
  | 'ERR_VALTO_LOAD'
  /** The processor lacks SSE 4.1 or AVX2. */
  | 'ERR_VALTO_CPU'
  /** The engine could not be created, or the processor lacks FMA or BMI2. */
  | 'ERR_VALTO_ENGINE'
  /** The install path holds a character that the engine cannot open files under. */
  | 'ERR_VALTO_PATH'
  /** A weight file is not beside the native module. */
  | 'ERR_VALTO_WEIGHT_MISSING'
  /** A weight file is there but cannot be read. */
  | 'ERR_VALTO_WEIGHT_INVALID'
  /** A session was opened before `initialize()`. */
  | 'ERR_VALTO_NOT_INITIALIZED'
  /** No registered model has that name. */
  | 'ERR_VALTO_MODEL'
  /** An argument has the wrong type. */
  | 'ERR_VALTO_ARGUMENT'
  /** The sampling rate is not one of `SAMPLE_RATES`. */
  | 'ERR_VALTO_SAMPLE_RATE'
  /** The frame length is not one of `FRAME_DURATIONS`. */
  | 'ERR_VALTO_FRAME_DURATION'
  /** A frame does not hold `frameSize` samples. */
  | 'ERR_VALTO_FRAME_SIZE'
  /** The engine refused to open the session, for example since its weight file is damaged. */
  | 'ERR_VALTO_SESSION'
  /** The engine failed on a frame. */
  | 'ERR_VALTO_PROCESS'
  /** The session was closed. */
  | 'ERR_VALTO_CLOSED';

/** The one error class of this package. */
export declare class ValtoError extends Error {
  readonly name: 'ValtoError';
  readonly code: ValtoErrorCode;
  /** The native layer's own code, where there is one. */
  readonly nativeCode?: number;
}

export interface InitializeOptions {
  /**
   * Gets what engine and module have to say, from whatever thread of the process: registered models,
   * parameters that are out of range, refused calls. `stream` is where it would be printed, `text`
   * may have several lines. Called on a later turn of the event loop, for which it does not keep the
   * process waiting, and before the process exits. Left out: as before, at first nobody. `null`:
   * nobody any more.
   */
  onDiagnostic?: ((text: string, stream: 'stdout' | 'stderr') => void) | null;
}

/**
 * Starts the engine and registers the shipped models. Succeeds when the engine is already running in
 * this process, whoever started it. Blocks for some milliseconds while the weights are read. From
 * then on nothing is printed in this process, by the raw functions and the native entry points
 * either: see `onDiagnostic`.
 * @throws {ValtoError}
 */
export declare function initialize(options?: InitializeOptions): void;

/** Names of the noise-cancellation models, in the order of their sampling rates. */
export declare function getNcModels(): Promise<string[]>;

/**
 * Chooses the noise-cancellation model for sessions opened from now on, in the whole process.
 * `null` goes back to choosing by sampling rate. Open sessions keep their model.
 * @throws {ValtoError} `ERR_VALTO_MODEL` for a name that is not registered.
 */
export declare function setNcModel(name: string | null): void;

/** Names of the voice-activity models. */
export declare function getVadModels(): Promise<string[]>;

/**
 * Chooses the voice-activity model for sessions opened from now on, in the whole process.
 * @throws {ValtoError} `ERR_VALTO_MODEL` for a name that is not registered.
 */
export declare function setVadModel(name: string): void;

export interface SessionOptions {
  /** Sampling rate of the audio, in hertz. */
  sampleRate: SampleRate;
  /** Length of one frame, in milliseconds. */
  frameMs: FrameDuration;
  /** Model for this session alone; left out or `null`: the process's choice. */
  model?: string | null;
}

declare class Session {
  readonly sampleRate: SampleRate;
  readonly frameMs: FrameDuration;
  /** Samples per frame: `sampleRate * frameMs / 1000`. */
  readonly frameSize: number;
  readonly closed: boolean;
  /** Ends the session and frees its state. Further calls do nothing. */
  close(): void;
  /** The same as `close()`, for `using`. */
  [Symbol.dispose](): void;
}

/** Samples over the whole 16-bit range, or floating point in -1..1. */
export type Samples = Int16Array | Float32Array;

export interface NoiseCancellerOptions extends SessionOptions {
  /** See `NoiseCanceller.attenuationLimit`; `Infinity` when left out. */
  attenuationLimit?: number;
  /** See `NoiseCanceller.bypass`; off when left out. */
  bypass?: boolean;
  /** Whether a voice-activity model listens, the chosen one or the one of that name. Off by default. */
  voice?: boolean | string;
}

/**
 * Removes background noise from one stream of mono audio: frame by frame with `process`, or in blocks
 * of any length with `push` and `flush`. A multi-channel stream takes one session per channel.
 */
export declare class NoiseCanceller extends Session {
  /** @throws {ValtoError} */
  constructor(options: NoiseCancellerOptions);
  /** How many samples the output of `process` runs behind the input; constant. */
  readonly latency: number;
  /**
   * No part of the sound in the model's band is lowered by more, in decibels: 0 lets everything
   * through, `Infinity` is no limit. May be set between any two frames; a change fades in.
   */
  attenuationLimit: number;
  /** Lets the sound through at the same latency; the change cross-fades over a frame. */
  bypass: boolean;
  /** Voice score of the last frame, 0 to 1; NaN unless the option `voice` is on, and at first. */
  readonly voiceScore: number;
  /**
   * Level of what was removed from the last frame, in decibels re one squared unit of the 16-bit
   * scale: -60 for silence, about 90 for full scale.
   */
  readonly noiseLevel: number;
  /**
   * Cleans one frame into `output`, by default into the frame itself, and returns what it wrote to.
   * Allocates nothing.
   * @throws {ValtoError}
   */
  process<Frame extends Samples>(frame: Frame): Frame;
  process<Output extends Int16Array>(frame: Int16Array, output: Output): Output;
  process<Output extends Float32Array>(frame: Float32Array, output: Output): Output;
  /**
   * Takes a block of any length and returns the cleaned samples that are ready, without the latency:
   * `push` and `flush` together give as many samples as went in, in their place. All blocks of a
   * sound are of one kind. Not to be mixed with `process`.
   * @throws {ValtoError}
   */
  push(block: Int16Array): Int16Array;
  push(block: Float32Array): Float32Array;
  /** Returns the rest. The next sound needs a new session. */
  flush(): Samples;
}

export interface NoiseCancellerStreamOptions extends Omit<NoiseCancellerOptions, 'frameMs'> {
  /** Interleaved channels, 1 to 16; 1 when left out. */
  channels?: number;
  /** `s16le` (16-bit integers, the default) or `f32le` (floating point in -1..1). */
  format?: 's16le' | 'f32le';
  /** 10 when left out. */
  frameMs?: FrameDuration;
  /** As for every stream, in bytes. */
  highWaterMark?: number;
}

/**
 * A noise canceller for pipelines: bytes of raw samples in, in chunks of any size, as many bytes out,
 * without the latency. A sample that is cut at the end is dropped.
 */
export declare class NoiseCancellerStream extends Transform {
  /** @throws {ValtoError} */
  constructor(options: NoiseCancellerStreamOptions);
  /** One per channel, for limit, bypass and meters. Closed when the stream is destroyed or ends. */
  readonly cancellers: readonly NoiseCanceller[];
}

/** Tells frame by frame how likely one stream of mono audio holds voice. */
export declare class VoiceActivityDetector extends Session {
  /** @throws {ValtoError} */
  constructor(options: SessionOptions);
  /**
   * The voice score of one frame, 0 to 1; 0.5 is the model's best threshold.
   * @throws {ValtoError}
   */
  process(frame: Samples): number;
}

/** The native module's own functions, unchanged. */
export interface RawModule {
  /** Throws an `Error` that names the start-up code; -4 when the engine is already running. */
  _initialize(): void;
  /** Calls back on a later turn of the event loop. */
  _getNcModels(callback: (names: string[]) => void): void;
  /** Anything but a string goes back to choosing by sampling rate. */
  setNcModel(name: unknown): void;
  /** Calls back on a later turn of the event loop. */
  _getVadModels(callback: (names: string[]) => void): void;
  /** Anything but a string changes nothing. */
  setVadModel(name: unknown): void;
}

export declare const raw: RawModule;

// In a declaration file this is what keeps unmarked names (Session) from being exported, too.
// biome-ignore lint/complexity/noUselessEmptyExport: see above
export {};

// Noise cancellation, voice score and noise level in the browser: a node for Web Audio, and an engine that takes
// frames, for workers and whole files.
export { models } from './assets.mjs';
export { Denoiser } from './denoiser.mjs';
export { FRAME_DURATIONS, SAMPLE_RATES } from './engine.mjs';
export { MorvaError, requireSupport } from './errors.mjs';
export { loadEngine } from './frames.mjs';

// The same objects for `import`.
import valto from './index.cjs';

export const {
  raw,
  initialize,
  getNcModels,
  setNcModel,
  getVadModels,
  setVadModel,
  NoiseCanceller,
  VoiceActivityDetector,
  NoiseCancellerStream,
  ValtoError,
  SAMPLE_RATES,
  FRAME_DURATIONS,
} = valto;

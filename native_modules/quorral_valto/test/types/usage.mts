// Compiled, not run: the types as an application uses them.
import {
  FRAME_DURATIONS,
  type FrameDuration,
  getNcModels,
  getVadModels,
  initialize,
  NoiseCanceller,
  raw,
  type SampleRate,
  type SessionOptions,
  setNcModel,
  setVadModel,
  ValtoError,
  type ValtoErrorCode,
  VoiceActivityDetector,
} from 'quorral_valto';

export async function start(): Promise<readonly string[]> {
  try {
    initialize();
  } catch (error) {
    if (error instanceof ValtoError) {
      const code: ValtoErrorCode = error.code;
      const native: number | undefined = error.nativeCode;
      console.error(code, native);
    }
  }
  const names: string[] = await getNcModels();
  setNcModel(names[0] ?? null);
  for (const name of await getVadModels()) setVadModel(name);
  raw._getNcModels((list: string[]) => list.length);
  return names;
}

export function clean(rate: SampleRate, frames: Iterable<Int16Array>): Int16Array[] {
  const frameMs: FrameDuration = FRAME_DURATIONS[0] ?? 10;
  const options: SessionOptions = { sampleRate: rate, frameMs, model: null };
  using canceller = new NoiseCanceller(options);
  using detector = new VoiceActivityDetector({ sampleRate: 48000, frameMs: 20 });
  const size: number = canceller.frameSize;
  const output = new Int16Array(size);
  const cleaned: Int16Array[] = [];
  for (const frame of frames) {
    const score: number = detector.process(frame);
    if (score > 0.5) cleaned.push(canceller.process(frame, output).slice());
  }
  return cleaned;
}

// @ts-expect-error a rate that the engine does not take
new NoiseCanceller({ sampleRate: 22050, frameMs: 10 });
// @ts-expect-error a duration that the engine does not take
new NoiseCanceller({ sampleRate: 48000, frameMs: 15 });
// @ts-expect-error float samples
new NoiseCanceller({ sampleRate: 48000, frameMs: 10 }).process(new Float32Array(480));
// @ts-expect-error voice activity has no automatic choice
setVadModel(null);
// @ts-expect-error the common base is no export
export type Base = import('quorral_valto').Session;
// @ts-expect-error read only
new VoiceActivityDetector({ sampleRate: 8000, frameMs: 10 }).frameSize = 3;

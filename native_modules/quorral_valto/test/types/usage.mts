// Compiled, not run: the types as an application uses them.
import * as valto from 'quorral_valto';

export async function use(error: unknown, rate: valto.SampleRate): Promise<Int16Array> {
  if (error instanceof valto.ValtoError) {
    const code: valto.ValtoErrorCode = error.code;
    console.error(code, (error.nativeCode ?? 0).toFixed());
  }
  const names: string[] = [...(await valto.getNcModels()), ...(await valto.getVadModels())];
  valto.setNcModel(names[0] ?? null);
  valto.initialize({ onDiagnostic: (text, stream) => console.error(`${stream}: ${text}`) });
  valto.raw._getNcModels((list: string[]) => list.length);
  const frameMs: valto.FrameDuration = valto.FRAME_DURATIONS[0] ?? 10;
  using canceller = new valto.NoiseCanceller({ sampleRate: rate, frameMs, model: null });
  using detector = new valto.VoiceActivityDetector({ sampleRate: 48000, frameMs: 20 });
  const frame: Int16Array = canceller.process(new Int16Array(canceller.frameSize));
  const floats: Float32Array = canceller.push(canceller.process(new Float32Array(480)));
  canceller.attenuationLimit = canceller.voiceScore + canceller.noiseLevel + floats.length;
  const through: NodeJS.ReadWriteStream = new valto.NoiseCancellerStream({ sampleRate: rate });
  process.stdin.pipe(through).pipe(process.stdout);
  const score: number = detector.process(frame);
  return canceller.process(frame, new Int16Array(score > 0.5 ? frame.length : 0));
}

// @ts-expect-error a rate that the engine does not take
new valto.NoiseCanceller({ sampleRate: 22050, frameMs: 10 });
// @ts-expect-error a duration that the engine does not take
new valto.NoiseCanceller({ sampleRate: 48000, frameMs: 15 });
const canceller = new valto.NoiseCanceller({ sampleRate: 48000, frameMs: 10 });
// @ts-expect-error samples of two kinds
canceller.process(new Float32Array(480), new Int16Array(480));
// @ts-expect-error voice activity has no automatic choice
valto.setVadModel(null);
// @ts-expect-error the common base is no export
export type Base = valto.Session;
// @ts-expect-error read only
new valto.VoiceActivityDetector({ sampleRate: 8000, frameMs: 10 }).frameSize = 3;

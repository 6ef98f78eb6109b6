// Checked, not run.
import { Denoiser, loadEngine, type Meters, MorvaError, models } from 'quorral_valto_web';

export async function asNode(context: AudioContext, source: AudioNode): Promise<number> {
  const node = await Denoiser.create(context, { model: models[0]?.name ?? '', channels: 2 });
  node.addEventListener('meters', ({ detail }: { detail: Meters }) => console.log(detail.voice));
  node.attenuationLimit.setTargetAtTime(20, context.currentTime, 0.1);
  source.connect(node).connect(context.destination);
  // @ts-expect-error: made by create
  new Denoiser(context, 1);
  return node.latency;
}

export async function asFrames(frame: Int16Array): Promise<Int16Array> {
  const engine = await loadEngine({ onProgress: ({ loaded, total }) => loaded / total });
  // @ts-expect-error: no such rate
  new engine.VoiceActivityDetector({ sampleRate: 22050 });
  const session = new engine.NoiseCanceller({ sampleRate: 48000, model: 'small_NC' });
  return session.process(frame);
}

export const codeOf = (error: unknown) => (error instanceof MorvaError ? error.code : null);

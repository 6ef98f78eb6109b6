// What the tests of the live page stand on: a server that ends with the test, and the package itself.
import { require } from '../dependencies.mjs';
import { startServer } from '../server.mjs';

const { initialize, NoiseCanceller, VoiceActivityDetector } = require('quorral_valto');
initialize();

/** A server that ends with the test. */
export async function serve(t, options = {}) {
  const server = await startServer(options);
  t.after(() => void server.close());
  return server;
}

/** What the package makes of a sound: cleaned samples, the delay taken out, and voice scores. */
export function directly(samples, sampleRate, model) {
  const canceller = new NoiseCanceller({ sampleRate, frameMs: 10, model });
  const detector = new VoiceActivityDetector({ sampleRate, frameMs: 10 });
  const { frameSize, latency } = canceller;
  const padded = new Int16Array(Math.ceil((samples.length + latency) / frameSize) * frameSize);
  padded.set(samples);
  const voice = [];
  for (let at = 0; at < padded.length; at += frameSize) {
    const frame = padded.subarray(at, at + frameSize);
    if (at < samples.length) voice.push(detector.process(frame));
    canceller.process(frame);
  }
  return { samples: padded.subarray(latency, latency + samples.length), voice };
}

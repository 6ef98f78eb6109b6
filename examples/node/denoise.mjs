// Cleans a 16-bit WAV file, any number of channels: node denoise.mjs noisy.wav clean.wav
// The result is as long as the original and in step with it: the engine's delay is taken out.
import { readFileSync, writeFileSync } from 'node:fs';
import { initialize, NoiseCanceller } from 'quorral_valto';

const [source, target] = process.argv.slice(2);
if (!target) throw new Error('usage: node denoise.mjs noisy.wav clean.wav');
const wav = readFileSync(source);

// RIFF: a 12-byte header, then chunks of id, size and content padded to an even length.
function chunk(id) {
  for (let at = 12; at + 8 <= wav.length; at += 8 + wav.readUInt32LE(at + 4) + (wav[at + 4] & 1)) {
    const end = Math.min(at + 8 + wav.readUInt32LE(at + 4), wav.length);
    if (wav.toString('latin1', at, at + 4) === id) return wav.subarray(at + 8, end);
  }
  throw new Error(`${source}: no chunk "${id}", not a WAV file?`);
}

const format = chunk('fmt ');
const channels = format.readUInt16LE(2);
const sampleRate = format.readUInt32LE(4);
if (format.readUInt16LE(14) !== 16) throw new Error(`${source}: only 16-bit samples, please`);
const data = chunk('data');
const length = Math.floor(data.length / 2 / channels);

initialize();
for (let channel = 0; channel < channels; ++channel) {
  const canceller = new NoiseCanceller({ sampleRate, frameMs: 10 });
  const { frameSize, latency } = canceller;
  const frame = new Int16Array(frameSize);
  const position = (sample) => (sample * channels + channel) * 2;
  for (let start = 0; start < length + latency; start += frameSize) {
    for (let i = 0; i < frameSize; ++i) {
      frame[i] = start + i < length ? data.readInt16LE(position(start + i)) : 0;
    }
    canceller.process(frame);
    // What comes out now went in `latency` samples ago, a place that has been read already.
    for (let i = 0; i < frameSize; ++i) {
      const sample = start + i - latency;
      if (sample >= 0 && sample < length) data.writeInt16LE(frame[i], position(sample));
    }
  }
  canceller.close();
}
writeFileSync(target, wav);
console.log(`${target}: ${(length / sampleRate).toFixed(1)} s cleaned`);

/**
 * RNNoise as an npm package carries it, for peers.py:
 *
 *   node rnnoise.mjs PACKAGE/rnnoise.js < in.f32 > out.f32
 *
 * Samples at 48 kHz on the 16-bit scale.
 */
import { readFileSync, writeFileSync } from 'node:fs';
import { pathToFileURL } from 'node:url';

const FRAME = 480;
const { default: load } = await import(pathToFileURL(process.argv[2]).href);
const rnnoise = await load();
const state = rnnoise._rnnoise_create(0);
const place = rnnoise._malloc(4 * FRAME);

const bytes = readFileSync(0);
const samples = new Float32Array(bytes.buffer.slice(bytes.byteOffset, bytes.byteOffset + bytes.byteLength));
for (let start = 0; start + FRAME <= samples.length; start += FRAME) {
  rnnoise.HEAPF32.set(samples.subarray(start, start + FRAME), place / 4);
  rnnoise._rnnoise_process_frame(state, place, place);
  samples.set(rnnoise.HEAPF32.subarray(place / 4, place / 4 + FRAME), start);
}
writeFileSync(1, new Uint8Array(samples.buffer));

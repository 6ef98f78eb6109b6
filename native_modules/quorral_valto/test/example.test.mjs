// The example program on a file of its own.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { readFileSync, writeFileSync } from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import { levelDb, noise } from './support/audio.mjs';
import { temporaryFolder, testDir } from './support/package.mjs';

// Lies beside the suite when the packed package is tested.
const program = path.join(testDir, '..', 'denoise.mjs');

/** A 16-bit WAV file with an odd-sized chunk of no interest before its samples. */
function wavFile(samples, channels, sampleRate) {
  const head = Buffer.alloc(12 + 24 + 12 + 8);
  head.write('RIFF', 0);
  head.writeUInt32LE(head.length - 8 + samples.byteLength, 4);
  head.write('WAVEfmt ', 8);
  head.writeUInt32LE(16, 16);
  head.writeUInt16LE(1, 20);
  head.writeUInt16LE(channels, 22);
  head.writeUInt32LE(sampleRate, 24);
  head.writeUInt32LE(sampleRate * channels * 2, 28);
  head.writeUInt16LE(channels * 2, 32);
  head.writeUInt16LE(16, 34);
  head.write('note', 36);
  head.writeUInt32LE(3, 40);
  head.write('data', 48);
  head.writeUInt32LE(samples.byteLength, 52);
  return Buffer.concat([head, Buffer.from(samples.buffer)]);
}

test('cleans a stereo file in place and length', (t) => {
  const folder = temporaryFolder(t);
  const [rate, frames] = [48000, 48000 * 3 + 77];
  const input = noise(frames * 2, 5);
  for (let i = 1; i < input.length; i += 2) input[i] = 0; // silence on the right
  writeFileSync(path.join(folder, 'noisy.wav'), wavFile(input, 2, rate));
  const printed = execFileSync(process.execPath, [program, 'noisy.wav', 'clean.wav'], {
    cwd: folder,
    encoding: 'utf8',
  });
  assert.match(printed, /clean\.wav: 3\.0 s cleaned/);
  const bytes = readFileSync(path.join(folder, 'clean.wav'));
  assert.equal(bytes.length, 56 + input.byteLength);
  const output = new Int16Array(bytes.buffer.slice(bytes.byteOffset + 56));
  const channel = (which) => output.filter((_, i) => i % 2 === which).subarray(rate);
  assert.ok(levelDb(channel(0)) < levelDb(noise(rate, 5)) - 12);
  assert.ok(channel(1).every((sample) => sample === 0));
});

test('says what is wrong with a file', (t) => {
  const file = path.join(temporaryFolder(t), 'no.wav');
  writeFileSync(file, 'RIFF nothing');
  assert.throws(
    () => execFileSync(process.execPath, [program, file, file], { stdio: 'pipe' }),
    /no chunk "fmt "/,
  );
});

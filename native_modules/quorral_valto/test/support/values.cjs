// tests/targets/values.c through the host module: node values.cjs PACKAGE RECORDING {NC|VAD MODEL.mvw} ...
'use strict';
const fs = require('node:fs');
const path = require('node:path');

const [folder, recording, ...wanted] = process.argv.slice(2);
const valto = require(path.resolve(folder));
const shipped = require('../../../../models/shipped.json');
const bytes = fs.readFileSync(recording);
const sound = new Int16Array(bytes.buffer, bytes.byteOffset, bytes.length / 2);

valto.initialize();
const lines = [];
for (let i = 0; i < wanted.length; i += 2) {
  const kind = wanted[i];
  const { name } = shipped.find(({ file }) => file === path.basename(wanted[i + 1]));
  const Kind = kind === 'NC' ? valto.NoiseCanceller : valto.VoiceActivityDetector;
  const session = new Kind({ sampleRate: 48000, frameMs: 10, model: name });
  const frame = new Float32Array(session.frameSize);
  for (let at = 0; at + frame.length <= sound.length; at += frame.length) {
    for (let k = 0; k < frame.length; ++k) frame[k] = sound[at + k] / 32768;
    const score = session.process(frame);
    for (const value of kind === 'NC' ? frame : [score]) lines.push(`${kind} ${value}`);
  }
  session.close();
}
process.stdout.write(`${lines.join('\n')}\n`);

// A voice-activity weight file with seeded random values: right names and shapes, meaningless scores.
// Stands in where no trained one has been built.
import { writeFileSync } from 'node:fs';
import { randomSource } from './audio.mjs';

const TYPE = { int: 1, string: 2, vector: 3, matrix: 4, vectors: 5, matrices: 6 };
const FEATURES = 61;
const CONTEXT_FRAMES = 5;
const HIDDEN = 16;

const u32 = (value) => {
  const bytes = Buffer.alloc(4);
  bytes.writeUInt32LE(value);
  return bytes;
};
const text = (value) => Buffer.concat([u32(Buffer.byteLength(value)), Buffer.from(value)]);
const floats = (values) => Buffer.from(Float32Array.from(values).buffer);
const vector = (values) => Buffer.concat([u32(values.length), floats(values)]);
const list = (encode, items) => Buffer.concat([u32(items.length), ...items.map(encode)]);
const matrix = ({ rows, cols, values }) => Buffer.concat([u32(rows), u32(cols), floats(values)]);
const record = (name, type, value) => Buffer.concat([text(name), u32(TYPE[type]), value]);

export function writeRandomVadWeight(file, seed = 1) {
  const random = randomSource(seed);
  const values = (n, scale = 0.1) => Array.from({ length: n }, () => (2 * random() - 1) * scale);
  const weights = (rows, cols) => ({ rows, cols, values: values(rows * cols) });
  const width = HIDDEN + FEATURES * CONTEXT_FRAMES;
  const records = [
    record('Version', 'string', text('VAD_0.0.1')),
    record('ModelName', 'string', text(`random_vad_${seed}`)),
    record('TimeStamp', 'string', text('1970-01-01')),
    record('SampleRate', 'int', u32(8000)),
    record('FrameLength', 'int', u32(240)),
    record('MU', 'vector', vector(values(FEATURES, 1).map((x) => 12 + x))),
    record('SD', 'vector', vector(values(FEATURES, 1).map((x) => 4 + x))),
    record(
      'WeightLinear',
      'matrices',
      list(matrix, [weights(width, HIDDEN), weights(HIDDEN, HIDDEN), weights(HIDDEN, 1)]),
    ),
    record(
      'WeightNonLinear',
      'matrices',
      list(matrix, [weights(width, HIDDEN), weights(HIDDEN, HIDDEN)]),
    ),
    record('BaesLinear', 'vectors', list(vector, [values(HIDDEN), values(HIDDEN), values(1)])),
    record('BaesNonLinear', 'vectors', list(vector, [values(HIDDEN), values(HIDDEN)])),
    record('WeightGRU', 'matrix', matrix(weights(width, HIDDEN))),
    record('BaesGRU', 'vector', vector(values(HIDDEN))),
    record('Test_MINMAX', 'vector', vector([-3, 3])),
    record('Test_BestF1', 'vector', vector([0])),
  ];
  writeFileSync(file, Buffer.concat(records));
}

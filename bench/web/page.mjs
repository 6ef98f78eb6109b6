// In the page: everyone cleans the same seconds in turn.
import createJitsi from '@jitsi/rnnoise-wasm/dist/rnnoise-sync.js';
import { Rnnoise } from '@shiguredo/rnnoise-wasm';
import { Engine } from '../../web/src/engine.mjs';
import { FrameQueue } from '../../web/src/frame-queue.mjs';

const RATE = 48000;
const FRAME = 480;
const QUANTUM = 128;
const NOISE_MODELS = ['NC_small_16k.mvw', 'c6.xs.f.ca03f4.mvw'];
const VOICE = 'VAD_weight.mvw';

const bytesOf = async (address) => new Uint8Array(await (await fetch(address)).arrayBuffer());

async function ours() {
  const engine = new Engine(await WebAssembly.compile(await bytesOf('dist/morva_sdk.wasm')));
  for (const file of [...NOISE_MODELS, VOICE]) {
    engine.addModel({ name: file, kind: 'NC', bytes: await bytesOf(`dist/models/${file}`) });
  }
  const open = (model, voice = null) =>
    new engine.NoiseCanceller({ sampleRate: RATE, model, voice });
  return {
    'small 16 kHz model': () => open(NOISE_MODELS[0]),
    'full model': () => open(NOISE_MODELS[1]),
    'full model, voice score': () => open(NOISE_MODELS[1], VOICE),
  };
}

async function jitsi() {
  const rnnoise = createJitsi();
  await rnnoise.ready;
  const state = rnnoise._rnnoise_create();
  const place = rnnoise._malloc(4 * FRAME);
  return (frame) => {
    const samples = rnnoise.HEAPF32.subarray(place / 4, place / 4 + FRAME);
    for (let i = 0; i < FRAME; ++i) samples[i] = frame[i] * 32768;
    rnnoise._rnnoise_process_frame(state, place, place);
  };
}

async function shiguredo() {
  const state = (await Rnnoise.load()).createDenoiseState();
  const samples = new Float32Array(FRAME);
  return (frame) => {
    for (let i = 0; i < FRAME; ++i) samples[i] = frame[i] * 32768;
    state.processFrame(samples);
  };
}

const sorted = (values) => Float64Array.from(values).sort();
const at = (values, share) =>
  values[Math.min(values.length - 1, Math.floor(share * values.length))];

/** Microseconds a frame of every subject, a second of sound at a time. */
function costsOf(subjects, sound, rounds) {
  const times = new Map(Object.keys(subjects).map((name) => [name, []]));
  for (let round = -2; round < rounds; ++round) {
    const from = ((round + 2) * RATE) % (sound.length - RATE);
    for (const [name, clean] of Object.entries(subjects)) {
      const started = performance.now();
      for (let i = 0; i < RATE; i += FRAME) clean(sound.subarray(from + i, from + i + FRAME));
      if (round >= 0) times.get(name).push((performance.now() - started) * (1000 / (RATE / FRAME)));
    }
  }
  const entries = [...times].map(([name, values]) => {
    const order = sorted(values);
    return [name, { median: at(order, 0.5), best: order[0] }];
  });
  return Object.fromEntries(entries);
}

/** Median, p99 and maximum of what the audio thread does in a quantum, as shares of its time. */
function sharesOf(session, sound) {
  const queue = new FrameQueue(session, QUANTUM);
  const output = new Float32Array(QUANTUM);
  const shares = [];
  for (let i = 0; i + QUANTUM <= sound.length; i += QUANTUM) {
    const input = sound.subarray(i, i + QUANTUM);
    const started = performance.now();
    queue.run(input, output);
    shares.push((performance.now() - started) / ((1000 * QUANTUM) / RATE));
  }
  const order = sorted(shares.slice(RATE / QUANTUM)); // the first second warms up
  return [at(order, 0.5), at(order, 0.99), order.at(-1)];
}

globalThis.bench = async (rounds) => {
  const context = new OfflineAudioContext(1, 1, RATE);
  const { buffer } = await bytesOf('recording.flac');
  const sound = (await context.decodeAudioData(buffer)).getChannelData(0);
  const own = await ours();
  const subjects = {};
  for (const [name, open] of Object.entries(own)) {
    const session = open();
    const cleaned = new Float32Array(FRAME);
    subjects[name] = (frame) => session.process(frame, cleaned);
  }
  subjects['RNNoise, @jitsi'] = await jitsi();
  subjects['RNNoise, @shiguredo'] = await shiguredo();
  const costs = costsOf(subjects, sound, rounds);
  const quanta = Object.entries(own).map(([name, open]) => [name, sharesOf(open(), sound)]);
  return { costs, quanta: Object.fromEntries(quanta) };
};

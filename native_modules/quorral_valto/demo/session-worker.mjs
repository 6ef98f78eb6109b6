// The thread of one connection: everything that touches the engine runs here, so that a busy or broken
// connection holds up nobody else. Answers every message with one `taken`, by which the connection counts
// what is still on its way.
import { parentPort } from 'node:worker_threads';
import { encodeResult } from './page/protocol.mjs';

let models = [];
let stream = null;
let id = 0;

const post = (message, transfer) => parentPort.postMessage(message, transfer);

function answer(result) {
  const bytes = encodeResult({ stream: id, ...result });
  post({ kind: 'bytes', bytes }, [bytes]);
}

const actions = {
  start({ stream: wanted, sampleRate, model }, { CleaningStream }) {
    stream?.close();
    stream = null;
    stream = new CleaningStream({ sampleRate, model, models });
    id = wanted;
    post({ kind: 'text', text: { type: 'started', stream: id, latency: stream.latency } });
  },
  samples({ samples }) {
    // What is on its way when a sound is stopped or refused belongs to nobody.
    if (stream !== null) answer(stream.push(samples));
  },
  model({ name }) {
    stream?.switchModel(name);
    if (stream !== null) post({ kind: 'text', text: { type: 'model', stream: id, name } });
  },
  stop() {
    if (stream === null) return;
    answer(stream.finish());
    post({ kind: 'text', text: { type: 'done', stream: id, samples: stream.received } });
    stream.close();
    stream = null;
  },
};

function fail(error) {
  post({ kind: 'error', code: error.code ?? 'ERR_DEMO_INTERNAL', message: error.message });
}

try {
  const valto = await import('quorral_valto');
  const parts = await import('./cleaning-stream.mjs');
  valto.initialize();
  models = await valto.getNcModels();
  post({ kind: 'ready', models, sampleRates: valto.SAMPLE_RATES });
  parentPort.on('message', (message) => {
    try {
      actions[message.type](message, parts);
      post({ kind: 'taken' });
    } catch (error) {
      fail(error);
    }
  });
} catch (error) {
  fail(error);
}

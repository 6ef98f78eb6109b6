// The thread of one connection: everything that touches the engine runs here, so that a busy or broken
// connection holds up nobody else. Answers every message with one `taken`, by which the connection counts
// what is still on its way.
import { readFileSync } from 'node:fs';
import { parentPort } from 'node:worker_threads';
import { require } from './dependencies.mjs';
import { Conversation } from './page/conversation.mjs';

const post = (message, transfer) => parentPort.postMessage(message, transfer);

function tell(answer) {
  if (answer instanceof ArrayBuffer) post({ kind: 'bytes', bytes: answer }, [answer]);
  else post({ kind: 'text', text: answer });
}

function fail(error) {
  post({ kind: 'error', code: error.code ?? 'ERR_LIVE_INTERNAL', message: error.message });
}

try {
  const valto = require('quorral_valto');
  valto.initialize();
  const names = await valto.getNcModels();
  const shipped = JSON.parse(readFileSync(new URL('../../models/shipped.json', import.meta.url)));
  const models = shipped.filter(({ name }) => names.includes(name));
  post({
    kind: 'ready',
    models: models.map(({ name, rate }) => ({ name, rate })),
    sampleRates: valto.SAMPLE_RATES,
  });
  const conversation = new Conversation(valto, names, tell);
  parentPort.on('message', (message) => {
    try {
      conversation.take(message);
      post({ kind: 'taken' });
    } catch (error) {
      fail(error);
    }
  });
} catch (error) {
  fail(error);
}

// The other side of an EngineLink: the engine and its conversation with the page.
import { Conversation } from './conversation.mjs';
import { loadEngine, models, SAMPLE_RATES } from './quorral_valto_web/index.mjs';

const MAX_SECONDS = 600;

const tell = (answer) => {
  if (answer instanceof ArrayBuffer) postMessage(answer, [answer]);
  else postMessage(JSON.stringify(answer));
};
const attempt = (action) => {
  try {
    return action();
  } catch ({ message }) {
    postMessage({ failed: message });
  }
};

const noiseModels = models.filter(({ kind }) => kind === 'NC');
const [voiceModel] = models.filter(({ kind }) => kind === 'VAD');

try {
  const engine = await loadEngine({
    models: [...noiseModels, voiceModel].map(({ name }) => name),
    onProgress: ({ loaded, total }) => tell({ type: 'progress', share: loaded / total }),
  });
  const names = noiseModels.map(({ name }) => name);
  const conversation = new Conversation(engine, names, tell);
  self.onmessage = ({ data }) => attempt(() => conversation.take(data));
  tell({
    type: 'hello',
    models: noiseModels.map(({ name, rate }) => ({ name, rate })),
    sampleRates: SAMPLE_RATES,
    maxSeconds: MAX_SECONDS,
    example: 'example.flac',
  });
} catch ({ message }) {
  postMessage({ failed: message });
}

// The node of a Web Audio graph. What it needs is fetched here; the sound is cleaned on the audio thread.
import { loadAssets, modelFor, processorUrl, voiceModel } from './assets.mjs';
import { SAMPLE_RATES } from './engine.mjs';
import { MorvaError } from './errors.mjs';

/** What the audio thread of a context has got, and who is next to send it something. */
const contexts = new WeakMap();

async function inTurn(context, use) {
  if (!contexts.has(context)) contexts.set(context, { sent: new Set(), last: Promise.resolve() });
  const state = contexts.get(context);
  const turn = state.last.then(() => use(state.sent));
  state.last = turn.catch(() => {});
  return turn;
}

function answerOf(port) {
  return new Promise((resolve, reject) => {
    port.onmessage = ({ data }) => {
      if (data.type === 'ready') resolve(data);
      else reject(new MorvaError(data.code ?? 'ERR_MORVA_ENGINE', data.message));
    };
    port.onmessageerror = () =>
      reject(
        new MorvaError('ERR_MORVA_UNSUPPORTED', 'This browser hands no module to audio threads.'),
      );
  });
}

// Where there are no such nodes (workers, pages that are not secure) this file can be imported all the same.
const Node = globalThis.AudioWorkletNode ?? EventTarget;

/** Cleans what flows through it. Event `meters`: `detail` has voice, noise, dropouts, memory. */
export class Denoiser extends Node {
  #latency = 0;

  /** Use `Denoiser.create`. */
  constructor(context, channels) {
    super(context, 'morva-denoiser', {
      numberOfInputs: 1,
      numberOfOutputs: 1,
      outputChannelCount: [channels],
      channelCount: channels,
      channelCountMode: 'explicit',
    });
  }

  static async create(context, options = {}) {
    const { model = modelFor(context.sampleRate), voice = true, channels = 1 } = options;
    const { attenuationLimit, bypass = false, meterSeconds = 0.05, baseUrl, onProgress } = options;
    if (context.audioWorklet === undefined) {
      throw new MorvaError(
        'ERR_MORVA_UNSUPPORTED',
        'There is no AudioWorklet here: it takes a page from https or localhost, and no worker.',
      );
    }
    if (!SAMPLE_RATES.includes(context.sampleRate)) {
      throw new MorvaError(
        'ERR_MORVA_SAMPLE_RATE',
        `The engine does not run at ${context.sampleRate} Hz: make the AudioContext with one of ${SAMPLE_RATES.join(', ')}.`,
      );
    }
    const names = voice ? [model, voiceModel] : [model];
    const [assets] = await Promise.all([
      loadAssets({ names, baseUrl, onProgress }),
      context.audioWorklet.addModule(processorUrl(baseUrl)), // repeated calls load it once
    ]);
    return inTurn(context, async (sent) => {
      const node = new Denoiser(context, channels);
      if (attenuationLimit !== undefined) node.attenuationLimit.value = attenuationLimit;
      node.bypass.value = bypass ? 1 : 0;
      await node.#open({
        module: assets.module,
        models: assets.models.filter(({ name }) => !sent.has(name)),
        session: { model, voice: voice ? voiceModel : null },
        ...{ channels, meterSeconds, isLive: context instanceof AudioContext },
      });
      for (const { name } of assets.models) sent.add(name);
      return node;
    });
  }

  async #open(message) {
    const answer = answerOf(this.port);
    this.port.postMessage(
      message,
      message.models.map(({ bytes }) => bytes.buffer),
    );
    const { latency } = await answer;
    this.#latency = latency / this.context.sampleRate;
    this.port.onmessage = ({ data }) =>
      this.dispatchEvent(new CustomEvent('meters', { detail: data }));
  }

  /** Most decibels by which noise is lowered; 100, the default, is no limit. @type {AudioParam} */
  get attenuationLimit() {
    return this.parameters.get('attenuationLimit');
  }

  /** From 0.5 on the sound passes as it is, at the same latency. @type {AudioParam} */
  get bypass() {
    return this.parameters.get('bypass');
  }

  /** Seconds from sound in to sound out. */
  get latency() {
    return this.#latency;
  }

  /** Frees its part of the audio thread's memory; silence comes out from then on. */
  close() {
    this.port.postMessage({ type: 'close' });
    this.disconnect();
  }
}

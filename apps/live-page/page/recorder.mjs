// The microphone, and hearing the cleaned sound while it comes in. The browser's own echo cancellation,
// noise suppression and gain control are asked to stay off: what is shown is this engine's work.

const REASONS = {
  NotAllowedError:
    'The browser may not use the microphone. Allow it (the icon in the address bar) and record again, ' +
    'or choose a file.',
  NotFoundError: 'No microphone was found. Connect one and record again, or choose a file.',
  NotReadableError: 'The microphone is in use by another program, or its driver fails.',
};

async function openMicrophone() {
  if (!navigator.mediaDevices?.getUserMedia) {
    throw new Error('This browser gives pages no microphone here. Choose a file instead.');
  }
  try {
    return await navigator.mediaDevices.getUserMedia({
      audio: {
        channelCount: 1,
        echoCancellation: false,
        noiseSuppression: false,
        autoGainControl: false,
      },
    });
  } catch (error) {
    throw new Error(REASONS[error.name] ?? `The microphone cannot be opened: ${error.message}`);
  }
}

export class Recorder {
  #context;
  #microphone = null;
  #nodes = [];
  #monitor = null;
  #isMonitored = false;

  constructor(context) {
    this.#context = context;
  }

  /**
   * @param {{ onSamples: (samples: Int16Array) => void, onEnded: () => void }} listener `onEnded`: the
   *   microphone went away by itself
   */
  async start({ onSamples, onEnded }) {
    const context = this.#context;
    const microphone = await openMicrophone();
    try {
      await context.audioWorklet.addModule(new URL('worklets.mjs', import.meta.url)); // repeated calls load it once
      await context.resume();
      const source = context.createMediaStreamSource(microphone);
      const capture = new AudioWorkletNode(context, 'capture', { channelCount: 1 });
      // Its silent output keeps it running in every browser.
      source.connect(capture).connect(context.destination);
      this.#monitor = new AudioWorkletNode(context, 'monitor', { numberOfInputs: 0 });
      this.#nodes = [source, capture, this.#monitor];
      capture.port.onmessage = ({ data }) => onSamples(data);
    } catch (error) {
      for (const track of microphone.getTracks()) track.stop();
      throw error;
    }
    this.#microphone = microphone;
    microphone.getAudioTracks()[0].addEventListener('ended', onEnded);
    this.monitor(this.#isMonitored);
  }

  stop() {
    for (const track of this.#microphone?.getTracks() ?? []) track.stop();
    for (const node of this.#nodes) {
      node.disconnect();
      if (node.port) node.port.onmessage = null;
    }
    this.#microphone = null;
    this.#monitor = null;
    this.#nodes = [];
  }

  /** Live listening, off until asked for. */
  monitor(on) {
    this.#isMonitored = on;
    if (on) this.#monitor?.connect(this.#context.destination);
    else this.#monitor?.disconnect();
  }

  /** Cleaned samples for live listening. */
  hear(samples) {
    if (this.#isMonitored) this.#monitor?.port.postMessage(samples);
  }
}

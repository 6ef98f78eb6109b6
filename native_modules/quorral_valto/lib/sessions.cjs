'use strict';
// Sessions for audio that is already in script. Everything is checked here, so that a frame call
// reaches the engine only with what it takes; the engine would print a line for anything else.

const { ValtoError } = require('./errors.cjs');

const SAMPLE_RATES = Object.freeze([8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000]);
const FRAME_DURATIONS = Object.freeze([10, 20, 30, 40]);

function checkOptions(options) {
  if (options === null || typeof options !== 'object') {
    throw new ValtoError('ERR_VALTO_ARGUMENT', 'Options must be an object');
  }
  const { sampleRate, frameMs, model = null } = options;
  if (!SAMPLE_RATES.includes(sampleRate)) {
    throw new ValtoError(
      'ERR_VALTO_SAMPLE_RATE',
      `sampleRate ${String(sampleRate)} is not one of ${SAMPLE_RATES.join(', ')} Hz`,
    );
  }
  if (!FRAME_DURATIONS.includes(frameMs)) {
    throw new ValtoError(
      'ERR_VALTO_FRAME_DURATION',
      `frameMs ${String(frameMs)} is not one of ${FRAME_DURATIONS.join(', ')} ms`,
    );
  }
  if (model !== null && typeof model !== 'string') {
    throw new ValtoError('ERR_VALTO_ARGUMENT', 'model must be a string or null');
  }
  return { sampleRate, frameMs, model };
}

function openError(status, { sampleRate, frameMs, model }) {
  if (status === 1) {
    return new ValtoError(
      'ERR_VALTO_NOT_INITIALIZED',
      'Call initialize() before opening a session',
    );
  }
  if (status === 2) {
    return new ValtoError('ERR_VALTO_MODEL', `No such model: ${JSON.stringify(model)}`);
  }
  return new ValtoError(
    'ERR_VALTO_SESSION',
    `The engine refuses a session at ${sampleRate} Hz, ${frameMs} ms` +
      (model === null ? ' with the chosen model' : ` with the model ${JSON.stringify(model)}`),
  );
}

function checkFrame(frame, frameSize, what) {
  // By tag, not by instanceof: frames may come from another realm.
  if (frame?.[Symbol.toStringTag] !== 'Int16Array') {
    throw new ValtoError('ERR_VALTO_ARGUMENT', `The ${what} must be an Int16Array`);
  }
  if (frame.length !== frameSize) {
    throw new ValtoError(
      'ERR_VALTO_FRAME_SIZE',
      `The ${what} has ${frame.length} samples instead of ${frameSize}`,
    );
  }
}

function createSessionClasses(native) {
  // The native session behind an open one; throws once it is closed.
  let handleOf;

  class Session {
    #handle;
    #isOpen = true;

    constructor(open, options) {
      const checked = checkOptions(options);
      const opened = open(checked.sampleRate, checked.frameMs, checked.model);
      if (typeof opened === 'number') throw openError(opened, checked);
      this.#handle = opened;
      this.sampleRate = checked.sampleRate;
      this.frameMs = checked.frameMs;
      this.frameSize = (checked.sampleRate * checked.frameMs) / 1000;
    }

    static {
      handleOf = (session) => {
        if (!session.#isOpen) throw new ValtoError('ERR_VALTO_CLOSED', 'The session is closed');
        return session.#handle;
      };
    }

    get closed() {
      return !this.#isOpen;
    }

    close() {
      if (!this.#isOpen) return;
      this.#isOpen = false;
      native.close(this.#handle);
    }

    [Symbol.dispose]() {
      this.close();
    }
  }

  const failed = (code) =>
    new ValtoError('ERR_VALTO_PROCESS', `The engine failed on a frame (${code})`, {
      nativeCode: code,
    });

  class NoiseCanceller extends Session {
    constructor(options) {
      super(native.openNc, options);
      this.latency = native.latency(handleOf(this));
      Object.freeze(this);
    }

    process(frame, output = frame) {
      const handle = handleOf(this);
      checkFrame(frame, this.frameSize, 'frame');
      if (output !== frame) checkFrame(output, this.frameSize, 'output');
      const code = native.processNc(handle, frame, output);
      if (code !== 0) throw failed(code);
      return output;
    }
  }

  class VoiceActivityDetector extends Session {
    constructor(options) {
      super(native.openVad, options);
      Object.freeze(this);
    }

    process(frame) {
      const handle = handleOf(this);
      checkFrame(frame, this.frameSize, 'frame');
      const score = native.processVad(handle, frame);
      // Failures are the whole negative numbers; an uncalibrated model may score below zero too.
      if (score === -1 || score === -2 || score === -3 || score === -4) throw failed(score);
      return score;
    }
  }

  return { NoiseCanceller, VoiceActivityDetector };
}

module.exports = { createSessionClasses, SAMPLE_RATES, FRAME_DURATIONS };

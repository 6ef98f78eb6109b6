'use strict';
// Sessions for audio that is already in script. Everything is checked here, so that a frame call
// reaches the engine only with what it takes; the engine would print a line for anything else.

const { Blocks } = require('./blocks.cjs');
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

function checkVoice(voice) {
  if (typeof voice === 'boolean' || typeof voice === 'string') return voice;
  throw new ValtoError('ERR_VALTO_ARGUMENT', 'voice must be a boolean or the name of a model');
}

function checkLimit(limitDb) {
  if (typeof limitDb === 'number' && limitDb >= 0) return limitDb;
  throw new ValtoError('ERR_VALTO_ARGUMENT', 'attenuationLimit is 0 or more decibels, or Infinity');
}

function openError(status, { sampleRate, frameMs, model }, reason) {
  if (status === 1) {
    return new ValtoError(
      'ERR_VALTO_NOT_INITIALIZED',
      'Call initialize() before opening a session',
    );
  }
  if (status === 2) {
    const text = model === null ? 'There is no model' : `No such model: ${JSON.stringify(model)}`;
    return new ValtoError('ERR_VALTO_MODEL', text);
  }
  return new ValtoError(
    'ERR_VALTO_SESSION',
    `The engine refuses a session at ${sampleRate} Hz, ${frameMs} ms` +
      (model === null ? ' with the chosen model' : ` with the model ${JSON.stringify(model)}`) +
      `: ${reason}`,
  );
}

// By tag, not by instanceof: arrays may come from another realm.
const kindOf = (samples) => samples?.[Symbol.toStringTag];

function checkSamples(samples, what) {
  if (kindOf(samples) === 'Int16Array' || kindOf(samples) === 'Float32Array') return;
  throw new ValtoError('ERR_VALTO_ARGUMENT', `The ${what} must be an Int16Array or a Float32Array`);
}

function checkFrame(frame, frameSize, what) {
  checkSamples(frame, what);
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
      if (typeof opened === 'number') throw openError(opened, checked, native.lastError());
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
    #limit = Infinity;
    #bypass = false;
    #blocks = null;
    #flushed = false;

    constructor(options) {
      super(native.openNc, options);
      this.latency = native.latency(handleOf(this));
      try {
        const { attenuationLimit = Infinity, bypass = false, voice = false } = options;
        this.attenuationLimit = attenuationLimit;
        this.bypass = bypass;
        this.#hearVoice(checkVoice(voice));
      } catch (error) {
        this.close();
        throw error;
      }
      Object.freeze(this);
    }

    #hearVoice(voice) {
      if (voice === false) return;
      const model = voice === true ? null : voice;
      const status = native.enableVoice(handleOf(this), model);
      if (status !== 0) throw openError(status, { ...this, model }, native.lastError());
    }

    get attenuationLimit() {
      return this.#limit;
    }

    set attenuationLimit(limitDb) {
      native.setAttenuationLimit(handleOf(this), checkLimit(limitDb));
      this.#limit = limitDb;
    }

    get bypass() {
      return this.#bypass;
    }

    set bypass(on) {
      native.setBypass(handleOf(this), Boolean(on));
      this.#bypass = Boolean(on);
    }

    get voiceScore() {
      return native.voiceScore(handleOf(this));
    }

    get noiseLevel() {
      return native.noiseLevel(handleOf(this));
    }

    process(frame, output = frame) {
      const handle = handleOf(this);
      checkFrame(frame, this.frameSize, 'frame');
      if (output !== frame) {
        checkFrame(output, this.frameSize, 'output');
        if (kindOf(output) !== kindOf(frame)) {
          throw new ValtoError('ERR_VALTO_ARGUMENT', 'Frame and output must be of one kind');
        }
      }
      const code = native.processNc(handle, frame, output);
      if (code !== 0) throw failed(code);
      return output;
    }

    push(block) {
      handleOf(this);
      checkSamples(block, 'block');
      if (this.#flushed) {
        throw new ValtoError('ERR_VALTO_CLOSED', 'The sound was flushed; the next needs a session');
      }
      this.#blocks ??= new Blocks(
        kindOf(block) === 'Int16Array'
          ? new Int16Array(this.frameSize)
          : new Float32Array(this.frameSize),
        this.latency,
        (frame) => this.process(frame),
      );
      if (!this.#blocks.takes(block)) {
        throw new ValtoError('ERR_VALTO_ARGUMENT', 'The blocks of a sound must be of one kind');
      }
      return this.#blocks.push(block);
    }

    flush() {
      handleOf(this);
      this.#flushed = true;
      const blocks = this.#blocks;
      this.#blocks = null;
      return blocks?.flush() ?? new Int16Array(0);
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

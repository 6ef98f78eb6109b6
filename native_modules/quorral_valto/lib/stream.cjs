'use strict';
// A noise canceller for pipelines: raw samples in, raw samples out, as bytes.

const { Transform } = require('node:stream');
const { ValtoError } = require('./errors.cjs');

const FORMATS = { s16le: Int16Array, f32le: Float32Array };
const MOST_CHANNELS = 16;

function createStreamClass(NoiseCanceller) {
  return class NoiseCancellerStream extends Transform {
    #Samples;
    #cancellers = [];
    #rest = Buffer.alloc(0);

    constructor(options) {
      const {
        channels = 1,
        format = 's16le',
        frameMs = 10,
        highWaterMark,
        ...others
      } = options ?? {};
      super({ highWaterMark });
      if (!Object.hasOwn(FORMATS, format)) {
        const names = Object.keys(FORMATS).join(' or ');
        throw new ValtoError('ERR_VALTO_ARGUMENT', `format is ${names}, not ${String(format)}`);
      }
      if (!Number.isInteger(channels) || channels < 1 || channels > MOST_CHANNELS) {
        throw new ValtoError('ERR_VALTO_ARGUMENT', `channels is 1 to ${MOST_CHANNELS}`);
      }
      this.#Samples = FORMATS[format];
      try {
        for (let c = 0; c < channels; ++c) {
          this.#cancellers.push(new NoiseCanceller({ ...others, frameMs }));
        }
      } catch (error) {
        this.#close();
        throw error;
      }
      this.cancellers = Object.freeze([...this.#cancellers]);
    }

    _transform(chunk, _encoding, done) {
      this.#answer(done, () => {
        const bytes = this.#rest.length > 0 ? Buffer.concat([this.#rest, chunk]) : chunk;
        const step = this.#Samples.BYTES_PER_ELEMENT * this.#cancellers.length;
        const whole = bytes.length - (bytes.length % step);
        this.#rest = Buffer.from(bytes.subarray(whole));
        const parts = this.#apart(bytes.subarray(0, whole));
        return this.#together(parts.map((part, c) => this.#cancellers[c].push(part)));
      });
    }

    _flush(done) {
      this.#answer(done, () => {
        return this.#together(this.#cancellers.map((canceller) => canceller.flush()));
      });
    }

    _destroy(error, done) {
      this.#close();
      done(error);
    }

    #close() {
      for (const canceller of this.#cancellers) canceller.close();
    }

    #answer(done, work) {
      let bytes;
      try {
        bytes = work();
      } catch (error) {
        done(error);
        return;
      }
      done(null, bytes.length > 0 ? bytes : undefined);
    }

    // The channels of interleaved samples.
    #apart(bytes) {
      const aligned = new Uint8Array(bytes); // typed arrays of samples want an even place
      const samples = new this.#Samples(aligned.buffer);
      const count = this.#cancellers.length;
      if (count === 1) return [samples];
      return this.#cancellers.map((_, c) => {
        return new this.#Samples(samples.length / count).map((_, i) => samples[i * count + c]);
      });
    }

    #together(channels) {
      let all = channels[0];
      if (channels.length > 1) {
        all = new this.#Samples(all.length * channels.length);
        channels.forEach((channel, c) => {
          channel.forEach((sample, i) => {
            all[i * channels.length + c] = sample;
          });
        });
      }
      return Buffer.from(all.buffer, all.byteOffset, all.byteLength);
    }
  };
}

module.exports = { createStreamClass };

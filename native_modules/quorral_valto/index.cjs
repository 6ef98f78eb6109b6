'use strict';
// The package's one entry: raw functions, friendly functions, session classes, error class.

const { load } = require('./lib/binary.cjs');
const { ValtoError } = require('./lib/errors.cjs');
const { createModelFunctions } = require('./lib/models.cjs');
const { createSessionClasses, FRAME_DURATIONS, SAMPLE_RATES } = require('./lib/sessions.cjs');
const { createStreamClass } = require('./lib/stream.cjs');

const binary = load();
const { NoiseCanceller, VoiceActivityDetector } = createSessionClasses(binary.sessions);

module.exports = {
  raw: binary.raw,
  ...createModelFunctions(binary),
  NoiseCanceller,
  VoiceActivityDetector,
  NoiseCancellerStream: createStreamClass(NoiseCanceller),
  ValtoError,
  SAMPLE_RATES,
  FRAME_DURATIONS,
};

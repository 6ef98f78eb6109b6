'use strict';
// The package's one entry: raw functions, friendly functions, session classes, error class.

const { load } = require('./lib/binary.cjs');
const { ValtoError } = require('./lib/errors.cjs');
const { createModelFunctions } = require('./lib/models.cjs');
const { createSessionClasses, FRAME_DURATIONS, SAMPLE_RATES } = require('./lib/sessions.cjs');

const binary = load();

module.exports = {
  raw: binary.raw,
  ...createModelFunctions(binary),
  ...createSessionClasses(binary.sessions),
  ValtoError,
  SAMPLE_RATES,
  FRAME_DURATIONS,
};

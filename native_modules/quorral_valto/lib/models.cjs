'use strict';
// Start-up and model choice over the five raw functions.

const fs = require('node:fs');
const path = require('node:path');
const { createDiagnostics } = require('./diagnostics.cjs');
const { ValtoError } = require('./errors.cjs');

// Start-up codes from here down name the weight file that could not be registered.
const FIRST_WEIGHT = -5;

function startupError(nativeCode, directory, weightFiles) {
  const fail = (code, message) => new ValtoError(code, message, { nativeCode });
  if (nativeCode === -1) return fail('ERR_VALTO_CPU', 'The processor does not support SSE 4.1');
  if (nativeCode === -2) return fail('ERR_VALTO_CPU', 'The processor does not support AVX2');
  const weight = weightFiles[FIRST_WEIGHT - nativeCode];
  if (weight === undefined) return fail('ERR_VALTO_ENGINE', 'The engine could not be created');
  const file = path.join(directory, weight);
  if (process.platform !== 'win32' && /[\u{10000}-\u{10FFFF}]/u.test(directory)) {
    return fail(
      'ERR_VALTO_PATH',
      `The install path holds a character outside the Basic Multilingual Plane (an emoji?), ` +
        `which the engine cannot open files under: ${directory}`,
    );
  }
  if (!fs.existsSync(file)) {
    return fail('ERR_VALTO_WEIGHT_MISSING', `The weight file is missing: ${file}`);
  }
  return fail('ERR_VALTO_WEIGHT_INVALID', `The weight file cannot be used: ${file}`);
}

function createModelFunctions({ raw, sessions, directory }) {
  const choose = (setter, name) => {
    try {
      setter(name);
    } catch (cause) {
      throw new ValtoError('ERR_VALTO_MODEL', `${cause.message}: ${JSON.stringify(name)}`, {
        cause,
      });
    }
  };
  const requireString = (name, allowed) => {
    if (typeof name !== 'string') {
      throw new ValtoError('ERR_VALTO_ARGUMENT', `A model is ${allowed}, not ${typeof name}`);
    }
  };

  const takeDiagnostics = createDiagnostics(sessions);
  let silenced = false;

  return {
    initialize({ onDiagnostic } = {}) {
      if (onDiagnostic != null && typeof onDiagnostic !== 'function') {
        throw new ValtoError('ERR_VALTO_ARGUMENT', 'onDiagnostic must be a function or null');
      }
      if (!silenced || onDiagnostic !== undefined) takeDiagnostics(onDiagnostic ?? null);
      silenced = true;
      const code = sessions.initialize();
      if (code !== 0) throw startupError(code, directory, sessions.weightFiles);
    },
    getNcModels: () => new Promise((resolve) => raw._getNcModels(resolve)),
    getVadModels: () => new Promise((resolve) => raw._getVadModels(resolve)),
    setNcModel(name) {
      if (name !== null) requireString(name, 'a string or null');
      choose(raw.setNcModel, name);
    },
    setVadModel(name) {
      requireString(name, 'a string');
      choose(raw.setVadModel, name);
    },
  };
}

module.exports = { createModelFunctions };

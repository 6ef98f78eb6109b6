'use strict';
// The package's one error class. `code` is stable and meant for programs, `message` for people.

class ValtoError extends Error {
  /**
   * @param {string} code
   * @param {string} message
   * @param {{ cause?: unknown, nativeCode?: number }} [details]
   */
  constructor(code, message, details = {}) {
    super(message, 'cause' in details ? { cause: details.cause } : undefined);
    this.name = 'ValtoError';
    this.code = code;
    if (details.nativeCode !== undefined) this.nativeCode = details.nativeCode;
  }
}

module.exports = { ValtoError };

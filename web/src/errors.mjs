/** What went wrong; `code` is for programs. */
export class MorvaError extends Error {
  name = 'MorvaError';

  constructor(code, message) {
    super(message);
    this.code = code;
  }
}

// The smallest modules with a vector instruction and with an exception handler.
const PROBES = [
  '0061736d010000000105016000017b030201000a0a0108004100fd0ffd620b',
  '0061736d01000000010401600000030201000a080106000640190b0b',
];

const bytesOf = (digits) =>
  Uint8Array.from(digits.match(/../g), (byte) => Number.parseInt(byte, 16));

/** Throws the one error for a browser that cannot run the engine. */
export function requireSupport(assembly = globalThis.WebAssembly) {
  if (PROBES.every((digits) => assembly?.validate(bytesOf(digits)))) return;
  throw new MorvaError(
    'ERR_MORVA_UNSUPPORTED',
    'This browser lacks the vector or exception instructions of WebAssembly: ' +
      'Chrome 95, Firefox 100 and Safari 16.4 are the first to have both.',
  );
}

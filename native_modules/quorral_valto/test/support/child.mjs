// Runs a piece of script in a process of its own and says how it ended.
import assert from 'node:assert/strict';
import { spawn } from 'node:child_process';
import { once } from 'node:events';
import { binaryFile, bindingPath, enginePath, failingPath, packageDir } from './package.mjs';

const TIMEOUT_MS = 120_000;

// What every child finds defined: the package, the raw module's file, the test modules, workers that
// start with the same names.
const PRELUDE = `
const { Worker, isMainThread, parentPort, workerData } = require('node:worker_threads');
const { once } = require('node:events');
const { setTimeout: sleep } = require('node:timers/promises');
const BINARY = ${JSON.stringify(binaryFile)};
const PACKAGE = ${JSON.stringify(packageDir)};
const ENGINE = ${JSON.stringify(enginePath)};
const BINDING = ${JSON.stringify(bindingPath)};
const FAILING = ${JSON.stringify(failingPath)};
const loadRaw = () => require(BINARY);
const loadEngine = () => { const e = require(ENGINE); e.attach(BINARY); return e; };
const again = (file) => { const m = { exports: {} }; process.dlopen(m, file); return m.exports; };
const startWorker = (code, options = {}) => new Worker(PRELUDE + code, { eval: true, ...options });
`;
const WITH_WORKERS = `const PRELUDE = ${JSON.stringify(PRELUDE)} + 'const PRELUDE = "";';\n`;

/** { code, signal, stdout, stderr } of the script. */
export async function runChild(script, { execArgv = [], env = {} } = {}) {
  const child = spawn(
    process.execPath,
    [...execArgv, '-e', `'use strict';${WITH_WORKERS}${PRELUDE}${script}`],
    { env: { ...process.env, ...env }, stdio: ['ignore', 'pipe', 'pipe'], timeout: TIMEOUT_MS },
  );
  const output = { stdout: '', stderr: '' };
  for (const name of ['stdout', 'stderr']) {
    child[name].setEncoding('utf8').on('data', (text) => {
      output[name] += text;
    });
  }
  const [code, signal] = await once(child, 'close');
  return { code, signal, ...output };
}

// Lines that the engine itself prints while it registers weight files.
const REGISTRATION =
  /^(WEIGHT |WARNING weight isn't loaded| weigth file:|Warning Weight name|ERROR )/;

/** Runs the script and expects a clean end; its output without the engine's registration lines. */
export async function runClean(script, options) {
  const result = await runChild(script, options);
  result.stdout = result.stdout
    .split('\n')
    .filter((line) => !REGISTRATION.test(line))
    .join('\n');
  assert.deepEqual(
    { code: result.code, signal: result.signal },
    { code: 0, signal: null },
    `${result.stdout}\n${result.stderr}`,
  );
  assert.doesNotMatch(result.stderr, /Sanitizer|runtime error/);
  return result;
}

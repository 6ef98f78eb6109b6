// Where the package under test and the probe lie, copies for tests that damage them, and scripts that run
// in a process of their own.
import assert from 'node:assert/strict';
import { spawn } from 'node:child_process';
import { once } from 'node:events';
import fs from 'node:fs';
import { createRequire } from 'node:module';
import os from 'node:os';
import path from 'node:path';
import { fileURLToPath } from 'node:url';

export const require = createRequire(import.meta.url);
export const packageDir = fileURLToPath(new URL('../..', import.meta.url));
export const repository = path.join(packageDir, '../..');

const build = path.join(repository, 'build/release');
const target = `${process.platform}-${process.arch}`;
export const packagedFile = path.join('prebuilds', `quorral_valto.${target}.node`);
const packaged = path.join(packageDir, packagedFile);
const built = path.join(build, 'quorral_valto/quorral_valto.node');
export const binaryFile = fs.existsSync(packaged) ? packaged : built;
const binaryDir = path.dirname(binaryFile);
const addons = process.env.QUORRAL_VALTO_TEST_ADDONS ?? path.join(build, 'test_addons');
export const probePath = path.join(addons, 'probe.node');

export const underSanitizer = (process.env.LD_PRELOAD ?? '').includes('asan');

const shipped = require('../../../../models/shipped.json');
const namesOf = (wanted) => shipped.filter(({ kind }) => kind === wanted).map(({ name }) => name);
export const NC_MODELS = namesOf('NC');
export const VAD_MODELS = namesOf('VAD');
export const WEIGHTS = shipped.filter(({ kind }) => kind !== 'NoiseDB').map(({ file }) => file);

/** A fresh folder that is removed when the test ends. */
export function temporaryFolder(t) {
  const folder = fs.mkdtempSync(path.join(os.tmpdir(), 'quorral-'));
  t.after(() => fs.rmSync(folder, { recursive: true, force: true }));
  return folder;
}

/** A copy of the whole package, as it would lie in another node_modules; its weights are links. */
export function copyPackage(t, name = 'copy') {
  const folder = path.join(temporaryFolder(t), name, 'quorral_valto');
  for (const entry of ['package.json', 'index.cjs', 'index.mjs', 'lib']) {
    fs.cpSync(path.join(packageDir, entry), path.join(folder, entry), { recursive: true });
  }
  const prebuilds = path.join(folder, 'prebuilds');
  fs.mkdirSync(prebuilds);
  fs.cpSync(binaryFile, path.join(folder, packagedFile));
  for (const file of WEIGHTS)
    fs.symlinkSync(path.join(binaryDir, file), path.join(prebuilds, file));
  return folder;
}

// What every child finds defined, and every worker of it.
const PRELUDE = `
const { Worker, parentPort, workerData } = require('node:worker_threads');
const { once } = require('node:events');
const { setTimeout: sleep } = require('node:timers/promises');
const BINARY = ${JSON.stringify(binaryFile)};
const PACKAGE = ${JSON.stringify(packageDir)};
const loadRaw = () => require(BINARY);
const loadProbe = () => require(${JSON.stringify(probePath)});
const startWorker = (code, options = {}) => new Worker(PRELUDE + code, { eval: true, ...options });
`;
const WITH_WORKERS = `const PRELUDE = ${JSON.stringify(PRELUDE)} + 'const PRELUDE = "";';\n`;

// Lines that the engine itself prints while it registers weight files.
const REGISTRATION =
  /^(WEIGHT |WARNING weight isn't loaded| weigth file:|Warning Weight name|ERROR )/;

/** { stdout, stderr } of a script that is expected to end well; no registration lines. */
export async function run(script, { execArgv = [], env = {} } = {}) {
  const child = spawn(
    process.execPath,
    ['--expose-gc', ...execArgv, '-e', `'use strict';${WITH_WORKERS}${PRELUDE}${script}`],
    { env: { ...process.env, ...env }, stdio: ['ignore', 'pipe', 'pipe'], timeout: 120_000 },
  );
  const output = { stdout: '', stderr: '' };
  for (const name of ['stdout', 'stderr']) {
    child[name].setEncoding('utf8').on('data', (text) => {
      output[name] += text;
    });
  }
  const ended = await once(child, 'close');
  assert.deepEqual(ended, [0, null], `${output.stdout}\n${output.stderr}`);
  assert.doesNotMatch(output.stderr, /Sanitizer|runtime error/);
  const lines = output.stdout.split('\n').filter((line) => !REGISTRATION.test(line));
  return { ...output, stdout: lines.join('\n') };
}

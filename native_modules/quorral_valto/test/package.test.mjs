// The package as its users find it: exports, loader, start-up and what fails in it, the example.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import fs from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import * as imported from 'quorral_valto';
import {
  binaryFile,
  copyPackage,
  NC_MODELS,
  packagedFile,
  repository,
  require,
  run,
  temporaryFolder,
  WEIGHTS,
} from './support/package.mjs';

const required = require('quorral_valto');

test('import and require give the same objects, the file its symbols and no more', () => {
  assert.deepEqual(Object.keys(imported).sort(), Object.keys(required).sort());
  for (const [name, value] of Object.entries(imported)) assert.equal(required[name], value);
  assert.equal(required.raw, require(binaryFile));
  const show = (...command) => execFileSync(command[0], command.slice(1), { encoding: 'utf8' });
  const symbols = show('nm', '-D', '--defined-only', binaryFile).match(/\S+$/gm).sort();
  const sides = ['NC', 'VAD'].flatMap((side) => {
    return ['Process', 'Reset', 'Setup'].map((each) => `Valto${side}${each}`);
  });
  const registration = ['napi_register_module_v1', 'node_api_module_get_api_version_v1'];
  assert.deepEqual(symbols, [...sides, ...registration]);
  const dynamic = show('readelf', '-d', binaryFile);
  const allowed = /^(lib(c|m|dl|pthread|stdc\+\+|gcc_s|resample|asan|ubsan)\.so|ld-linux)/;
  for (const [, name] of dynamic.matchAll(/NEEDED.*\[(.*)\]/g)) assert.match(name, allowed);
  assert.match(dynamic, /NODELETE/);
});

/** What scripts report that require the packages in these folders, one after the other in one process. */
async function reports(folders, use, prelude = '') {
  const { stdout } = await run(
    `${prelude} (async () => {
       for (const folder of JSON.parse(process.env.FOLDERS)) {
         try {
           const valto = require(folder);
           console.log(JSON.stringify(await (${use})(valto)));
         } catch ({ code, nativeCode, message }) {
           console.log(JSON.stringify({ code, nativeCode, message }));
         }
       }
     })();`,
    { env: { FOLDERS: JSON.stringify(folders) } },
  );
  return stdout.trim().split('\n');
}

test('start-up: install paths, weight files that cannot be read or used', async (t) => {
  const within = (folder, file = '') => path.join(folder, 'prebuilds', file);
  const failed = (code) => `Failed to setup Valto module, error code: ${code}`;
  const cases = []; // [folder, lines told, what initialize() throws, models]
  const fine = ['with space', 'J\u00fcrgen \u4f60\u597d', 'a%20b#c?d'];
  for (const name of [...fine, Array(3).fill('d'.repeat(200)).join('/')]) {
    cases.push([copyPackage(t, name), [], null, NC_MODELS]);
  }
  const fails = (folder, code, index) => {
    const line = `Failed to load Morva weight file: ./${WEIGHTS[index]} with working directory: `;
    const error = { code, nativeCode: -5 - index };
    cases.push([folder, [line + within(folder)], error, NC_MODELS.slice(0, index)]);
  };
  for (const [index, weight] of WEIGHTS.entries()) {
    const folder = copyPackage(t);
    fs.rmSync(within(folder, weight));
    if (index === 1) fs.symlinkSync('nowhere', within(folder, weight));
    if (index === 2) fs.mkdirSync(within(folder, weight));
    fails(folder, `ERR_VALTO_WEIGHT_${index === 2 ? 'INVALID' : 'MISSING'}`, index);
  }
  fails(copyPackage(t, '\u{1f680}'), 'ERR_VALTO_PATH', 0);
  const use = `async ({ initialize, getNcModels, raw }) => {
    const told = [];
    const onDiagnostic = (text, stream) => stream === 'stdout' && told.push(text);
    const attempt = (start) => {
      try { start({ onDiagnostic }); return null; } catch (error) { return error; }
    };
    const start = () => raw._initialize();
    const [first, second, third] = [initialize, initialize, start].map(attempt);
    const models = await getNcModels();
    await sleep(0);
    if (first?.message !== second?.message) throw new Error('a second attempt names another cause');
    return [first?.code, first?.nativeCode, third.message, models, told.filter((line) => /^Fail/.test(line))];
  }`;
  const expected = cases.map(([, printed, error, models]) => {
    const { code = null, nativeCode = null } = error ?? {};
    const lines = [...printed, 'Faild to initialize Morva SDK'];
    return JSON.stringify([code, nativeCode, failed(-4), models, lines]);
  });
  const folders = cases.map(([folder]) => folder);
  assert.deepEqual(await reports(folders, use), expected);
});

test('a failed load names platform, tried paths and remedy', async (t) => {
  const expectFailure = async (folder, parts, prelude) => {
    const { code, message } = JSON.parse(await reports([folder], '() => null', prelude));
    assert.equal(code, 'ERR_VALTO_LOAD');
    for (const part of parts) assert.ok(message.includes(part), message);
  };
  const folder = copyPackage(t);
  const file = path.join(folder, packagedFile);
  const windows = "Object.defineProperty(process, 'platform', { value: 'win32' });";
  await expectFailure(folder, ['win32-x64', 'has binaries for linux-x64 only'], windows);
  // A file of the host application's own that the loader has no business with.
  const foreign = path.join(folder, '../../build/release/quorral_valto');
  fs.mkdirSync(path.dirname(foreign), { recursive: true });
  fs.renameSync(path.dirname(file), foreign);
  await expectFailure(folder, ['linux-x64', file, 'no such file']);
  fs.cpSync(path.join(folder, 'package.json'), file);
  await expectFailure(folder, [file, 'Reinstall']);

  const archived = copyPackage(t, 'app.asar/node_modules');
  await expectFailure(archived, ['app.asar.unpacked', 'keep the folder "prebuilds"']);
  // What a packager leaves: scripts in the archive, native files outside of it.
  const outside = path.join(archived.replace('app.asar', 'app.asar.unpacked'), 'prebuilds');
  fs.mkdirSync(path.dirname(outside), { recursive: true });
  fs.renameSync(path.join(archived, 'prebuilds'), outside);
  assert.deepEqual(await reports([archived], '(valto) => valto.getNcModels()'), ['[]']);
});

test('the example cleans each channel, in step with the original', (t) => {
  const cwd = temporaryFolder(t);
  const call = (...command) =>
    execFileSync(command[0], command.slice(1), {
      cwd,
      stdio: 'pipe',
      maxBuffer: 1e7,
      // A sanitizer that is preloaded is for the module alone.
      env: command[0] === process.execPath ? process.env : { PATH: process.env.PATH },
    });
  const recording = path.join(repository, 'examples/audio/noisy.flac');
  call('sox', recording, '-b', '16', 'noisy.wav', 'remix', '1', '0'); // silence on the right
  const program = path.join(repository, 'examples/node/denoise.mjs');
  call(process.execPath, program, 'noisy.wav', 'clean.wav');
  const samplesOf = (name) =>
    new Int16Array(new Uint8Array(call('sox', name, '-t', 'raw', '-')).buffer);
  const [noisy, clean] = ['noisy.wav', 'clean.wav'].map(samplesOf);
  assert.equal(clean.length, noisy.length);
  assert.ok(clean.every((sample, i) => i % 2 === 0 || sample === 0));
  const energy = (samples) => samples.reduce((sum, sample) => sum + sample ** 2, 0);
  assert.ok(energy(clean) < 0.9 * energy(noisy));
  const rest = clean.map((sample, i) => noisy[i] - sample);
  assert.ok(energy(rest) < 0.5 * energy(noisy));
});

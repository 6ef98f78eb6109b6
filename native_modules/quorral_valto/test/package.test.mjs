// The package as its users find it: exports, loader, start-up and what fails in it, the example.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import {
  cpSync,
  mkdirSync,
  readFileSync,
  renameSync,
  rmSync,
  symlinkSync,
  writeFileSync,
} from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import * as imported from 'quorral_valto';
import {
  binaryFile,
  copyBinary,
  copyPackage,
  NC_MODELS,
  repository,
  require,
  run,
  temporaryFolder,
  VAD_MODELS,
  WEIGHTS,
} from './support/package.mjs';

const required = require('quorral_valto');
const coded = (code) => (error) => error instanceof required.ValtoError && error.code === code;

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
  const needed = [...dynamic.matchAll(/NEEDED.*\[(.*)\]/g)].map((match) => match[1]);
  const allowed = /^(lib(c|m|dl|pthread|stdc\+\+|gcc_s|resample|asan|ubsan)\.so|ld-linux)/;
  assert.deepEqual(
    needed.filter((name) => !allowed.test(name)),
    [],
  );
  assert.match(dynamic, /NODELETE/);
});

test('friendly functions', async () => {
  const { initialize, raw, getNcModels, getVadModels, setNcModel, setVadModel } = required;
  assert.deepEqual(await getNcModels(), []);
  initialize();
  assert.throws(() => raw._initialize(), { message: /error code: -4$/ });
  initialize();
  assert.deepEqual(await getNcModels(), NC_MODELS);
  assert.deepEqual(await getVadModels(), VAD_MODELS);
  setNcModel(NC_MODELS[0]);
  setNcModel(null);
  setVadModel(VAD_MODELS[0]);
  for (const set of [setNcModel, setVadModel]) {
    assert.throws(() => set('nobody'), coded('ERR_VALTO_MODEL'));
    for (const other of [undefined, 5, {}]) {
      assert.throws(() => set(other), coded('ERR_VALTO_ARGUMENT'));
    }
  }
  assert.throws(() => setVadModel(null), coded('ERR_VALTO_ARGUMENT'));
  const { stdout } = await run(`
    loadRaw()._initialize();
    require(PACKAGE).initialize();
    startWorker("require(PACKAGE).initialize(); parentPort.postMessage('up');").on('message', console.log);`);
  assert.equal(stdout, 'up\n');
});

test('start-up of the raw module: install paths and weight files that cannot be read', async (t) => {
  // Each copy has an engine of its own, so one process can try them all.
  const failed = (code) => `Failed to setup Valto module, error code: ${code}`;
  const missing = (weight, module) =>
    `Failed to load Morva weight file: ./${weight} with working directory: ${path.dirname(module)}`;
  const fine = ['with space', 'J\u00fcrgen \u4f60\u597d', 'a%20b#c?d', "it's", '\uff21\ufffd'];
  const cases = [...fine, Array(3).fill('d'.repeat(200)).join('/')].map((name) => {
    return [copyBinary(t, name), ['started'], NC_MODELS, VAD_MODELS];
  });
  const beyond = copyBinary(t, 'smile \u{1f600}');
  cases.push([beyond, [missing(WEIGHTS[0], beyond), failed(-5)], [], []]);
  const damages = [() => {}, (file) => mkdirSync(file), (file) => symlinkSync('nowhere', file)];
  for (const [index, weight] of WEIGHTS.entries()) {
    const module = copyBinary(t);
    const file = path.join(path.dirname(module), weight);
    rmSync(file);
    damages[index % damages.length](file);
    const lines = [missing(weight, module), failed(-5 - index)];
    cases.push([module, lines, NC_MODELS.slice(0, index), []]);
  }
  const { stdout } = await run(
    `(async () => {
       for (const file of JSON.parse(process.env.FILES)) {
         const raw = require(file);
         for (let i = 0; i < 2; ++i) {
           try { raw._initialize(); console.log('started'); } catch (error) { console.log(error.message); }
         }
         for (const list of [raw._getNcModels, raw._getVadModels]) {
           console.log(JSON.stringify(await new Promise((resolve) => list(resolve))));
         }
       }
     })();`,
    { env: { FILES: JSON.stringify(cases.map(([module]) => module)) } },
  );
  const second = ['Faild to initialize Morva SDK', failed(-4)];
  const expected = cases.flatMap(([, lines, ...lists]) => {
    return [...lines, ...second, ...lists.map((list) => JSON.stringify(list))];
  });
  assert.deepEqual(stdout.trim().split('\n'), expected);
});

/** What a script that requires the package in a folder reports: [code, native code, message]. */
async function report(folder, use, prelude = '') {
  const { stdout } = await run(
    `${prelude} try { const valto = require(process.env.MODULE); ${use}; console.log('["fine"]'); } catch (e) {
      console.log(JSON.stringify([e.code, e.nativeCode, e.message]));
    }`,
    { env: { MODULE: folder } },
  );
  return JSON.parse(stdout.trim().split('\n').at(-1));
}

test('a failed start names its cause', async (t) => {
  const start = 'try { valto.initialize() } catch { valto.initialize() }'; // the second says it, too
  const folder = copyPackage(t);
  const place = (weight) => path.join(folder, 'prebuilds/linux-x64', weight);
  for (const [index, weight] of WEIGHTS.entries()) {
    renameSync(place(weight), place('elsewhere'));
    const [code, nativeCode, message] = await report(folder, start);
    assert.deepEqual([code, nativeCode], ['ERR_VALTO_WEIGHT_MISSING', -5 - index]);
    assert.ok(message.includes(weight));
    renameSync(place('elsewhere'), place(weight));
  }
  rmSync(place(WEIGHTS[2]));
  for (const content of ['', 'RIFF this is no weight file', readFileSync(binaryFile)]) {
    writeFileSync(place(WEIGHTS[2]), content);
    const open = 'new valto.NoiseCanceller({ sampleRate: 48000, frameMs: 10 })';
    assert.equal((await report(folder, `valto.initialize(); ${open}`))[0], 'ERR_VALTO_SESSION');
  }
  rmSync(place(WEIGHTS[2]));
  mkdirSync(place(WEIGHTS[2]));
  assert.deepEqual((await report(folder, start)).slice(0, 2), ['ERR_VALTO_WEIGHT_INVALID', -7]);
  const beyond = await report(copyPackage(t, '\u{1f680}'), start);
  assert.deepEqual(beyond.slice(0, 2), ['ERR_VALTO_PATH', -5]);
});

test('a failed load names platform, tried paths and remedy', async (t) => {
  const expectFailure = async (folder, parts, prelude) => {
    const [code, , message] = await report(folder, '', prelude);
    assert.equal(code, 'ERR_VALTO_LOAD');
    for (const part of parts) assert.ok(message.includes(part), message);
  };
  const folder = copyPackage(t);
  const file = path.join(folder, 'prebuilds/linux-x64/quorral_valto.node');
  const windows = "Object.defineProperty(process, 'platform', { value: 'win32' });";
  await expectFailure(folder, ['win32-x64', 'Only linux-x64'], windows);
  // A file of the host application's own that the loader has no business with.
  const foreign = path.join(folder, '../../build/release/quorral_valto');
  mkdirSync(path.dirname(foreign), { recursive: true });
  renameSync(path.dirname(file), foreign);
  await expectFailure(folder, ['linux-x64', file, 'no such file']);
  cpSync(path.join(folder, 'package.json'), file);
  await expectFailure(folder, [file, 'Reinstall']);
});

test('inside an archive only what lies unpacked beside it is loaded', async (t) => {
  const folder = copyPackage(t, 'app.asar/node_modules');
  const [code, , message] = await report(folder, '');
  assert.equal(code, 'ERR_VALTO_LOAD');
  for (const part of ['app.asar.unpacked', 'keep the folder "prebuilds"']) {
    assert.ok(message.includes(part), message);
  }
  // What a packager leaves: scripts in the archive, native files outside of it.
  const outside = path.join(folder.replace('app.asar', 'app.asar.unpacked'), 'prebuilds');
  mkdirSync(path.dirname(outside), { recursive: true });
  renameSync(path.join(folder, 'prebuilds'), outside);
  assert.deepEqual(await report(folder, 'valto.initialize()'), ['fine']);
});

test('the example cleans each channel, in step with the original', (t) => {
  const cwd = temporaryFolder(t);
  const sox = (...args) => execFileSync('sox', args, { cwd, env: { PATH: process.env.PATH } });
  const recording = path.join(repository, 'examples/audio/noisy.flac');
  sox(recording, '-b', '16', 'noisy.wav', 'remix', '1', '0'); // silence on the right
  const program = path.join(repository, 'examples/node/denoise.mjs');
  const example = (...files) =>
    execFileSync(process.execPath, [program, ...files], { cwd, stdio: 'pipe' });
  assert.match(`${example('noisy.wav', 'clean.wav')}`, /clean\.wav: 10\.0 s cleaned/);
  const [noisy, clean] = ['noisy.wav', 'clean.wav'].map((name) => {
    const bytes = readFileSync(path.join(cwd, name));
    return new Int16Array(
      bytes.buffer.slice(bytes.byteOffset + 44, bytes.byteOffset + bytes.length),
    );
  });
  assert.equal(clean.length, noisy.length);
  assert.ok(clean.every((sample, i) => i % 2 === 0 || sample === 0));
  const product = (a, b) => a.reduce((sum, sample, i) => sum + sample * b[i], 0);
  assert.ok(product(clean, noisy) > 0.7 * Math.sqrt(product(clean, clean) * product(noisy, noisy)));
  assert.ok(product(clean, clean) < 0.9 * product(noisy, noisy));
  assert.throws(() => example(program, 'clean.wav'), /no chunk "fmt "/);
});

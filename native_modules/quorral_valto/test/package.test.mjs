// The package as its users see it: import and require, friendly functions, loader failures.
import assert from 'node:assert/strict';
import { mkdirSync, renameSync, rmSync, writeFileSync } from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import * as imported from 'quorral_valto';
import { runClean } from './support/child.mjs';
import {
  binaryFile,
  copyPackage,
  NC_MODELS,
  require,
  VAD_MODELS,
  WEIGHTS,
} from './support/package.mjs';

const required = require('quorral_valto');
const { ValtoError } = required;
const coded = (code) => (error) => error instanceof ValtoError && error.code === code;

test('import and require give the same objects', () => {
  assert.deepEqual(Object.keys(imported).sort(), Object.keys(required).sort());
  for (const [name, value] of Object.entries(imported)) assert.equal(required[name], value);
  assert.equal(required.raw, require(binaryFile));
});

test('friendly functions', async (t) => {
  const { initialize, raw, getNcModels, getVadModels, setNcModel, setVadModel } = required;
  assert.deepEqual(await getNcModels(), []);
  initialize();
  initialize();
  assert.throws(() => raw._initialize(), { message: /error code: -4$/ });
  initialize();
  assert.deepEqual(await getNcModels(), NC_MODELS);
  assert.deepEqual(await getVadModels(), VAD_MODELS);
  setNcModel(NC_MODELS[0]);
  setNcModel(null);
  setVadModel(VAD_MODELS[0]);
  assert.throws(() => setNcModel('nobody'), coded('ERR_VALTO_MODEL'));
  assert.throws(() => setVadModel('nobody'), coded('ERR_VALTO_MODEL'));
  for (const other of [undefined, 5, {}]) {
    assert.throws(() => setNcModel(other), coded('ERR_VALTO_ARGUMENT'));
    assert.throws(() => setVadModel(other), coded('ERR_VALTO_ARGUMENT'));
  }
  assert.throws(() => setVadModel(null), coded('ERR_VALTO_ARGUMENT'));

  await t.test('initialize succeeds where the raw function did, in a worker too', async () => {
    const { stdout } = await runClean(`
      loadRaw()._initialize();
      require(PACKAGE).initialize();
      startWorker("require(PACKAGE).initialize(); parentPort.postMessage('up');").on('message', console.log);`);
    assert.equal(stdout, 'up\n');
  });
});

const START = `
  try { require(process.env.MODULE).initialize(); } catch (error) {
    console.log(JSON.stringify([error.code, error.nativeCode, error.message]));
  }`;
async function startFailure(folder) {
  const { stdout } = await runClean(START + START, { env: { MODULE: folder } });
  const reports = stdout.split('\n').filter((line) => line.startsWith('['));
  assert.equal(reports.length, 2);
  assert.equal(reports[0], reports[1], 'a second attempt names the same cause');
  return JSON.parse(reports[0]);
}

test('a failed start names its cause', async (t) => {
  await t.test('weight missing', async () => {
    for (const [index, weight] of WEIGHTS.entries()) {
      const folder = copyPackage(t);
      rmSync(path.join(folder, 'prebuilds/linux-x64', weight));
      const [code, nativeCode, message] = await startFailure(folder);
      assert.deepEqual([code, nativeCode], ['ERR_VALTO_WEIGHT_MISSING', -5 - index]);
      assert.ok(message.includes(weight));
    }
  });
  await t.test('weight not readable', async () => {
    const folder = copyPackage(t);
    const file = path.join(folder, 'prebuilds/linux-x64', WEIGHTS[2]);
    rmSync(file);
    mkdirSync(file);
    const [code, nativeCode, message] = await startFailure(folder);
    assert.deepEqual([code, nativeCode], ['ERR_VALTO_WEIGHT_INVALID', -7]);
    assert.ok(message.includes(WEIGHTS[2]));
  });
  await t.test('weight with damaged content: its sessions do not open', async () => {
    const folder = copyPackage(t);
    writeFileSync(path.join(folder, 'prebuilds/linux-x64', WEIGHTS[2]), 'nonsense');
    const { stdout } = await runClean(
      `const { initialize, NoiseCanceller } = require(process.env.MODULE);
       initialize();
       for (const sampleRate of [16000, 48000]) {
         try { new NoiseCanceller({ sampleRate, frameMs: 10 }); console.log('open'); } catch (error) {
           console.log(error.code);
         }
       }`,
      { env: { MODULE: folder } },
    );
    assert.deepEqual(stdout.match(/^(open|ERR_.*)$/gm), ['open', 'ERR_VALTO_SESSION']);
  });
  await t.test('a path that the engine cannot express', async () => {
    const [code, nativeCode, message] = await startFailure(copyPackage(t, '\u{1f680}'));
    assert.deepEqual([code, nativeCode], ['ERR_VALTO_PATH', -5]);
    assert.ok(message.includes('\u{1f680}'));
  });
});

const LOAD = `
  try { require(process.env.MODULE); console.log('loaded'); } catch (error) {
    console.log(JSON.stringify([error.name, error.code, error.message]));
  }`;
async function loadFailure(folder, prelude = '') {
  const { stdout } = await runClean(prelude + LOAD, { env: { MODULE: folder } });
  const [name, code, message] = JSON.parse(stdout);
  assert.deepEqual([name, code], ['ValtoError', 'ERR_VALTO_LOAD']);
  return message;
}

test('a failed load names platform, tried paths and remedy', async (t) => {
  const folder = copyPackage(t);
  const file = path.join(folder, 'prebuilds/linux-x64/quorral_valto.node');

  await t.test('damaged binary', async () => {
    writeFileSync(file, 'not a module');
    const message = await loadFailure(folder);
    for (const part of ['linux-x64', file, 'Reinstall']) assert.ok(message.includes(part), message);
  });
  await t.test('no binary', async () => {
    rmSync(file);
    const message = await loadFailure(folder);
    for (const part of ['linux-x64', file, 'no such file'])
      assert.ok(message.includes(part), message);
  });
  await t.test('another platform', async () => {
    const message = await loadFailure(
      folder,
      "Object.defineProperty(process, 'platform', { value: 'win32' });",
    );
    assert.match(message, /win32-x64/);
    assert.match(message, /Only linux-x64/);
  });
});

test('inside an archive the unpacked copy is loaded', async (t) => {
  const folder = copyPackage(t, 'app.asar/node_modules');
  const prebuilds = path.join(folder, 'prebuilds');
  const unpacked = copyPackage(t, 'elsewhere');
  const target = folder.replace('app.asar', 'app.asar.unpacked');
  // What a packager leaves: scripts in the archive, native files outside of it.
  rmSync(prebuilds, { recursive: true });
  rmSync(path.join(unpacked, 'lib'), { recursive: true });
  mkdirSync(path.dirname(target), { recursive: true });
  renameSync(unpacked, target);
  const { stdout } = await runClean(
    `const valto = require(process.env.MODULE); valto.initialize();
     valto.getNcModels().then((names) => console.log(names.length));`,
    { env: { MODULE: folder } },
  );
  assert.equal(stdout, '3\n');
});

test('a native file that stayed inside an archive is not loaded from there', async (t) => {
  const message = await loadFailure(copyPackage(t, 'app.asar/node_modules'));
  for (const part of ['app.asar.unpacked', 'keep the folder "prebuilds"'])
    assert.ok(message.includes(part), message);
});

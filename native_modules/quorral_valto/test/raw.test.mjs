// The five raw properties: arguments, errors, delivery, start-up codes.
import assert from 'node:assert/strict';
import { mkdirSync, rmSync, symlinkSync, truncateSync, writeFileSync } from 'node:fs';
import path from 'node:path';
import { test } from 'node:test';
import { runClean } from './support/child.mjs';
import {
  binaryFile,
  copyBinary,
  NC_MODELS,
  require,
  VAD_MODELS,
  WEIGHTS,
} from './support/package.mjs';

const raw = require(binaryFile);
const PROPERTIES = ['_initialize', '_getNcModels', 'setNcModel', '_getVadModels', 'setVadModel'];
const names = (getter) => new Promise((resolve) => getter((...received) => resolve(received)));
const NOTHING = () => {};

test('require gives exactly the five functions', () => {
  assert.deepEqual(Reflect.ownKeys(raw), PROPERTIES);
  for (const name of PROPERTIES) assert.equal(typeof raw[name], 'function');
});

test('arguments are counted and typed', async (t) => {
  const count = (expected, received) =>
    `Invalid argument count: expected ${expected}; received ${received}`;
  const mismatch = 'Invalid argument at index 0: type mismatch';
  const cases = [
    ['_initialize', [1], count(0, 1)],
    ['_initialize', [undefined], count(0, 1)],
    ['_initialize', [1, 2, 3], count(0, 3)],
    ...['_getNcModels', '_getVadModels'].flatMap((name) => [
      [name, [], count(1, 0)],
      [name, [NOTHING, NOTHING], count(1, 2)],
      ...[7, 'f', null, undefined, {}, [], Symbol('s'), 1n].map((x) => [name, [x], mismatch]),
    ]),
    ...['setNcModel', 'setVadModel'].flatMap((name) => [
      [name, [], count(1, 0)],
      [name, ['a', 'b'], count(1, 2)],
    ]),
  ];
  for (const [name, args, message] of cases) {
    await t.test(`${name} with ${args.length} (${args.map((x) => typeof x)})`, () => {
      assert.throws(() => raw[name](...args), { name: 'Error', message });
    });
  }
});

test('a refused call does not initialise', async () => {
  assert.throws(() => raw._initialize(0));
  assert.deepEqual(await names(raw._getNcModels), [[]]);
});

test('before initialisation the lists are empty and no name is known', async () => {
  const { stdout } = await runClean(`
    const raw = loadRaw();
    for (const call of [() => raw.setNcModel('small_NC'), () => raw.setVadModel('default_VAD')]) {
      try { call(); } catch (error) { console.log(error.message); }
    }
    console.log(raw.setNcModel(null), raw.setVadModel(null));
    raw._getVadModels((...all) => console.log(JSON.stringify(all)));`);
  assert.equal(
    stdout,
    'Invalid noise cancellation model\nInvalid voice acticity detection model\n' +
      'undefined undefined\n[[]]\n',
  );
});

test('initialised', async (t) => {
  assert.equal(raw._initialize(), undefined);

  await t.test('lists the shipped models in order, on a later turn', async () => {
    let called = false;
    const order = [];
    const answers = new Promise((resolve) => {
      assert.equal(
        raw._getNcModels((...all) => {
          called = true;
          order.push('callback');
          resolve(all);
        }),
        undefined,
      );
    });
    assert.equal(called, false);
    queueMicrotask(() => order.push('microtask'));
    assert.deepEqual(await answers, [NC_MODELS]);
    assert.deepEqual(order, ['microtask', 'callback']);
    assert.deepEqual(await names(raw._getVadModels), [VAD_MODELS]);
  });

  await t.test('callbacks come in order, microtasks between them', async () => {
    const order = [];
    await new Promise((resolve) => {
      raw._getNcModels(() => {
        order.push(1);
        queueMicrotask(() => order.push('micro'));
      });
      raw._getVadModels(() => {
        order.push(2);
        resolve();
      });
    });
    assert.deepEqual(order, [1, 'micro', 2]);
  });

  await t.test('a callback has the global object as this in sloppy code', async () => {
    const self = await new Promise((resolve) => {
      const sloppy = new Function('resolve', 'return function () { resolve(this); };');
      raw._getNcModels(sloppy(resolve));
    });
    assert.equal(self, globalThis);
  });

  await t.test('setters take registered names, treat anything but a string as none', () => {
    for (const name of NC_MODELS) assert.equal(raw.setNcModel(name), undefined);
    for (const other of [null, undefined, 3, {}, NOTHING]) {
      assert.equal(raw.setNcModel(other), undefined);
      assert.equal(raw.setVadModel(other), undefined);
    }
    assert.equal(raw.setVadModel(VAD_MODELS[0]), undefined);
    for (const unknown of ['', 'small', 'small_NC\0', 'SMALL_NC', VAD_MODELS[0]]) {
      assert.throws(() => raw.setNcModel(unknown), { message: 'Invalid noise cancellation model' });
    }
    for (const unknown of ['', 'small_NC', 'default_VAD ']) {
      assert.throws(() => raw.setVadModel(unknown), {
        message: 'Invalid voice acticity detection model',
      });
    }
  });

  await t.test('a second initialisation is -4 and leaves the lists alone', async () => {
    assert.throws(() => raw._initialize(), {
      message: 'Failed to setup Valto module, error code: -4',
    });
    assert.deepEqual(await names(raw._getNcModels), [NC_MODELS]);
  });
});

const INITIALIZE = `
  const raw = require(process.env.MODULE);
  for (let i = 0; i < 2; ++i) {
    try { raw._initialize(); console.log('started'); } catch (error) { console.log(error.message); }
  }
  raw._getNcModels((nc) => raw._getVadModels((vad) => console.log(JSON.stringify([nc, vad]))));`;
const failure = (code) => `Failed to setup Valto module, error code: ${code}\n`;
const SECOND = `Faild to initialize Morva SDK\n${failure(-4)}`;

test('weight files that cannot be read', async (t) => {
  const damages = {
    missing: (file) => rmSync(file),
    'no file but a folder': (file) => {
      rmSync(file);
      mkdirSync(file);
    },
    'a dangling link': (file) => {
      rmSync(file);
      symlinkSync('nowhere', file);
    },
  };
  for (const [index, weight] of WEIGHTS.entries()) {
    for (const [kind, damage] of Object.entries(damages)) {
      await t.test(`${weight} ${kind}`, async () => {
        const module = copyBinary(t);
        damage(path.join(path.dirname(module), weight));
        const { stdout } = await runClean(INITIALIZE, { env: { MODULE: module } });
        const line =
          `Failed to load Morva weight file: ./${weight} with working directory: ` +
          `${path.dirname(module)}\n`;
        const kept = [NC_MODELS.slice(0, index), []];
        assert.equal(stdout, `${line}${failure(-5 - index)}${SECOND}${JSON.stringify(kept)}\n`);
      });
    }
  }
});

test('weight files with wrong content register, their sessions do not open', async (t) => {
  const damages = {
    empty: (file) => truncateSync(file, 0),
    cut: (file) => truncateSync(file, 1000),
    foreign: (file) => writeFileSync(file, 'RIFF this is not a weight file'.repeat(100)),
  };
  for (const [kind, damage] of Object.entries(damages)) {
    await t.test(kind, async () => {
      const module = copyBinary(t);
      for (const weight of WEIGHTS) damage(path.join(path.dirname(module), weight));
      const { stdout } = await runClean(
        `const raw = require(process.env.MODULE); raw._initialize();
         const engine = require(ENGINE); engine.attach(process.env.MODULE);
         for (const rate of [8000, 16000, 48000]) {
           console.log(engine.ncSetup(rate, 10), engine.vadSetup(rate, 10));
         }`,
        { env: { MODULE: module } },
      );
      assert.equal(stdout.match(/^0n 0n$/gm)?.length, 3, stdout);
    });
  }
});

test('install paths', async (t) => {
  const good = [
    'with space',
    'J\u00fcrgen',
    '\u4f60\u597d \u0416',
    'a%20b#c?d',
    '\uff21\ufffd',
    "it's",
  ];
  for (const name of good) {
    await t.test(`${name} works`, async () => {
      const { stdout } = await runClean(INITIALIZE, { env: { MODULE: copyBinary(t, name) } });
      assert.equal(stdout, `started\n${SECOND}${JSON.stringify([NC_MODELS, VAD_MODELS])}\n`);
    });
  }
  await t.test('a character outside the Basic Multilingual Plane ends in -5', async () => {
    const module = copyBinary(t, 'smile \u{1f600}');
    const { stdout } = await runClean(INITIALIZE, { env: { MODULE: module } });
    const line =
      `Failed to load Morva weight file: ./${WEIGHTS[0]} with working directory: ` +
      `${path.dirname(module)}\n`;
    assert.equal(stdout, `${line}${failure(-5)}${SECOND}[[],[]]\n`);
  });
  await t.test('a path beyond the usual length works', async () => {
    const module = copyBinary(t, `${'d'.repeat(200)}/${'e'.repeat(200)}/${'f'.repeat(200)}`);
    const { stdout } = await runClean(INITIALIZE, { env: { MODULE: module } });
    assert.match(stdout, /^started\n/);
  });
});

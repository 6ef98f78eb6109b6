// The five raw properties, the friendly functions over them and the binding layer under them.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import { binaryFile, NC_MODELS, probePath, require, VAD_MODELS } from './support/package.mjs';

const raw = require(binaryFile);
const valto = require('quorral_valto');
const probe = require(probePath);
const PROPERTIES = ['_initialize', '_getNcModels', 'setNcModel', '_getVadModels', 'setVadModel'];
const names = (getter) => new Promise((resolve) => getter((...received) => resolve(received)));
const NOTHING = () => {};
const REFUSALS = {
  setNcModel: 'Invalid noise cancellation model',
  setVadModel: 'Invalid voice acticity detection model',
};

test('arguments are counted and typed, and nothing happens before', async () => {
  assert.deepEqual(Reflect.ownKeys(raw), PROPERTIES);
  const count = (expected, { length }) =>
    `Invalid argument count: expected ${expected}; received ${length}`;
  const mismatch = 'Invalid argument at index 0: type mismatch';
  const cases = [[1], [undefined], [1, 2, 3]].map((args) => ['_initialize', args, count(0, args)]);
  for (const name of PROPERTIES.slice(1)) {
    for (const args of [[], [NOTHING, NOTHING]]) cases.push([name, args, count(1, args)]);
    if (name in REFUSALS) continue;
    for (const other of [7, 'f', null, undefined, {}, [], Symbol('s'), 1n]) {
      cases.push([name, [other], mismatch]);
    }
  }
  for (const setter in REFUSALS) cases.push([setter, [NC_MODELS[0]], REFUSALS[setter]]);
  for (const [name, args, message] of cases) {
    assert.throws(() => raw[name](...args), { name: 'Error', message }, `${name} ${args.length}`);
  }
  for (const get of [raw._getNcModels, raw._getVadModels]) assert.deepEqual(await names(get), [[]]);
});

test('setters want exact names; callbacks come on later turns, microtasks between them', async () => {
  assert.equal(raw._initialize(), undefined);
  valto.initialize(); // which is content with an engine that others started
  for (const [setter, message] of Object.entries(REFUSALS)) {
    const coded = (code) => ({ name: 'ValtoError', code });
    for (const other of [null, undefined, 3, {}]) {
      assert.equal(raw[setter](other), undefined);
      if (other === null && setter === 'setNcModel') valto[setter](other);
      else assert.throws(() => valto[setter](other), coded('ERR_VALTO_ARGUMENT'));
    }
    for (const unknown of ['', 'small', 'small_NC\0', 'SMALL_NC', 'default_VAD ']) {
      assert.throws(() => raw[setter](unknown), { message });
      assert.throws(() => valto[setter](unknown), coded('ERR_VALTO_MODEL'));
    }
  }
  valto.setVadModel(VAD_MODELS[0]);
  assert.deepEqual(await valto.getVadModels(), VAD_MODELS);
  const order = [];
  const answers = new Promise((resolve) => {
    raw._getNcModels((...all) => {
      order.push(all);
      queueMicrotask(() => order.push('microtask'));
      setImmediate(() => order.push('rest of the turn'));
      raw._getNcModels(() => order.push('asked inside'));
    });
    const sloppy = new Function('resolve', 'return function () { resolve(this); };');
    raw._getVadModels(sloppy(resolve));
  });
  queueMicrotask(() => order.push('first'));
  assert.equal(await answers, globalThis);
  for (let i = 0; i < 2; ++i) await new Promise(setImmediate);
  const later = ['rest of the turn', 'asked inside'];
  assert.deepEqual(order, ['first', [NC_MODELS], 'microtask', ...later]);
});

test('errors and strings come through whole', () => {
  for (const text of ['', '\u00fc\u4f60\u{1f600}', 'x'.repeat(100_000)]) {
    assert.throws(() => probe.echo(text), { message: `[${text}]` });
  }
  assert.throws(() => probe.echo(1), { message: '[not a string]' });
});

// Fails the first, second, ... allocation until the work gets by without reaching it; how often it
// failed. What the work does may throw, but only for want of memory.
async function failEach(work) {
  for (let n = 1; n < 3000; ++n) {
    probe.failAllocation(String(n));
    try {
      await work();
    } catch (error) {
      assert.equal(error.message, 'std::bad_alloc');
    }
    try {
      probe.failAllocation('0');
    } catch {
      return n - 1; // it was not reached
    }
  }
  return assert.fail('there is no end to the allocations');
}

const load = (exports) => {
  const module = { exports };
  process.dlopen(module, probePath);
  return module.exports;
};

test('a failed allocation is an error, then all is well', async () => {
  let delivered = 0;
  const queueing = await failEach(async () => {
    probe.deliver(() => ++delivered);
    for (let i = 0; i < 2; ++i) await new Promise(setImmediate);
  });
  assert.ok(queueing >= 5, `${queueing}`);
  assert.ok(delivered >= 1);
  await new Promise((resolve) => probe.deliver(resolve));

  const environments = async () => Number((await names(probe.countEnvironments))[0]);
  const before = await environments();
  const loading = await failEach(() => load({}));
  assert.ok(loading >= 10, `${loading}`);
  // Environments live until the runtime tears them down; a load that failed early has none.
  assert.ok((await environments()) - before < loading);

  const { sessions } = load({ sessions: {} });
  sessions.initialize();
  const opened = [];
  const opening = await failEach(() => opened.push(sessions.openNc(16000, 10, null)));
  assert.ok(opening >= 20, `${opening}`);
  // Refused for want of memory, or an open session where it could do without.
  const open = opened.filter((end) => end !== 3);
  assert.ok(open.length >= 1 && open.length < 8, `${open.length}`);
  const frame = new Int16Array(160);
  for (const session of open) assert.equal(sessions.processNc(session, frame, frame), 0);
});

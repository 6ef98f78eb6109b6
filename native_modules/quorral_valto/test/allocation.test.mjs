// Every allocation of the host module may fail: in a copy of it that counts them.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import { runClean } from './support/child.mjs';
import { NC_MODELS, underSanitizer, VAD_MODELS } from './support/package.mjs';

// failEach(work, undo): fails the first, second, ... allocation of `work` until it gets by without
// reaching it, and answers with all that `work` ended with, the last one without a failure. `undo`
// takes back what a call did; then nothing may be held that was not held before, but for what is made
// once: a second failure at the same place must find that there.
const COMMON = `
const valto = again(FAILING);
const sessions = (() => {
  const m = { exports: { sessions: {} } };
  process.dlopen(m, FAILING);
  return m.exports.sessions;
})();
const engine = require(ENGINE);
engine.attach(FAILING);
const turns = async () => { for (let i = 0; i < 3; ++i) await new Promise(setImmediate); };
const outcome = async (work) => {
  try { return (await work()) ?? 'done'; } catch (error) { return error.message; }
};
async function fail(n, work, undo) {
  await turns();
  const held = engine.heldAllocations();
  engine.failAllocation(n);
  const end = await outcome(work);
  const missed = engine.isFailurePending();
  engine.failAllocation(0);
  undo(end);
  await turns();
  // A closed session of script waits for the collector.
  const kept = engine.heldAllocations() - held - (typeof end === 'object' && !Array.isArray(end));
  return { end, missed, kept };
}
async function failEach(work, undo = () => {}) {
  undo(await outcome(work));
  const ends = [];
  for (let n = 1; n < 10000; ++n) {
    let { end, missed, kept } = await fail(n, work, undo);
    if (kept) kept = (await fail(n, work, undo)).kept;
    if (kept) throw new Error(work + ' keeps ' + kept + ' at ' + n + ': ' + end);
    ends.push(typeof end === 'bigint' ? Number(end !== 0n) : end);
    if (missed) return ends;
  }
}
const names = (list) => () => Promise.race([new Promise((resolve) => list(resolve)), turns().then(() => 'lost')]);
const print = (value) => console.log('RESULT ' + JSON.stringify(value));
`;

const options = { skip: underSanitizer && 'not built with sanitizers' };
const run = async (script) => {
  const { stdout } = await runClean(`${COMMON}(async () => {${script}})();`);
  return stdout
    .split('\n')
    .filter((line) => line.startsWith('RESULT '))
    .map((line) => JSON.parse(line.slice('RESULT '.length)));
};

function assertEnds(ends, failures, success, atLeast) {
  assert.deepEqual(ends.at(-1), success);
  assert.ok(ends.length > atLeast, `${ends.length - 1} allocations`);
  for (const end of ends.slice(0, -1)) assert.ok(failures.includes(end), JSON.stringify(end));
}

test('start-up names the step at which memory ran out, and can be repeated', options, async () => {
  const [ends, models] = await run(`
    print(await failEach(() => valto._initialize(), () => engine.forgetEngine()));
    valto._initialize();
    print([await names(valto._getNcModels)(), await names(valto._getVadModels)()]);`);
  const codes = [-4, -5, -6, -7, -8];
  const texts = codes.map((code) => `Failed to setup Valto module, error code: ${code}`);
  assertEnds(ends, texts, 'done', 50);
  // In the order of the steps, none left out.
  assert.deepEqual([...new Set(ends)], [...texts, 'done']);
  const order = ends.map((end) => texts.indexOf(end)).slice(0, -1);
  assert.deepEqual(
    order,
    [...order].sort((a, b) => a - b),
  );
  assert.deepEqual(models, [NC_MODELS, VAD_MODELS]);
});

test('lists and choices of models fail with an error and stay as they were', options, async () => {
  const results = await run(`
    valto._initialize();
    print(await failEach(names(valto._getNcModels)));
    print(await failEach(names(valto._getVadModels)));
    const unknown = 'x'.repeat(100);
    print(await failEach(() => valto.setNcModel(unknown)));
    print(await failEach(() => valto.setVadModel(unknown)));
    print(await failEach(() => valto.setNcModel(null)));
    print([await names(valto._getNcModels)(), await names(valto._getVadModels)()]);`);
  const memory = ['std::bad_alloc'];
  assertEnds(results[0], memory, NC_MODELS, 4);
  assertEnds(results[1], memory, VAD_MODELS, 4);
  assertEnds(results[2], memory, 'Invalid noise cancellation model', 1);
  assertEnds(results[3], memory, 'Invalid voice acticity detection model', 1);
  assertEnds(results[4], memory, 'done', 0);
  assert.deepEqual(results[5], [NC_MODELS, VAD_MODELS]);
});

test(
  'a session that finds no memory is refused, or whole where it can do without',
  options,
  async () => {
    const results = await run(`
    valto._initialize();
    const kept = []; // or the collector would change the count
    const close = (end) => { if (typeof end === 'object') sessions.close(kept.at(kept.push(end) - 1)); };
    const input = Int16Array.from({ length: 480 }, (_, i) => 3000 * Math.sin(i * i));
    const output = new Int16Array(480);
    const listen = (session) => {
      for (let i = 0; i < 5; ++i) assert.equal(engine.ncProcess(session, input, 480, output, 480), 0);
      return String(output);
    };
    const first = engine.ncSetup(48000, 10);
    const wanted = listen(first);
    print(await failEach(() => engine.ncSetup(48000, 10), (end) => {
      if (end === 0n) return;
      assert.equal(listen(end), wanted);
      engine.ncReset(end);
    }));
    print(await failEach(() => engine.vadSetup(48000, 10), (end) => end && engine.vadReset(end)));
    for (const open of [sessions.openNc, sessions.openVad]) {
      const ends = await failEach(() => open(48000, 10, null), close);
      print(ends.map((end) => (typeof end === 'object' ? 'open' : end)));
    }
    engine.ncReset(first);
    print(listen(engine.ncSetup(48000, 10)) === wanted);`);
    for (const ends of results.slice(0, 2)) {
      assertEnds(ends, [0, 1], 1, 20);
      assert.ok(ends.filter((end) => end === 1).length < 8);
    }
    for (const ends of results.slice(2, 4)) {
      assertEnds(ends, [3, 'std::bad_alloc', 'open'], 'open', 20);
      assert.ok(ends.filter((end) => end === 'open').length < 8);
    }
    assert.equal(results[4], true);
  },
);

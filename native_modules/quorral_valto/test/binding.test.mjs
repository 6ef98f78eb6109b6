// The script binding layer through a test module of its own.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import { runClean } from './support/child.mjs';
import { bindingPath, require } from './support/package.mjs';

const binding = require(bindingPath);

test('of two errors in one call the first reaches script', () => {
  assert.throws(() => binding.throwTwice(), { name: 'Error', message: 'first 1' });
});

test('a native exception becomes a script error', () => {
  assert.throws(() => binding.throwNative(), { message: 'native failure' });
});

test('strings come through whole', () => {
  const texts = ['', 'a', '\u00fc\u4f60\u{1f600}', 'x'.repeat(100_000)];
  for (const text of texts) assert.throws(() => binding.echo(text), { message: `[${text}]` });
  assert.throws(() => binding.echo('\ud800'), { message: '[\ufffd]' });
  for (const other of [1, null, undefined, {}, Symbol('s'), ['a'], new String('a')]) {
    assert.throws(() => binding.echo(other), { message: '[not a string]' });
  }
});

test('values of several threads arrive on this one, in the order of each', async () => {
  const next = [0, 0, 0, 0];
  await new Promise((resolve) => {
    let left = 400;
    binding.deliverFromThreads(([thread, count]) => {
      assert.equal(Number(count), next[thread]++);
      if (--left === 0) resolve();
    });
  });
  assert.deepEqual(next, [100, 100, 100, 100]);
});

test('a held callback keeps the function alive and the loop waiting', async () => {
  const { stdout } = await runClean(
    `const binding = require(BINDING);
     let n = 0;
     binding.deliverFromThreads(() => ++n);
     gc();
     process.on('exit', () => console.log(n));`,
    { execArgv: ['--expose-gc'] },
  );
  assert.equal(stdout, '400\n');
});

test('a dropped callback lets its function go', async () => {
  const { stdout } = await runClean(
    `const binding = require(BINDING);
     let collected = 0;
     const registry = new FinalizationRegistry(() => ++collected);
     for (let i = 0; i < 100; ++i) {
       const callback = () => i;
       registry.register(callback, i);
       binding.dropOnThread(callback);
     }
     (async () => {
       for (let i = 0; i < 200 && collected < 99; ++i) { await sleep(10); gc(); }
       console.log(collected >= 99);
     })();`,
    { execArgv: ['--expose-gc'] },
  );
  assert.equal(stdout, 'true\n');
});

test('callbacks kept beyond their environment are dead but harmless', async () => {
  const { stdout } = await runClean(`
    const binding = require(BINDING);
    (async () => {
      for (let i = 0; i < 5; ++i) {
        const worker = startWorker(
          "require(BINDING).keep(() => console.log('never')); parentPort.postMessage(0); setInterval(() => {}, 1000);");
        await once(worker, 'message');
        await worker.terminate();
      }
      binding.keep(() => console.log('alive'));
      binding.callAndDropKept();
      binding.countEnvironments(([n]) => console.log(n));
    })();`);
  assert.equal(stdout, 'alive\n1\n');
});

// Fails the first, second, ... allocation until the work gets by without reaching it; how often it
// failed. What the work does may throw, but only for want of memory.
async function failEach(work) {
  const again = () => {
    const module = { exports: {} };
    process.dlopen(module, bindingPath);
    return module.exports;
  };
  for (let n = 1; n < 200; ++n) {
    binding.failAllocation(String(n));
    try {
      await work(again);
    } catch (error) {
      assert.equal(error.message, 'std::bad_alloc');
    }
    try {
      binding.disarm();
    } catch {
      return n - 1;
    }
  }
  return assert.fail('there is no end to the allocations');
}

test('a failed allocation while a callback is queued is an error, then all is well', async () => {
  let delivered = 0;
  const failures = await failEach(async () => {
    binding.deliver(() => ++delivered);
    await new Promise(setImmediate);
    await new Promise(setImmediate);
  });
  assert.ok(failures >= 5, `${failures}`);
  assert.ok(delivered >= 1);
  await new Promise((resolve) => binding.deliver(resolve));
});

test('a failed allocation while the module loads is an error and leaves nothing behind', async () => {
  const count = () =>
    new Promise((resolve) => binding.countEnvironments(([number]) => resolve(Number(number))));
  const before = await count();
  let loaded = 0;
  const failures = await failEach((again) => {
    if (typeof again().disarm === 'function') ++loaded;
  });
  assert.ok(failures >= 10, `${failures}`);
  assert.ok(loaded <= 1);
  // Environments live until the runtime tears them down; a load that failed early has none.
  assert.ok((await count()) - before < failures);
});

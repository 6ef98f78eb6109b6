// Every way a process or a worker can end, each in a process of its own.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import { randomSource } from './support/audio.mjs';
import { runChild, runClean } from './support/child.mjs';
import { underSanitizer } from './support/package.mjs';

const WORKERS = underSanitizer ? 12 : 40;

const endings = {
  'loaded and nothing else': ['loadRaw();', ''],
  'a pending callback is delivered before the natural end': [
    `loadRaw()._getNcModels((names) => console.log('delivered', names.length));`,
    'delivered 0\n',
  ],
  'callbacks that ask for the next one': [
    `const raw = loadRaw(); let left = 50;
     const next = () => (left-- > 0 ? raw._getVadModels(next) : console.log('done'));
     next();`,
    'done\n',
  ],
  'process.exit with callbacks pending': [
    `const raw = loadRaw(); raw._initialize();
     for (let i = 0; i < 1000; ++i) raw._getNcModels(() => console.log('never'));
     process.exit(0);`,
    '',
  ],
  'process.exit inside a callback with others pending': [
    `const raw = loadRaw();
     raw._getNcModels(() => process.exit(0));
     for (let i = 0; i < 100; ++i) raw._getNcModels(() => console.log('never'));`,
    '',
  ],
  'asking again in an exit handler': [
    `const raw = loadRaw();
     process.on('exit', () => { raw._getNcModels(() => console.log('never')); raw.setNcModel(null); });`,
    '',
  ],
  'a callback that throws does not stop the ones after it': [
    `const raw = loadRaw();
     process.on('uncaughtException', (error) => console.log('caught', error.message));
     raw._getNcModels(() => { throw new Error('one'); });
     raw._getNcModels(() => { throw new Error('two'); });
     raw._getNcModels(() => console.log('three'));`,
    'caught one\ncaught two\nthree\n',
  ],
  'a callback that throws what is no error': [
    `process.on('uncaughtException', (error) => console.log('caught', error));
     loadRaw()._getNcModels(() => { throw undefined; });`,
    'caught undefined\n',
  ],
  'a rejected promise of a callback': [
    `process.on('unhandledRejection', (error) => console.log('rejected', error.message));
     loadRaw()._getNcModels(async () => { throw new Error('late'); });`,
    'rejected late\n',
  ],
  'a callback dropped on another thread lets the process end': [
    `const binding = require(BINDING); loadRaw();
     for (let i = 0; i < 50; ++i) binding.dropOnThread(() => console.log('never'));`,
    '',
  ],
  'process.exit while native threads call back': [
    `const binding = require(BINDING); let n = 0;
     binding.deliverForever(() => { if (++n === 30) process.exit(0); });`,
    '',
  ],
  'process.exit while native threads hold and drop callbacks': [
    `const binding = require(BINDING);
     for (let i = 0; i < 50; ++i) binding.dropOnThread(() => {});
     process.exit(0);`,
    '',
  ],
  'two loads of the module in one environment': [
    `const first = loadRaw(); const second = again(BINARY);
     console.log(first !== second, first._initialize !== second._initialize);
     second._getNcModels(() => first._getNcModels(() => console.log('both')));`,
    'true true\nboth\n',
  ],
  'sessions left open': [
    `const { initialize, NoiseCanceller, VoiceActivityDetector } = require(PACKAGE);
     initialize();
     const options = { sampleRate: 48000, frameMs: 10, model: 'full_NC-ca03f4' };
     globalThis.kept = [new NoiseCanceller(options), new VoiceActivityDetector({ ...options, model: null })];
     kept[0].process(new Int16Array(480));`,
    'Setting Valto model: full_NC-ca03f4\n',
  ],
};

for (const [name, [script, stdout]] of Object.entries(endings)) {
  test(name, async () => {
    assert.equal((await runClean(script)).stdout, stdout);
  });
}

test('a callback that throws with nobody to catch it ends the process as any script error', async () => {
  const { code, signal, stderr } = await runChild(
    `loadRaw()._getNcModels(() => { throw new Error('nobody'); });`,
  );
  assert.deepEqual({ code, signal }, { code: 1, signal: null });
  assert.match(stderr, /Error: nobody/);
});

test('process.exit while audio threads run', async () => {
  for (const wait of [0, 5, 40, 150]) {
    const { stderr } = await runClean(`
      loadRaw()._initialize(); const engine = loadEngine();
      for (const rate of [8000, 48000]) engine.runForever(rate, 10);
      setTimeout(() => process.exit(0), ${wait});`);
    assert.equal(stderr, '');
  }
});

test('natural end while audio threads run', async () => {
  await runClean(`
    loadRaw()._initialize(); loadEngine().runForever(16000, 10);
    setTimeout(() => {}, 30);`);
});

const BUSY_WORKER = `
  const valto = require(PACKAGE);
  const binding = require(BINDING);
  valto.initialize();
  const canceller = new valto.NoiseCanceller({ sampleRate: 16000, frameMs: 10 });
  const frame = new Int16Array(160).fill(1000);
  binding.deliverFromThreads(() => {});
  binding.dropOnThread(() => {});
  const turn = () => {
    valto.raw._getNcModels(turn);
    for (let i = 0; i < 5; ++i) canceller.process(frame);
    new valto.VoiceActivityDetector({ sampleRate: 8000, frameMs: 20 }).process(frame);
  };
  parentPort.postMessage('ready');
  turn();`;

test('workers that are terminated at random moments', async () => {
  const seed = Math.floor(Math.random() * 2 ** 31);
  const random = randomSource(seed);
  const delays = Array.from({ length: WORKERS }, () => Math.floor(random() * 120));
  await runClean(`
    const delays = ${JSON.stringify(delays)}; // seed ${seed}
    const one = async (delay, early) => {
      const worker = startWorker(${JSON.stringify(BUSY_WORKER)});
      worker.on('error', (error) => { console.error(error); process.exitCode = 9; });
      if (!early) await once(worker, 'message');
      await sleep(delay / (early ? 1 : 10));
      await worker.terminate();
    };
    (async () => {
      for (let i = 0; i < delays.length; i += 4) {
        await Promise.all(delays.slice(i, i + 4).map((delay, k) => one(delay, k % 2 === 0)));
      }
    })();`);
});

test('a worker that exits inside a callback, and one that is left behind', async () => {
  await runClean(`
    const exits = startWorker('const raw = loadRaw(); raw._getNcModels(() => process.exit(0)); setInterval(() => {}, 1000);');
    once(exits, 'exit').then(([code]) => {
      if (code !== 0) process.exit(9);
      const left = startWorker(${JSON.stringify(BUSY_WORKER)});
      once(left, 'message').then(() => setTimeout(() => process.exit(0), 20));
    });`);
});

test('a module that only ended workers had loaded can be loaded again', async () => {
  const { stdout } = await runClean(`
    const code = 'const raw = loadRaw(); raw._getNcModels((names) => parentPort.postMessage(names.length));';
    (async () => {
      for (let i = 0; i < 4; ++i) {
        const worker = startWorker(i === 1 ? 'loadRaw()._initialize();' + code : code);
        const [[count]] = await Promise.all([once(worker, 'message'), once(worker, 'exit')]);
        console.log(count);
      }
      loadRaw()._getNcModels((names) => console.log(names.length));
    })();`);
  assert.equal(stdout, '0\n3\n3\n3\n3\n');
});

test('two environments at once have their own callbacks and one engine', async () => {
  const { stdout } = await runClean(`
    const code = \`
      const { initialize, getNcModels, raw } = require(PACKAGE);
      initialize();
      parentPort.on('message', async () => {
        for (let i = 0; i < 200; ++i) await getNcModels();
        parentPort.postMessage((await getNcModels()).length);
        parentPort.close();
      });
      parentPort.postMessage('up');\`;
    const { initialize, getNcModels } = require(PACKAGE);
    (async () => {
      initialize();
      const workers = [startWorker(code), startWorker(code)];
      await Promise.all(workers.map((worker) => once(worker, 'message')));
      const answers = workers.map((worker) => once(worker, 'message'));
      for (const worker of workers) worker.postMessage('go');
      for (let i = 0; i < 200; ++i) await getNcModels();
      console.log((await Promise.all(answers)).join());
    })();`);
  assert.equal(stdout, '3,3\n');
});

test('what an environment allocates is freed when it is torn down', async () => {
  const workers = underSanitizer ? 20 : 60;
  const { stdout } = await runClean(`
    const binding = require(BINDING);
    const code = \`
      const binding = require(BINDING);
      const raw = loadRaw();
      for (let i = 0; i < 200; ++i) { raw._getNcModels(() => {}); binding.dropOnThread(() => {}); }
      binding.countEnvironments(([n]) => parentPort.postMessage(n));\`;
    (async () => {
      const round = async (n) => {
        for (let i = 0; i < n; ++i) {
          const worker = startWorker(code);
          await Promise.all([once(worker, 'message'), once(worker, 'exit')]);
        }
        return process.memoryUsage.rss();
      };
      const before = await round(${workers / 2});
      const after = await round(${workers});
      binding.countEnvironments(([count]) => console.log(count, after - before));
    })();`);
  const [count, grown] = stdout.trim().split(' ').map(Number);
  assert.equal(count, 1);
  if (!underSanitizer) assert.ok(grown < 60e6, `grew by ${grown} bytes over ${workers} workers`);
});

test('100,000 callbacks leak nothing', { timeout: 120_000 }, async () => {
  const { stdout } = await runClean(
    `const raw = loadRaw(); raw._initialize();
     const round = async (n) => {
       for (let i = 0; i < n; i += 500) {
         await new Promise((resolve) => {
           for (let k = 0; k < 499; ++k) raw._getNcModels(() => {});
           raw._getNcModels(resolve);
         });
         if (i % 10000 === 0) gc();
       }
       gc(); await sleep(0); gc();
       return process.memoryUsage();
     };
     (async () => {
       let last = await round(20000);
       const growth = [];
       for (let i = 0; i < 3; ++i) {
         const now = await round(100000);
         growth.push([now.heapUsed - last.heapUsed, now.rss - last.rss]);
         last = now;
       }
       console.log(...[0, 1].map((i) => Math.min(...growth.map((round) => round[i]))));
     })();`,
    { execArgv: ['--expose-gc'] },
  );
  // The best of several rounds: the runtime's own memory grows in steps now and then. One leaked
  // reference a call would be about ten megabytes in every round.
  const [heap, rss] = stdout.trim().split('\n').at(-1).split(' ').map(Number);
  assert.ok(heap < 1e6, `heap grew by ${heap} bytes`);
  if (!underSanitizer) assert.ok(rss < 4e6, `memory grew by ${rss} bytes`);
});

// Every way a process or a worker can end, each in a process of its own.
import assert from 'node:assert/strict';
import { test } from 'node:test';
import { run, underSanitizer } from './support/package.mjs';

const endings = {
  'values of several threads arrive on this one, in the order of each': [
    // Collected in the middle: the held callback keeps function and process alive.
    `const next = [0, 0, 0, 0];
     loadProbe().deliverFromThreads(([thread, count]) => {
       if (Number(count) !== next[thread]++) throw new Error(thread);
     });
     gc();
     process.on('exit', () => console.log(...next));`,
    '100 100 100 100\n',
  ],
  'process.exit inside a callback while others pend, threads call back and a handler asks again': [
    `const raw = loadRaw(); raw._initialize();
     process.on('exit', () => { raw._getNcModels(() => console.log('never')); raw.setNcModel(null); });
     for (let i = 0; i < 9; ++i) loadProbe().deliverFromThreads(() => {});
     raw._getNcModels(() => process.exit(0));
     for (let i = 0; i < 1000; ++i) raw._getNcModels(() => console.log('never'));`,
    '',
  ],
  'callbacks that throw do not stop the ones after them': [
    `const raw = loadRaw();
     process.on('uncaughtException', (error) => console.log('caught', error));
     process.on('unhandledRejection', (error) => console.log('rejected', error));
     raw._getNcModels(() => { throw 'one'; });
     raw._getNcModels(() => { throw undefined; });
     raw._getNcModels(async () => { throw 'late'; });
     raw._getNcModels(() => console.log('last'));`,
    'caught one\ncaught undefined\nrejected late\nlast\n',
  ],
};
for (const [name, [script, stdout]] of Object.entries(endings)) {
  test(name, async () => assert.equal((await run(script)).stdout, stdout));
}

test('a process ends while audio threads run', async () => {
  const ends = [0, 5, 40, 150].map((wait) => `setTimeout(() => process.exit(0), ${wait});`);
  const listening = 'require(PACKAGE).initialize({ onDiagnostic: () => {} });';
  for (const end of [
    ...ends,
    'setTimeout(() => {}, 30);',
    ...ends.map((each) => listening + each),
  ]) {
    const { stderr } = await run(`
      loadRaw()._initialize(); const probe = loadProbe();
      probe.runForever(BINARY); probe.runForever(BINARY); ${end}`);
    assert.equal(stderr, '');
  }
});

const BUSY_WORKER = `
  const valto = require(PACKAGE);
  const probe = loadProbe();
  valto.initialize({ onDiagnostic: () => {} });
  const canceller = new valto.NoiseCanceller({ sampleRate: 16000, frameMs: 10 });
  const frame = new Int16Array(160).fill(1000);
  probe.keep(() => {});
  probe.callAndDropKept();
  probe.keep(() => {}); // beyond this environment
  const turn = () => {
    valto.raw._getNcModels(turn);
    probe.deliverFromThreads(() => {});
    for (let i = 0; i < 5; ++i) canceller.process(frame);
    new valto.VoiceActivityDetector({ sampleRate: 8000, frameMs: 20 }).process(frame);
  };
  parentPort.postMessage('ready');
  turn();`;

test('workers terminated at any moment leave nothing behind; others exit or outlive the script', async () => {
  const workers = underSanitizer ? 12 : 40;
  const delays = Array.from({ length: workers }, (_, i) => (37 * i) % 120);
  const { stdout } = await run(`
    const one = async (delay, early) => {
      const worker = startWorker(${JSON.stringify(BUSY_WORKER)});
      if (!early) await once(worker, 'message');
      await sleep(delay / (early ? 1 : 10));
      await worker.terminate();
    };
    const round = async () => {
      const delays = ${JSON.stringify(delays)};
      while (delays.length > 0) {
        await Promise.all(delays.splice(0, 4).map((delay, k) => one(delay, k % 2 === 0)));
      }
      return process.memoryUsage.rss();
    };
    (async () => {
      const [before, after] = [await round(), await round()];
      loadProbe().callAndDropKept();
      // Threads of workers that are gone may still have something to deliver.
      const probe = loadProbe();
      const counted = () => new Promise((resolve) => probe.countEnvironments(([count]) => resolve(count)));
      for (let i = 0; i < 3000 && (await counted()) !== '1'; ++i) await sleep(10);
      console.log(await counted(), after - before);
      const exits = startWorker('loadRaw()._getNcModels(() => process.exit(0)); setInterval(() => {}, 1000);');
      if ((await once(exits, 'exit'))[0] !== 0) process.exit(9);
      await once(startWorker(${JSON.stringify(BUSY_WORKER)}), 'message');
      setTimeout(() => process.exit(0), 20);
    })();`);
  const [, count, grown] = stdout.match(/^(\d+) (-?\d+)$/m).map(Number);
  assert.equal(count, 1);
  if (!underSanitizer) assert.ok(grown < 40e6, `grew by ${grown} bytes over ${workers} workers`);
});

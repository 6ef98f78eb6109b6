// Lets the node clean the microphone of a headless browser for minutes and counts what must not happen:
//
//   node web/scripts/long-run.mjs [MINUTES]
//
// Dropouts are counted on the audio thread; the heap is the page's after a collection, and memory the engine's.
import { mkdtempSync, rmSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { openBrowser, openPage } from '../../apps/live-page/browser.mjs';
import { serveFolder } from './serve.mjs';

const minutes = Number(process.argv[2] ?? 10);
const EVERY_SECONDS = Math.min(60, (minutes * 60) / 4);

const BEGIN = async () => {
  const { Denoiser } = await import(new URL('quorral_valto_web/index.mjs', location));
  const audio = { noiseSuppression: false, autoGainControl: false, echoCancellation: false };
  const microphone = await navigator.mediaDevices.getUserMedia({ audio });
  const context = new AudioContext({ sampleRate: 48000 });
  const node = await Denoiser.create(context);
  context.createMediaStreamSource(microphone).connect(node).connect(context.destination);
  const state = { context, highest: 0, lowest: 1 };
  globalThis.running = state;
  node.addEventListener('meters', ({ detail }) => {
    state.last = detail;
    state.highest = Math.max(state.highest, detail.voice);
    state.lowest = Math.min(state.lowest, detail.voice);
  });
  document.onclick = () => context.resume();
};

const folder = mkdtempSync(path.join(os.tmpdir(), 'morva-long-'));
const server = await serveFolder();
const browser = await openBrowser(folder);
try {
  const { page, complaints } = await openPage(browser, new URL('call.html', server.url).href);
  await page.evaluate(BEGIN);
  await page.click('h1');
  const tools = await page.context().newCDPSession(page);
  for (let at = 0; at <= minutes * 60; at += EVERY_SECONDS) {
    await page.waitForTimeout(at === 0 ? 2000 : EVERY_SECONDS * 1000);
    await tools.send('HeapProfiler.collectGarbage');
    const { usedSize } = await tools.send('Runtime.getHeapUsage');
    const seen = await page.evaluate(() => {
      const { context, last, lowest, highest } = globalThis.running;
      return { time: context.currentTime, ...last, lowest, highest };
    });
    const scores = `voice ${seen.lowest.toFixed(2)} to ${seen.highest.toFixed(2)}`;
    console.log(
      `${seen.time.toFixed(0).padStart(4)} s  dropouts ${seen.dropouts}  ${scores}  ` +
        `memory ${seen.memory / 2 ** 20} MiB  heap ${(usedSize / 2 ** 20).toFixed(2)} MiB`,
    );
  }
  if (complaints.length > 0) throw new Error(complaints.join('\n'));
} finally {
  await browser.close();
  await server.close();
  rmSync(folder, { recursive: true });
}

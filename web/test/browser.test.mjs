// The package and the page in a headless browser whose microphone plays the bundled noisy recording.
import assert from 'node:assert/strict';
import {
  cpSync,
  mkdirSync,
  mkdtempSync,
  readdirSync,
  rmSync,
  symlinkSync,
  writeFileSync,
} from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { after, before, test } from 'node:test';
import { fileURLToPath } from 'node:url';
import * as esbuild from 'esbuild';
import * as vite from 'vite';
import { findChromium, openBrowser, openPage } from '../../apps/live-page/browser.mjs';
import { serveFolder } from '../scripts/serve.mjs';

const skip = findChromium() === null && 'no Chromium found: set CHROMIUM or install it';
const dist = fileURLToPath(new URL('../dist', import.meta.url));
let browser;
let folder;
let server;

before(async () => {
  if (skip) return;
  folder = mkdtempSync(path.join(os.tmpdir(), 'morva-page-'));
  browser = await openBrowser(folder);
  server = await serveFolder();
});
after(async () => {
  await browser?.close();
  await server?.close();
  if (folder) rmSync(folder, { recursive: true });
});

/** A test with a tab of its own at an address of the page's folder. */
const browsing = (name, address, body) =>
  test(name, { skip }, async (t) => {
    const { page, complaints } = await openPage(browser, new URL(address, server.url).href);
    t.after(() => page.close());
    await body(page, t);
    assert.deepEqual(complaints, []);
  });

browsing('the page cleans a recording and the microphone', 'index.html', async (page) => {
  await page.locator('#record:enabled').waitFor();
  const finished = async () => {
    await page.locator('#save:enabled').waitFor();
    assert.match(await page.locator('#pauses').textContent(), /^[1-5]\d dB quieter$/);
  };
  await page.click('#example');
  await finished();
  await page.selectOption('#model', 'small_NC_8k');
  await page.getByText('cleaned with small_NC_8k').waitFor();
  await finished();
  await page.click('#record');
  const texts = new Set();
  while (texts.size < 4) texts.add(await page.locator('#voice-text').textContent());
  await page.waitForFunction(() => {
    return Number.parseFloat(document.getElementById('length').textContent) > 6;
  });
  await page.click('#record');
  await finished();
});

// What runs in the page: a sound through nodes of an offline context.
const RENDER = async () => {
  const { Denoiser, loadEngine } = await import(new URL('quorral_valto_web/index.mjs', location));
  const response = await fetch('example.flac');
  const encoded = await response.arrayBuffer();
  const context = new OfflineAudioContext(2, 48000 * 5, 48000);
  const audio = await context.decodeAudioData(encoded);
  const progress = [];
  const options = {
    meterSeconds: 0.02,
    onProgress: ({ loaded, total }) => progress.push(loaded / total),
  };
  const [first, second] = await Promise.all([
    Denoiser.create(context, options),
    Denoiser.create(context, { model: 'small_NC', voice: false, attenuationLimit: 0 }),
  ]);
  const meters = [];
  first.addEventListener('meters', ({ detail }) => meters.push({ ...detail }));
  const source = new AudioBufferSourceNode(context, { buffer: audio });
  const merger = new ChannelMergerNode(context, { numberOfInputs: 2 });
  merger.connect(context.destination);
  for (const [i, node] of [first, second].entries()) source.connect(node).connect(merger, 0, i);
  source.start();
  const rendered = await context.startRendering();
  const before = audio.getChannelData(0);
  // The same by frames.
  const engine = await loadEngine({ models: ['full_NC-ca03f4'] });
  const session = new engine.NoiseCanceller({ sampleRate: 48000, model: 'full_NC-ca03f4' });
  const frames = before.slice();
  for (let at = 0; at + 480 <= frames.length; at += 480)
    session.process(frames.subarray(at, at + 480));
  const shift = Math.round(first.latency * 48000) - session.latency;
  const worst = (one, other, late) => {
    let most = 0;
    for (let i = 480; i + late < one.length; ++i)
      most = Math.max(most, Math.abs(one[i + late] - other[i]));
    return most;
  };
  while (meters.length < 200) await new Promise((resolve) => setTimeout(resolve, 20));
  return {
    fromFrames: worst(rendered.getChannelData(0), frames, shift),
    scores: meters.map(({ voice }) => voice),
    levels: meters.map(({ noise }) => noise),
    progress,
    isolated: crossOriginIsolated,
    latency: first.latency,
    memory: meters.at(-1).memory,
  };
};

browsing('nodes give what frames give, and share one engine', 'call.html', async (page) => {
  const seen = await page.evaluate(RENDER);
  assert.equal(seen.fromFrames, 0);
  assert.equal(seen.isolated, false);
  assert.ok(Math.min(...seen.scores) < 0.3 && Math.max(...seen.scores) > 0.8);
  assert.ok(Math.max(...seen.levels) - Math.min(...seen.levels) > 10);
  assert.deepEqual([seen.progress.at(-1), seen.latency * 48000], [1, 928]);
  assert.equal(seen.memory, 2 ** 25); // both models, nothing twice
  const models = () => server.requests.filter((name) => name.includes('/models/')).length;
  const fetched = models();
  await page.reload();
  await page.evaluate(RENDER);
  assert.equal(models(), fetched);
  const refusal = await page.evaluate(async () => {
    const { Denoiser } = await import('./quorral_valto_web/index.mjs');
    const context = new AudioContext({ sampleRate: 22050 });
    const wrongRate = await Denoiser.create(context).catch(({ code }) => code);
    WebAssembly.validate = () => false;
    const old = await Denoiser.create(new AudioContext()).catch(({ message }) => message);
    return [wrongRate, old];
  });
  assert.equal(refusal[0], 'ERR_MORVA_SAMPLE_RATE');
  assert.match(refusal[1], /^This browser lacks the vector or exception instructions/);
});

// How loud the far side is while nobody speaks and while somebody does, cleaned and not.
const LISTEN = async () => {
  const { srcObject } = document.getElementById('far');
  const context = new AudioContext();
  const tap = new AnalyserNode(context, { fftSize: 2048 });
  context.createMediaStreamSource(srcObject).connect(tap);
  const values = new Float32Array(tap.fftSize);
  const powers = [];
  const until = context.currentTime + 13; // the whole recording
  while (context.currentTime < until) {
    await new Promise((resolve) => setTimeout(resolve, 30));
    tap.getFloatTimeDomainData(values);
    powers.push(10 * Math.log10(values.reduce((sum, x) => sum + x * x, 0) / values.length + 1e-10));
  }
  powers.sort((a, b) => a - b);
  return {
    quiet: powers[Math.floor(powers.length / 5)],
    loud: powers[Math.floor(powers.length * 0.9)],
  };
};

browsing('the far side of a call hears it clean', 'call.html', async (page) => {
  await page.click('#start');
  await page.getByText('Connected').waitFor();
  const cleaned = await page.evaluate(LISTEN);
  await page.check('#bypass');
  const bypassed = await page.evaluate(LISTEN);
  assert.ok(cleaned.quiet < bypassed.quiet - 10, JSON.stringify({ cleaned, bypassed }));
  assert.ok(cleaned.loud > bypassed.loud - 3, JSON.stringify({ cleaned, bypassed }));
});

const APP = `
  import { Denoiser } from 'quorral_valto_web';
  const context = new OfflineAudioContext(1, 48000, 48000);
  const node = await Denoiser.create(context, { model: 'small_NC_8k', voice: false });
  const source = new ConstantSourceNode(context);
  source.connect(node).connect(context.destination);
  await context.startRendering();
  document.title = 'latency ' + Math.round(1000 * node.latency);`;

test('esbuild and Vite build applications with it', { skip }, async (t) => {
  const app = path.join(folder, 'app');
  const built = (name) => path.join(folder, name);
  mkdirSync(path.join(app, 'node_modules'), { recursive: true });
  symlinkSync(path.dirname(dist), path.join(app, 'node_modules/quorral_valto_web'));
  writeFileSync(path.join(app, 'main.js'), APP);
  const page =
    '<!doctype html><link rel="icon" href="data:,"><script type="module" src="./main.js"></script>';
  writeFileSync(path.join(app, 'index.html'), page);
  const entry = { entryPoints: [path.join(app, 'main.js')], outdir: built('esbuild') };
  await esbuild.build({
    ...entry,
    bundle: true,
    format: 'esm',
    target: 'es2022',
    logLevel: 'error',
  });
  for (const file of ['processor.mjs', 'morva_sdk.wasm', 'models']) {
    cpSync(path.join(dist, file), path.join(built('esbuild'), file), { recursive: true });
  }
  writeFileSync(path.join(built('esbuild'), 'index.html'), page);
  const build = { outDir: built('vite'), target: 'es2022', emptyOutDir: true };
  await vite.build({ root: app, build, logLevel: 'error' });
  assert.ok(readdirSync(path.join(built('vite'), 'assets')).some((name) => name.endsWith('.wasm')));
  for (const name of ['esbuild', 'vite']) {
    const own = await serveFolder(built(name));
    t.after(() => own.close());
    const opened = await openPage(browser, own.url);
    await opened.page.waitForFunction(() => document.title !== '');
    assert.match(await opened.page.title(), /^latency [1-4]\d$/, name);
    assert.deepEqual(opened.complaints, [], name);
  }
});

// The live page in a headless browser whose microphone plays the bundled noisy recording.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { mkdtempSync, readFileSync, rmSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { after, before, test } from 'node:test';
import { findChromium, openBrowser, openPage, recording } from '../browser.mjs';
import { directly, serve } from './harness.mjs';

const underSanitizer = (process.env.LD_PRELOAD ?? '').includes('asan');
const skip =
  (findChromium() === null && 'no Chromium found: set CHROMIUM or install it') ||
  (underSanitizer && 'the sanitized module is tested without a browser, by server.test.mjs');

/** A test that needs the browser. */
const browsing = (name, body) => test(name, { skip }, body);

let browser;
let folder;
before(async () => {
  if (skip) return;
  folder = mkdtempSync(path.join(os.tmpdir(), 'quorral-page-'));
  browser = await openBrowser(folder);
});
after(async () => {
  await browser?.close();
  if (folder) rmSync(folder, { recursive: true });
});

/** A page of its own with a server of its own. */
async function visit(t, options = {}) {
  const server = await serve(t);
  const { page, complaints } = await openPage(browser, server.url, options);
  t.after(() => page.close());
  await page.locator('#record:enabled').waitFor();
  const problem = (hasText) => page.locator('#problem-text', { hasText }).waitFor();
  return { page, server, complaints, problem };
}

/** A mono 16-bit WAV file that a button downloads. */
async function download(page, button) {
  const [file] = await Promise.all([page.waitForEvent('download'), page.click(button)]);
  const bytes = readFileSync(await file.path());
  assert.equal(bytes.toString('latin1', 0, 4), 'RIFF');
  assert.equal(bytes.readUInt32LE(40), bytes.length - 44);
  const samples = new Int16Array(new Uint8Array(bytes.subarray(44)).buffer);
  return { name: file.suggestedFilename(), samples, rate: bytes.readUInt32LE(24) };
}

/** Waits until a take is finished; what it gives away: { original, cleaned, seconds }. */
async function finished(page) {
  await page.locator('#save:enabled').waitFor();
  const original = await download(page, '#save-original');
  const cleaned = await download(page, '#save');
  assert.equal(cleaned.samples.length, original.samples.length);
  return { original, cleaned, seconds: original.samples.length / original.rate };
}

/** The page's own figure: the pauses are at least ten decibels quieter. */
const pausesAreQuiet = async (page) =>
  assert.match(await page.locator('#pauses').textContent(), /^[1-5]\d dB quieter$/);

const RAW = '-t raw -e signed -b 16 -'.split(' ');

/** A sound file that sox makes. */
function made(name, channels, options, effects) {
  const file = path.join(folder, name);
  const words = `-n ${options} -c ${channels}`.split(' ');
  execFileSync('sox', [...words, file, ...effects.split(' ')]);
  return file;
}

/** Waits until the take has that many seconds. */
const recorded = (page, seconds) =>
  page.waitForFunction((least) => {
    return Number.parseFloat(document.getElementById('length').textContent) > least;
  }, seconds);

// Tells, per audio context, how loud everything is that reaches the loudspeaker.
const TAP = `
  const connect = AudioNode.prototype.connect;
  AudioNode.prototype.connect = function (target, ...rest) {
    if (target instanceof AudioDestinationNode) {
      globalThis.loudspeaker ??= new AnalyserNode(target.context, { fftSize: 8192 });
      connect.call(this, globalThis.loudspeaker);
    }
    return connect.call(this, target, ...rest);
  };
  globalThis.loudness = (last = new Float32Array(8192)) => {
    globalThis.loudspeaker.getFloatTimeDomainData(last);
    return Math.max(...last.map(Math.abs));
  };`;

browsing('a recording survives its connection; the next one is heard when asked', async (t) => {
  const { page, server, complaints, problem } = await visit(t, { prelude: TAP });
  await page.click('#record');
  await recorded(page, 1.5);
  await server.close();
  await problem('the server ends');
  assert.equal(await page.locator('#status').textContent(), 'Not connected.');
  await page.click('#retry');
  await problem('Is it still running?');
  await serve(t, { port: Number(new URL(server.url).port) });
  await page.click('#retry');
  const { seconds } = await finished(page);
  assert.ok(seconds > 1.5);

  complaints.length = 0; // of the lost connection
  await page.click('#record');
  await recorded(page, seconds + 1);
  assert.equal(await page.evaluate(() => globalThis.loudness()), 0);
  await page.check('#monitor');
  await page.waitForFunction(() => globalThis.loudness() > 0.01);
  await page.uncheck('#monitor');
  await page.waitForFunction(() => globalThis.loudness() === 0);
  await recorded(page, seconds + 4);
  await page.selectOption('#model', 'small_NC_8k');
  await page.getByText('then small_NC_8k').waitFor();
  await page.click('#record');
  assert.ok((await finished(page)).seconds > seconds + 4);
  await pausesAreQuiet(page);
  assert.deepEqual(complaints, []);
});

browsing('a dropped file comes back cleaned, drawn, and again from another model', async (t) => {
  const { page, complaints } = await visit(t);
  // As a person would drop it.
  await page.evaluate(async () => {
    const bytes = await (await fetch('example.flac')).arrayBuffer();
    const dataTransfer = new DataTransfer();
    dataTransfer.items.add(new File([bytes], 'meeting.notes.flac', { type: 'audio/flac' }));
    for (const type of ['dragover', 'drop']) {
      document.body.dispatchEvent(new DragEvent(type, { dataTransfer, bubbles: true }));
    }
  });
  const first = await finished(page);
  assert.equal(first.cleaned.name, 'meeting.notes-cleaned.wav');
  const { samples, rate } = first.original;
  assert.equal(rate, 48000); // the file's, not the loudspeaker's
  const bytes = execFileSync('sox', [recording, ...RAW], { maxBuffer: 2 ** 24 });
  const file = new Int16Array(new Uint8Array(bytes).buffer);
  assert.equal(samples.length, file.length);
  assert.ok(samples.every((sample, i) => Math.abs(sample - file[i]) <= 1)); // the decoder's floats
  assert.deepEqual(first.cleaned.samples, directly(samples, rate, 'full_NC-ca03f4').samples);
  await pausesAreQuiet(page);
  await page.click('#play');
  await page.selectOption('#model', 'small_NC'); // and at once, in the middle of the sound, another
  await page.selectOption('#model', 'small_NC_8k');
  await page.getByText('cleaned with small_NC_8k').waitFor();
  const second = await finished(page);
  assert.deepEqual(second.original.samples, first.original.samples);
  assert.notDeepEqual(second.cleaned.samples, first.cleaned.samples);
  await pausesAreQuiet(page);

  // Before and after are heard at the same position. Two ramps, one the other's negative: what is heard tells side and position.
  const heard = await page.evaluate(async () => {
    const { Player } = await import('./player.mjs');
    const context = new AudioContext();
    const tap = new AnalyserNode(context);
    tap.connect(context.destination);
    Object.defineProperty(context, 'destination', { value: tap });
    const player = new Player(context);
    const before = Int16Array.from({ length: 32000 }, (_, i) => 3000 + i / 4);
    const after = before.map((sample) => -sample);
    // One callback a sample would hold up the page for seconds when a take is long.
    Float32Array.from = () => {
      throw new Error('a callback for every sample');
    };
    player.load({ before, after, rate: 8000 });
    await player.play();
    const values = [];
    const last = new Float32Array(tap.fftSize);
    for (const side of ['after', 'before', 'after', 'before']) {
      player.listenTo(side);
      const started = context.currentTime;
      while (context.currentTime < started + 0.25) {
        await new Promise((resolve) => setTimeout(resolve, 20));
      }
      tap.getFloatTimeDomainData(last);
      values.push(last.at(-1) * 32768);
    }
    player.pause();
    return values;
  });
  assert.deepEqual(heard.map(Math.sign), [-1, 1, -1, 1]);
  const positions = heard.map(Math.abs);
  const sorted = positions.toSorted((a, b) => a - b);
  assert.deepEqual(positions, sorted);
  assert.ok(positions[0] > 3000);
  assert.deepEqual(complaints, []);
});

browsing('what cannot be opened is put in words, and the page still works', async (t) => {
  const { page, complaints, problem } = await visit(t, {
    prelude: `MediaDevices.prototype.getUserMedia = async () => {
      throw new DOMException('x', 'NotAllowedError');
    };`,
  });
  await page.click('#record');
  await problem(/may not use the microphone/);
  await page.setInputFiles('#file', made('long.wav', 1, '-r 8000 -b 8', 'trim 0 601'));
  await problem(/"long\.wav" lasts about 11 minutes; this page takes up to 10 minutes/);
  const text = { name: 'x.mp3', mimeType: 'audio/mpeg', buffer: Buffer.from('hello') };
  await page.setInputFiles('#file', text);
  await problem(/"x\.mp3" is no sound/);
  assert.ok(await page.locator('#retry').isHidden());
  assert.match(await page.locator('#status').textContent(), /^Ready/);
  await page.setInputFiles('#file', made('s.ogg', 2, '-r 22050', 'synth 1.5 pinknoise'));
  assert.ok(Math.abs((await finished(page)).seconds - 1.5) < 0.05);
  assert.ok(await page.locator('#problem').isHidden());
  await page.setInputFiles('#file', made('s.wav', 1, '-r 22050', 'synth 1.5 pinknoise'));
  await page.locator('#status', { hasText: 'converted from 22050 Hz, at 48000 Hz' }).waitFor();
  assert.deepEqual(complaints, []);
});

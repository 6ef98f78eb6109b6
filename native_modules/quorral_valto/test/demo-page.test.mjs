// The live page in a headless browser whose microphone plays the bundled noisy recording.
import assert from 'node:assert/strict';
import { mkdtempSync, readFileSync, rmSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { after, before, test } from 'node:test';
import { findChromium, openBrowser, openPage, sox, TIMEOUT_MS } from './support/browser.mjs';
import { serve } from './support/demo.mjs';
import { NC_MODELS, underSanitizer } from './support/package.mjs';

const skip =
  (findChromium() === null && 'no Chromium found: set CHROMIUM or install it') ||
  (underSanitizer && 'the sanitized module is tested without a browser, by demo-server.test.mjs');
const PERIOD_MS = 100; // between looks at the page

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

/** A page of its own with a server of its own; expects no complaints in the end unless told. */
async function visit(t, { mayComplain = false, demo, ...options } = {}) {
  const { url } = demo ?? (await serve(t));
  const { page, complaints } = await openPage(browser, url, options);
  t.after(() => page.close());
  const finished = () => page.locator('#save:enabled').waitFor();
  const end = () => mayComplain || assert.deepEqual(complaints, []);
  await page.locator('#record:enabled').waitFor();
  return { page, finished, end };
}

const status = (page) => page.locator('#status').textContent();
const problem = (page) => page.locator('#problem-text').textContent();

/** What a button downloads: { name, samples, rate } of a mono 16-bit WAV file. */
async function download(page, button) {
  const [file] = await Promise.all([page.waitForEvent('download'), page.click(button)]);
  const bytes = readFileSync(await file.path());
  assert.equal(bytes.toString('latin1', 0, 4), 'RIFF');
  assert.equal(bytes.readUInt32LE(40), bytes.length - 44);
  const samples = new Int16Array(
    bytes.buffer.slice(bytes.byteOffset + 44, bytes.byteOffset + bytes.length),
  );
  return { name: file.suggestedFilename(), samples, rate: bytes.readUInt32LE(24) };
}

async function downloadBoth(page) {
  const original = await download(page, '#save-original');
  const cleaned = await download(page, '#save');
  assert.equal(cleaned.samples.length, original.samples.length);
  return { original, cleaned };
}

/** Change of level in dB over the quarter of the frames in which the original is quietest: the pauses. */
function changeInPauses({ original, cleaned }) {
  const size = original.rate / 100;
  const power = (samples, k) => {
    const frame = samples.subarray(k * size, (k + 1) * size);
    return frame.reduce((sum, x) => sum + x * x, 0) / size;
  };
  const frames = Array.from({ length: Math.floor(original.samples.length / size) }, (_, k) => ({
    before: power(original.samples, k),
    after: power(cleaned.samples, k),
  }));
  // A browser that cannot keep up records gaps of nothing.
  const sounding = frames.filter((frame) => frame.before > 1).sort((a, b) => a.before - b.before);
  const pauses = sounding.slice(0, sounding.length / 4);
  assert.ok(pauses.length > 30, `only ${sounding.length} frames hold sound`);
  const sum = (key) => pauses.reduce((total, frame) => total + frame[key], 0);
  return 10 * Math.log10(sum('after') / sum('before'));
}

async function until(condition) {
  const limit = AbortSignal.timeout(TIMEOUT_MS);
  while (!(await condition())) {
    limit.throwIfAborted();
    await new Promise((resolve) => setTimeout(resolve, PERIOD_MS));
  }
}

// Asked once per refresh of the screen.
const SCORE_HAS_BEEN_LOW_AND_HIGH = () => {
  globalThis.scores ??= [];
  globalThis.scores.push(document.getElementById('voice').value);
  // 0 is also where the meter stands before anything is measured.
  const isMoving = globalThis.scores.some((score) => score > 0 && score < 0.5);
  return isMoving && Math.max(...globalThis.scores) > 0.5;
};

/** Waits until the take has that many seconds. */
const recorded = (page, seconds) =>
  page.waitForFunction((least) => {
    return Number.parseFloat(document.getElementById('length').textContent) > least;
  }, seconds);

test('a recording comes back cleaner while meters and model move', { skip }, async (t) => {
  const { page, finished, end } = await visit(t);
  await page.click('#record');
  await page.locator('.recording').waitFor();
  await page.waitForFunction(SCORE_HAS_BEEN_LOW_AND_HIGH);
  await recorded(page, 6);
  const noiseLevel = await page.locator('#noise').evaluate((meter) => meter.value);
  assert.ok(noiseLevel > -60 && noiseLevel < -15, `${noiseLevel} dB`);
  await page.selectOption('#model', NC_MODELS[0]);
  await page.getByText(`then ${NC_MODELS[0]}`).waitFor();
  await page.click('#record');
  await finished();
  const both = await downloadBoth(page);
  assert.ok(both.original.samples.length > 6 * both.original.rate);
  const change = changeInPauses(both);
  t.diagnostic(`noise in pauses: ${change.toFixed(1)} dB`);
  assert.ok(change < -10, `${change} dB`);
  end();
});

/** Drops a file of the server's on the page, as a person would. */
const dropExample = (page) =>
  page.evaluate(async () => {
    const bytes = await (await fetch('example.flac')).arrayBuffer();
    const dataTransfer = new DataTransfer();
    dataTransfer.items.add(new File([bytes], 'meeting.notes.flac', { type: 'audio/flac' }));
    for (const type of ['dragover', 'drop']) {
      document.body.dispatchEvent(new DragEvent(type, { dataTransfer, bubbles: true }));
    }
  });

test('a dropped file comes back cleaned and as long; another model cleans it again', {
  skip,
}, async (t) => {
  const { page, finished, end } = await visit(t);
  await dropExample(page);
  await finished();
  const first = await downloadBoth(page);
  assert.equal(first.cleaned.name, 'meeting.notes-cleaned.wav');
  // The browser brings it to its own rate.
  assert.ok(Math.abs(first.original.samples.length - 10 * first.original.rate) <= 1);
  assert.ok(changeInPauses(first) < -10);

  await page.click('#play');
  await page.selectOption('#model', NC_MODELS[0]);
  await page.getByText(`cleaned with ${NC_MODELS[0]}`).waitFor();
  await finished();
  const second = await downloadBoth(page);
  assert.deepEqual(second.original.samples, first.original.samples);
  assert.notDeepEqual(second.cleaned.samples, first.cleaned.samples);
  assert.ok(changeInPauses(second) < -10);
  end();
});

test('the pictures show the sound', { skip }, async (t) => {
  const { page, finished, end } = await visit(t);
  await page.click('#example');
  await finished();
  const brightness = (id) =>
    page.locator(id).evaluate((canvas) => {
      const { width, height } = canvas;
      const pixels = canvas.getContext('2d').getImageData(0, 0, width, height).data;
      return (
        pixels.reduce((sum, value, i) => sum + (i % 4 === 3 ? 0 : value), 0) / (width * height * 3)
      );
    });
  // Drawn with the next refresh of the screen.
  await until(async () => (await brightness('#after')) > 20);
  const [noisy, cleaned] = [await brightness('#before'), await brightness('#after')];
  assert.ok(noisy > 1.5 * cleaned, `${noisy}, ${cleaned}`);
  assert.match(await page.locator('#pauses').textContent(), /^−[12345]\d dB$/);
  end();
});

test('before and after are heard at the same position', { skip }, async (t) => {
  const { page, finished, end } = await visit(t);
  await page.click('#example');
  await finished();
  await page.click('#play');
  await page.locator('#play', { hasText: 'Pause' }).waitFor();
  for (const side of ['before', 'after']) {
    const position = () => page.locator('#position').evaluate((slider) => Number(slider.value));
    const then = await position();
    await page.check(`input[value="${side}"]`);
    await until(async () => (await position()) !== then);
    assert.ok((await position()) > then, 'goes on from where it was');
  }

  // Two ramps, one the other's negative: what is heard tells side and position.
  const heard = await page.evaluate(async () => {
    const { Player } = await import('./player.mjs');
    const context = new AudioContext();
    const tap = new AnalyserNode(context);
    tap.connect(context.destination);
    Object.defineProperty(context, 'destination', { value: tap });
    const player = new Player(context);
    const rate = 8000;
    const before = Int16Array.from({ length: 4 * rate }, (_, i) => 3000 + i / 4);
    player.load({ before, after: before.map((sample) => -sample), rate });
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
  assert.deepEqual(
    positions,
    [...positions].sort((a, b) => a - b),
  );
  assert.ok(positions[0] > 3000);
  end();
});

// Collects, per audio context, everything that reaches the loudspeaker.
const TAP = `
  const connect = AudioNode.prototype.connect;
  AudioNode.prototype.connect = function (target, ...rest) {
    if (target instanceof AudioDestinationNode) {
      globalThis.loudspeaker ??= new AnalyserNode(target.context, { fftSize: 8192 });
      connect.call(this, globalThis.loudspeaker);
    }
    return connect.call(this, target, ...rest);
  };
  globalThis.loudness = () => {
    const last = new Float32Array(8192);
    globalThis.loudspeaker.getFloatTimeDomainData(last);
    return Math.max(...last.map(Math.abs));
  };`;

test('the microphone is heard live only when asked for', { skip }, async (t) => {
  const { page, finished, end } = await visit(t, { prelude: TAP });
  await page.click('#record');
  await recorded(page, 3);
  assert.equal(await page.evaluate(() => globalThis.loudness()), 0);
  await page.check('#monitor');
  await page.waitForFunction(() => globalThis.loudness() > 0.01);
  await page.uncheck('#monitor');
  await page.waitForFunction(() => globalThis.loudness() === 0);
  await page.click('#record');
  await finished();
  end();
});

test('a microphone that cannot be opened is put in words', { skip }, async (t) => {
  const { page, finished, end } = await visit(t, {
    prelude: `MediaDevices.prototype.getUserMedia = async () => {
      throw new DOMException('x', globalThis.reason);
    };`,
  });
  for (const [reason, pattern] of [
    ['NotAllowedError', /may not use the microphone/],
    ['NotFoundError', /No microphone was found/],
    ['NotReadableError', /in use by another program/],
    ['AbortError', /cannot be opened: x/],
  ]) {
    await page.evaluate((name) => {
      globalThis.reason = name;
    }, reason);
    await page.click('#record');
    await page.locator('#problem-text', { hasText: pattern }).waitFor();
  }
  await page.click('#example'); // the page still works
  await finished();
  assert.ok(await page.locator('#problem').isHidden());
  end();
});

test('files that cannot be used are refused in words', { skip }, async (t) => {
  const { page, finished, end } = await visit(t);
  const long = path.join(folder, 'long.wav');
  sox('-n', '-r', '8000', '-b', '8', '-c', '1', long, 'trim', '0', '601');
  const cases = [
    [long, /"long\.wav" lasts about 11 minutes; this page takes up to 10 minutes/],
    [
      { name: 'x.mp3', mimeType: 'audio/mpeg', buffer: Buffer.from('hello') },
      /"x\.mp3" is no sound/,
    ],
  ];
  for (const [file, pattern] of cases) {
    await page.setInputFiles('#file', file);
    await page.locator('#problem-text', { hasText: pattern }).waitFor();
  }
  const stereo = path.join(folder, 'stereo.ogg');
  sox('-n', '-r', '22050', '-c', '2', stereo, 'synth', '1.5', 'pinknoise');
  await page.setInputFiles('#file', stereo);
  await finished();
  const { original } = await downloadBoth(page);
  assert.equal(Math.round((10 * original.samples.length) / original.rate), 15);
  end();
});

test('a lost connection is said, and what was recorded is cleaned after a new one', {
  skip,
}, async (t) => {
  const demo = await serve(t);
  const { page, finished } = await visit(t, { demo, mayComplain: true });
  await page.click('#record');
  await recorded(page, 1.5);
  await demo.close();
  await page.locator('#problem').waitFor();
  assert.match(await problem(page), /the server ends/);
  assert.equal(await status(page), 'Not connected.');
  await page.click('#retry');
  await page.locator('#problem-text', { hasText: 'Is "npm run demo" still running?' }).waitFor();
  await serve(t, { port: Number(new URL(demo.url).port) });
  await page.click('#retry');
  await finished();
  const { original } = await downloadBoth(page);
  assert.ok(original.samples.length > 1.5 * original.rate);
});

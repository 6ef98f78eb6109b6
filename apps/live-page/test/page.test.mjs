// The live page in a headless browser whose microphone plays the bundled noisy recording.
import assert from 'node:assert/strict';
import { execFileSync } from 'node:child_process';
import { mkdtempSync, readFileSync, rmSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { after, before, test } from 'node:test';
import { findChromium, openBrowser, openPage, serve } from './harness.mjs';

const underSanitizer = (process.env.LD_PRELOAD ?? '').includes('asan');
const skip =
  (findChromium() === null && 'no Chromium found: set CHROMIUM or install it') ||
  (underSanitizer && 'the sanitized module is tested without a browser, by server.test.mjs');

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

/** A page of its own with a server of its own; `end` expects that nothing was complained about. */
async function visit(t, options = {}) {
  const server = await serve(t);
  const { page, complaints } = await openPage(browser, server.url, options);
  t.after(() => page.close());
  await page.locator('#record:enabled').waitFor();
  const finished = () => page.locator('#save:enabled').waitFor();
  const end = () => assert.deepEqual(complaints, []);
  return { page, server, finished, end };
}

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
  const power = ({ samples }, k) =>
    samples.subarray(k * size, (k + 1) * size).reduce((sum, x) => sum + x * x, 0);
  const frames = Array.from({ length: Math.floor(original.samples.length / size) }, (_, k) => k);
  // A browser that cannot keep up records gaps of nothing.
  const sounding = frames.filter((k) => power(original, k) > size);
  sounding.sort((a, b) => power(original, a) - power(original, b));
  const pauses = sounding.slice(0, sounding.length / 4);
  assert.ok(pauses.length > 30, `only ${sounding.length} frames hold sound`);
  const sum = (sound) => pauses.reduce((total, k) => total + power(sound, k), 0);
  return 10 * Math.log10(sum(cleaned) / sum(original));
}

/** Waits until the take has that many seconds. */
const recorded = (page, seconds) =>
  page.waitForFunction((least) => {
    return Number.parseFloat(document.getElementById('length').textContent) > least;
  }, seconds);

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

// Asked once per refresh of the screen. 0 is also where the meter stands before anything is measured.
const SCORE_HAS_BEEN_LOW_AND_HIGH = () => {
  globalThis.scores ??= [];
  globalThis.scores.push(document.getElementById('voice').value);
  const isMoving = globalThis.scores.some((score) => score > 0 && score < 0.5);
  return isMoving && Math.max(...globalThis.scores) > 0.5;
};

test('a recording comes back cleaner while meters and model move; it is heard when asked', {
  skip,
}, async (t) => {
  const { page, finished, end } = await visit(t, { prelude: TAP });
  await page.click('#record');
  await page.locator('.recording').waitFor();
  await page.waitForFunction(SCORE_HAS_BEEN_LOW_AND_HIGH);
  await recorded(page, 3);
  assert.equal(await page.evaluate(() => globalThis.loudness()), 0);
  await page.check('#monitor');
  await page.waitForFunction(() => globalThis.loudness() > 0.01);
  await page.uncheck('#monitor');
  await page.waitForFunction(() => globalThis.loudness() === 0);
  await recorded(page, 6);
  const noiseLevel = await page.locator('#noise').evaluate((meter) => meter.value);
  assert.ok(noiseLevel > -60 && noiseLevel < -15, `${noiseLevel} dB`);
  await page.selectOption('#model', 'small_NC_8k');
  await page.getByText('then small_NC_8k').waitFor();
  await page.click('#record');
  await finished();
  const both = await downloadBoth(page);
  assert.ok(both.original.samples.length > 6 * both.original.rate);
  assert.ok(changeInPauses(both) < -10, `${changeInPauses(both)} dB`);
  end();
});

test('a dropped file comes back cleaned, as long, and drawn; another model cleans it again', {
  skip,
}, async (t) => {
  const { page, finished, end } = await visit(t);
  // As a person would drop it.
  await page.evaluate(async () => {
    const bytes = await (await fetch('example.flac')).arrayBuffer();
    const dataTransfer = new DataTransfer();
    dataTransfer.items.add(new File([bytes], 'meeting.notes.flac', { type: 'audio/flac' }));
    for (const type of ['dragover', 'drop']) {
      document.body.dispatchEvent(new DragEvent(type, { dataTransfer, bubbles: true }));
    }
  });
  await finished();
  const first = await downloadBoth(page);
  assert.equal(first.cleaned.name, 'meeting.notes-cleaned.wav');
  // The browser brings it to its own rate.
  assert.ok(Math.abs(first.original.samples.length - 10 * first.original.rate) <= 1);
  assert.ok(changeInPauses(first) < -10);
  assert.match(await page.locator('#pauses').textContent(), /^−[12345]\d dB$/);
  // Drawn with the next refresh of the screen.
  await page.waitForFunction(() => {
    const [noisy, cleaned] = ['before', 'after'].map((id) => {
      const canvas = document.getElementById(id);
      const { width, height } = canvas;
      const pixels = canvas.getContext('2d').getImageData(0, 0, width, height).data;
      return pixels.reduce((sum, value, i) => sum + (i % 4 === 3 ? 0 : value), 0) / width / height;
    });
    return cleaned > 60 && noisy > 1.5 * cleaned;
  });

  await page.click('#play');
  await page.selectOption('#model', 'small_NC_8k');
  await page.getByText('cleaned with small_NC_8k').waitFor();
  await finished();
  const second = await downloadBoth(page);
  assert.deepEqual(second.original.samples, first.original.samples);
  assert.notDeepEqual(second.cleaned.samples, first.cleaned.samples);
  assert.ok(changeInPauses(second) < -10);
  end();
});

test('before and after are heard at the same position', { skip }, async (t) => {
  const { page, end } = await visit(t);
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
    const after = before.map((sample) => -sample);
    // One callback a sample would hold up the page for seconds when a take is long.
    Float32Array.from = () => {
      throw new Error('a callback for every sample');
    };
    player.load({ before, after, rate });
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
    positions.toSorted((a, b) => a - b),
  );
  assert.ok(positions[0] > 3000);
  end();
});

test('what cannot be opened is put in words, and the page still works', { skip }, async (t) => {
  const { page, finished, end } = await visit(t, {
    prelude: `MediaDevices.prototype.getUserMedia = async () => {
      throw new DOMException('x', globalThis.reason);
    };`,
  });
  const problem = (hasText) => page.locator('#problem-text', { hasText }).waitFor();
  for (const [reason, pattern] of [
    ['NotAllowedError', /may not use the microphone/],
    ['NotFoundError', /No microphone was found/],
    ['AbortError', /cannot be opened: x/],
  ]) {
    await page.evaluate((name) => {
      globalThis.reason = name;
    }, reason);
    await page.click('#record');
    await problem(pattern);
  }
  const sox = (...args) => execFileSync('sox', args);
  const long = path.join(folder, 'long.wav');
  sox('-n', '-r', '8000', '-b', '8', '-c', '1', long, 'trim', '0', '601');
  await page.setInputFiles('#file', long);
  await problem(/"long\.wav" lasts about 11 minutes; this page takes up to 10 minutes/);
  const text = { name: 'x.mp3', mimeType: 'audio/mpeg', buffer: Buffer.from('hello') };
  await page.setInputFiles('#file', text);
  await problem(/"x\.mp3" is no sound/);
  const stereo = path.join(folder, 'stereo.ogg');
  sox('-n', '-r', '22050', '-c', '2', stereo, 'synth', '1.5', 'pinknoise');
  await page.setInputFiles('#file', stereo);
  await finished();
  assert.ok(await page.locator('#problem').isHidden());
  const { original } = await downloadBoth(page);
  assert.equal(Math.round((10 * original.samples.length) / original.rate), 15);
  end();
});

test('a lost connection is said, and what was recorded is cleaned after a new one', {
  skip,
}, async (t) => {
  const { page, server, finished } = await visit(t);
  await page.click('#record');
  await recorded(page, 1.5);
  await server.close();
  await page.locator('#problem-text', { hasText: 'the server ends' }).waitFor();
  assert.equal(await page.locator('#status').textContent(), 'Not connected.');
  await page.click('#retry');
  await page.locator('#problem-text', { hasText: 'Is it still running?' }).waitFor();
  await serve(t, { port: Number(new URL(server.url).port) });
  await page.click('#retry');
  await finished();
  const { original } = await downloadBoth(page);
  assert.ok(original.samples.length > 1.5 * original.rate);
});

// A page without a server: an engine of its own that lets half of everything through.
const HALVING_PAGE = `
  import { Conversation } from './conversation.mjs';
  import { Link } from './link.mjs';
  import { startPage } from './live-page.mjs';

  class Session {
    constructor({ sampleRate, frameMs }) {
      this.frameSize = sampleRate * frameMs / 1000;
      this.latency = 0;
    }
    close() {}
  }
  const engine = {
    NoiseCanceller: class extends Session {
      process(frame, output) { return output.set(frame.map((x) => x / 2)), output; }
    },
    VoiceActivityDetector: class extends Session {
      process() { return 0; }
    },
  };
  class InThisPage extends Link {
    #conversation = new Conversation(engine, ['half'], (answer) => {
      const message = answer instanceof ArrayBuffer ? answer : JSON.stringify(answer);
      setTimeout(() => this.receive(message));
    });
    isOpen = true;
    async connect() {
      const models = [{ name: 'half', rate: 48000 }];
      const hello = { models, sampleRates: [44100, 48000], maxSeconds: 60, example: null };
      this.receive(JSON.stringify({ type: 'hello', ...hello }));
    }
    post(message) {
      const samples = typeof message === 'string' ? null : message.slice();
      this.#conversation.take(samples ? { type: 'samples', samples } : JSON.parse(message));
    }
  }
  startPage(new InThisPage());`;

test('another link cleans the sound elsewhere', { skip }, async (t) => {
  const { page, finished, end } = await visit(t, { main: HALVING_PAGE });
  const tone = path.join(folder, 'tone.wav');
  execFileSync('sox', ['-n', '-r', '48000', '-c', '1', tone, 'synth', '12', 'sine', '440']);
  await page.setInputFiles('#file', tone);
  await finished();
  const { original, cleaned } = await downloadBoth(page);
  assert.ok(original.samples.length >= 12 * original.rate - 1);
  assert.ok(original.samples.some((sample) => sample > 10000));
  assert.deepEqual(
    cleaned.samples,
    original.samples.map((sample) => sample / 2),
  );
  end();
});

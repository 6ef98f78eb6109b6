// The page and a live node in Firefox, which plays only where there is a sound server: one of its own, into nothing.
import assert from 'node:assert/strict';
import { spawn } from 'node:child_process';
import { existsSync, mkdtempSync, rmSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { test } from 'node:test';
import puppeteer from 'puppeteer-core';
import { findProgram } from '../../apps/live-page/browser.mjs';
import { serveFolder } from '../scripts/serve.mjs';

const executablePath = process.env.FIREFOX ?? findProgram('firefox-esr', 'firefox');
const soundServer = findProgram('pulseaudio');
const skip = !(executablePath && soundServer) && 'needs Firefox and PulseAudio';
const TIMEOUT_MS = 180_000;

// A node on a sound that lasts; the fake microphone of this browser is a tone.
const PLAY = async () => {
  const { Denoiser } = await import('./quorral_valto_web/index.mjs');
  const context = new AudioContext({ sampleRate: 48000 });
  const node = await Denoiser.create(context);
  const encoded = await (await fetch('example.flac')).arrayBuffer();
  const buffer = await context.decodeAudioData(encoded);
  const source = new AudioBufferSourceNode(context, { buffer });
  source.connect(node).connect(context.destination);
  source.start();
  const scores = [];
  node.addEventListener('meters', ({ detail }) => scores.push(detail.voice));
  while (scores.length < 100) await new Promise((resolve) => setTimeout(resolve, 50));
  node.close();
  return [Math.min(...scores), Math.max(...scores)];
};

/** The environment of a program that plays into nothing, once there is one. */
async function silence(t) {
  const folder = mkdtempSync(path.join(os.tmpdir(), 'morva-sound-'));
  const env = { ...process.env, XDG_RUNTIME_DIR: folder };
  const modules = ['module-null-sink', 'module-native-protocol-unix'].flatMap((name) => [
    '-L',
    name,
  ]);
  const server = spawn(soundServer, ['-n', '--exit-idle-time=-1', ...modules], {
    env,
    stdio: 'ignore',
  });
  t.after(() => {
    server.kill();
    rmSync(folder, { recursive: true, force: true });
  });
  while (!existsSync(path.join(folder, 'pulse/native'))) {
    assert.equal(server.exitCode, null, 'the sound server ended');
    await new Promise((resolve) => setTimeout(resolve, 100));
  }
  return env;
}

test('Firefox runs the page and the node', { skip }, async (t) => {
  const server = await serveFolder();
  t.after(() => server.close());
  const browser = await puppeteer.launch({
    browser: 'firefox',
    executablePath,
    headless: true,
    env: await silence(t),
    timeout: TIMEOUT_MS,
    protocolTimeout: TIMEOUT_MS,
    extraPrefsFirefox: { 'media.autoplay.default': 0 },
  });
  t.after(() => browser.close());
  const page = await browser.newPage();
  const complaints = [];
  page.on('pageerror', (error) => complaints.push(String(error)));
  await page.goto(`${server.url}index.html`);
  const options = { visible: true, timeout: TIMEOUT_MS };
  await page.waitForSelector('#example:not([disabled])', options);
  await page.click('#example');
  await page.waitForSelector('#save:not([disabled])', { timeout: TIMEOUT_MS });
  assert.match(await page.$eval('#pauses', (node) => node.textContent), /^[1-5]\d dB quieter$/);
  const [lowest, highest] = await page.evaluate(PLAY);
  assert.ok(lowest < 0.4 && highest > 0.8, `${lowest} to ${highest}`);
  assert.deepEqual(complaints, []);
});

// A headless browser whose microphone plays the bundled noisy recording, and the live page in it.
import { execFileSync } from 'node:child_process';
import { existsSync } from 'node:fs';
import path from 'node:path';
import { chromium } from 'playwright-core';
import { testDir } from './package.mjs';

export const TIMEOUT_MS = 180_000;

/** Path of the browser, or null: $CHROMIUM, else one on the search path. */
export function findChromium() {
  if (process.env.CHROMIUM) return process.env.CHROMIUM;
  const folders = (process.env.PATH ?? '').split(path.delimiter);
  const names = ['chromium', 'chromium-browser', 'google-chrome'];
  const files = names.flatMap((name) => folders.map((folder) => path.join(folder, name)));
  return files.find((file) => existsSync(file)) ?? null;
}

// Beside the suite when the packed package is tested, else where the project keeps it.
export const noisyRecording = [
  path.join(testDir, '..', 'noisy.flac'),
  path.join(testDir, '../../../examples/audio/noisy.flac'),
].find((file) => existsSync(file));

// Other programs are not run with what is preloaded into this one.
const { LD_PRELOAD: _, ...environment } = process.env;

/** Runs sox. */
export function sox(...args) {
  execFileSync('sox', args, { env: environment });
}

/** @param {string} folder where the microphone's file may lie */
export async function openBrowser(folder) {
  const microphone = path.join(folder, 'microphone.wav');
  sox(noisyRecording, '-b', '16', microphone);
  return chromium.launch({
    executablePath: findChromium(),
    env: environment,
    timeout: TIMEOUT_MS,
    args: [
      '--no-sandbox',
      '--disable-gpu',
      '--disable-quic',
      '--disable-dev-shm-usage',
      '--no-first-run',
      '--disable-background-networking',
      '--disable-component-update',
      '--disable-sync',
      '--use-fake-ui-for-media-stream',
      '--use-fake-device-for-media-stream',
      `--use-file-for-fake-audio-capture=${microphone}`,
    ],
  });
}

/**
 * A tab with the page, ready to be used.
 * @returns {Promise<{ page: import('playwright-core').Page, complaints: string[] }>} `complaints` grows
 *   with every console error, exception and failed request
 */
export async function openPage(browser, url, { prelude, ...options } = {}) {
  const page = await browser.newPage({ viewport: { width: 1220, height: 900 }, ...options });
  page.setDefaultTimeout(TIMEOUT_MS);
  const complaints = [];
  page.on('console', (message) => {
    if (message.type() === 'error') complaints.push(message.text());
  });
  page.on('pageerror', (error) => complaints.push(String(error)));
  page.on('requestfailed', (request) => {
    // Reading only a file's head ends its request early, which is no failure.
    if (!request.url().startsWith('blob:')) complaints.push(`failed: ${request.url()}`);
  });
  if (prelude) await page.addInitScript(prelude);
  await page.goto(url);
  return { page, complaints };
}

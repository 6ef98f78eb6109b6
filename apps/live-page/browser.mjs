// The live page in a headless browser whose microphone plays the bundled noisy recording: for the picture in
// the documents and for the tests.
import { execFileSync } from 'node:child_process';
import { existsSync } from 'node:fs';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { require } from './dependencies.mjs';

/** The bundled noisy recording. */
export const recording = fileURLToPath(new URL('../../examples/audio/noisy.flac', import.meta.url));
const TIMEOUT_MS = 180_000;

/** Path of the first of these programs on the search path, or null. */
export function findProgram(...names) {
  const folders = (process.env.PATH ?? '').split(path.delimiter);
  const files = names.flatMap((name) => folders.map((folder) => path.join(folder, name)));
  return files.find((file) => existsSync(file)) ?? null;
}

/** Path of the browser, or null: $CHROMIUM, else one on the search path. */
export const findChromium = () =>
  process.env.CHROMIUM ?? findProgram('chromium', 'chromium-browser', 'google-chrome');

/** @param {string} folder where the microphone's file may lie */
export async function openBrowser(folder) {
  const microphone = path.join(folder, 'microphone.wav');
  execFileSync('sox', [recording, '-b', '16', microphone]);
  return require('playwright-core').chromium.launch({
    executablePath: findChromium(),
    timeout: TIMEOUT_MS,
    args: [
      ...['--no-sandbox', '--disable-gpu', '--disable-quic', '--disable-dev-shm-usage'],
      ...['--no-first-run', '--disable-background-networking', '--disable-component-update'],
      ...['--use-fake-ui-for-media-stream', '--use-fake-device-for-media-stream'],
      `--use-file-for-fake-audio-capture=${microphone}`,
    ],
  });
}

/**
 * A tab with the page. `prelude` runs before the page's own code.
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
  page.on('requestfailed', (failed) => {
    // Reading only a file's head ends its request early, which is no failure.
    if (!failed.url().startsWith('blob:')) complaints.push(`failed: ${failed.url()}`);
  });
  if (prelude) await page.addInitScript(prelude);
  await page.goto(url);
  return { page, complaints };
}

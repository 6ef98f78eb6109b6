// Takes the picture of the live page for the documents: node apps/live-page/screenshot.mjs FILE.png [ADDRESS]
// ADDRESS: of the page as static files, already served; without it this package's own server is started.
// A headless browser opens the bundled recording and stops in the middle of listening to it.
import { execFileSync } from 'node:child_process';
import { mkdtempSync, rmSync, writeFileSync } from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { findChromium, openBrowser, openPage } from './browser.mjs';
import { startServer } from './server.mjs';

const [target, address] = process.argv.slice(2);
if (!target) throw new Error('usage: node apps/live-page/screenshot.mjs FILE.png [ADDRESS]');
if (findChromium() === null) throw new Error('No Chromium found: set CHROMIUM or install it.');

// A picture of noise hardly shrinks; 256 colours, undithered, are a third of the size.
const REDUCE = `
import sys
from PIL import Image
picture = Image.open(sys.argv[1]).convert("RGB").quantize(256, dither=Image.Dither.NONE)
picture.save(sys.argv[1], optimize=True)
`;

const folder = mkdtempSync(path.join(os.tmpdir(), 'quorral-page-'));
const browser = await openBrowser(folder);
const server = address ? { url: address, close() {} } : await startServer();
try {
  const { page } = await openPage(browser, server.url, { colorScheme: 'light' });
  await page.click('#example');
  await page.locator('#save:enabled').waitFor();
  // A place between the two sentences would show little: in the middle of a word.
  await page.locator('#position').fill('2.7');
  await page.locator('#voice-text', { hasText: /^0\.[5-9]/ }).waitFor();
  await page.locator('h1').hover();
  writeFileSync(target, await page.screenshot());
  execFileSync('/usr/bin/python3', ['-c', REDUCE, target]);
  console.log(`${target} written`);
} finally {
  await browser.close();
  await server.close();
  rmSync(folder, { recursive: true });
}

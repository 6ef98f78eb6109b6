// What the tests of the live page and its screenshot stand on: a server, a bare connection to it, and a
// headless browser whose microphone plays the bundled noisy recording.
import { execFileSync } from 'node:child_process';
import { once } from 'node:events';
import { existsSync } from 'node:fs';
import { request } from 'node:http';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { require } from '../dependencies.mjs';
import { startServer } from '../server.mjs';

const { WebSocket } = require('ws');
const recording = new URL('../../../examples/audio/noisy.flac', import.meta.url);
const TIMEOUT_MS = 180_000;

/** A server that ends with the test. */
export async function serve(t, options) {
  const server = await startServer(options);
  t.after(() => void server.close());
  return server;
}

/** { status, headers, body } of a request whose path is sent as it stands. */
export async function ask(url, { path: asked = '/', ...options } = {}) {
  const { hostname, port } = new URL(url);
  const sent = request({ hostname, port, path: asked, ...options }).end();
  const [response] = await once(sent, 'response');
  const body = Buffer.concat(await response.toArray());
  return { status: response.statusCode, headers: response.headers, body };
}

/** A socket with `said`, the messages so far, and `closed`, which resolves to { code, reason }. */
export function connect(url, { path: asked = 'audio', origin = new URL(url).origin } = {}) {
  const socket = new WebSocket(new URL(asked, url.replace('http', 'ws')), { origin });
  socket.binaryType = 'arraybuffer';
  socket.said = [];
  socket.on('message', (data, isBinary) => {
    socket.said.push(isBinary ? data : JSON.parse(Buffer.from(data).toString()));
  });
  socket.closed = new Promise((resolve) => {
    socket.on('close', (code, reason) => resolve({ code, reason: `${reason}` }));
  });
  return socket;
}

/** The first message of a type, already there or to come; rejects when the connection closes first. */
export async function heard(socket, type) {
  const closed = socket.closed.then(({ reason }) => {
    throw new Error(`closed before "${type}": ${reason}`);
  });
  closed.catch(() => {}); // when the message wins
  for (;;) {
    const found = socket.said.find((message) => message.type === type);
    if (found) return found;
    await Promise.race([once(socket, 'message'), closed]);
  }
}

/** A connection after its "hello", ended with the test. */
export async function greeted(t, url) {
  const socket = connect(url);
  t.after(() => socket.terminate());
  const hello = await heard(socket, 'hello');
  const say = (message) => socket.send(JSON.stringify(message));
  return { socket, hello, say };
}

/** Path of the browser, or null: $CHROMIUM, else one on the search path. */
export function findChromium() {
  if (process.env.CHROMIUM) return process.env.CHROMIUM;
  const folders = (process.env.PATH ?? '').split(path.delimiter);
  const names = ['chromium', 'chromium-browser', 'google-chrome'];
  const files = names.flatMap((name) => folders.map((folder) => path.join(folder, name)));
  return files.find((file) => existsSync(file)) ?? null;
}

/** @param {string} folder where the microphone's file may lie */
export async function openBrowser(folder) {
  const microphone = path.join(folder, 'microphone.wav');
  execFileSync('sox', [fileURLToPath(recording), '-b', '16', microphone]);
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
 * A tab with the page. `prelude` runs before the page's own code, `main` in place of its main.mjs.
 * @returns {Promise<{ page: import('playwright-core').Page, complaints: string[] }>} `complaints` grows
 *   with every console error, exception and failed request
 */
export async function openPage(browser, url, { prelude, main, ...options } = {}) {
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
  if (main) {
    const answer = { contentType: 'text/javascript', body: main };
    await page.route('**/main.mjs', (route) => route.fulfill(answer));
  }
  await page.goto(url);
  return { page, complaints };
}

// The live page's server: node demo/server.mjs [--port N] [--open]
// Listens on the loopback interface only, serves a fixed list of files, and takes WebSocket connections
// from its own page alone.
import { spawn } from 'node:child_process';
import { existsSync, readFileSync } from 'node:fs';
import { createServer } from 'node:http';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { parseArgs } from 'node:util';
import { WebSocketServer } from 'ws';
import { Connection } from './connection.mjs';
import { MAX_MESSAGE_BYTES } from './page/protocol.mjs';

const HOST = '127.0.0.1';
const MAX_CONNECTIONS = 8;
const here = fileURLToPath(new URL('.', import.meta.url));
const bundledExample = path.join(here, '../../../examples/audio/noisy.flac');

const TYPES = {
  '.html': 'text/html; charset=utf-8',
  '.css': 'text/css; charset=utf-8',
  '.mjs': 'text/javascript; charset=utf-8',
  '.svg': 'image/svg+xml',
};
const PAGE = [
  'index.html',
  'style.css',
  'icon.svg',
  'main.mjs',
  'audio-files.mjs',
  'link.mjs',
  'picture.mjs',
  'player.mjs',
  'protocol.mjs',
  'recorder.mjs',
  'spectra.mjs',
  'strip.mjs',
  'take.mjs',
  'view.mjs',
  'worklets.mjs',
];
const HEADERS = {
  'Content-Security-Policy':
    "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self'; connect-src 'self'; " +
    "media-src blob:; base-uri 'none'; form-action 'none'; frame-ancestors 'none'",
  'X-Content-Type-Options': 'nosniff',
  'Referrer-Policy': 'no-referrer',
  'Cache-Control': 'no-store',
};

/** Everything that can be asked for, by its exact address, as it was when the server started. */
function readFiles(example) {
  const files = new Map();
  for (const name of PAGE) {
    const body = readFileSync(path.join(here, 'page', name));
    files.set(`/${name}`, { body, type: TYPES[path.extname(name)] });
  }
  files.set('/', files.get('/index.html'));
  if (existsSync(example)) {
    files.set('/example.flac', { body: readFileSync(example), type: 'audio/flac' });
  }
  return files;
}

function answer(request, response, files) {
  const say = (status, text) => {
    response.writeHead(status, { ...HEADERS, 'Content-Type': 'text/plain; charset=utf-8' });
    response.end(`${text}\n`);
  };
  if (request.method !== 'GET' && request.method !== 'HEAD') return say(405, 'Only GET');
  const file = files.get(request.url);
  if (file === undefined) return say(404, 'Not found');
  response.writeHead(200, {
    ...HEADERS,
    'Content-Type': file.type,
    'Content-Length': file.body.length,
  });
  response.end(request.method === 'HEAD' ? undefined : file.body);
}

/**
 * @param {{ port?: number, example?: string }} [options] port 0: any free one; `example`: a recording
 *   that the page offers
 * @returns {Promise<{ url: string, close: () => Promise<void> }>}
 */
export async function startDemo({ port = 0, example = bundledExample } = {}) {
  const files = readFiles(example);
  const server = createServer();
  const sockets = new WebSocketServer({
    noServer: true,
    maxPayload: MAX_MESSAGE_BYTES,
    perMessageDeflate: false,
  });
  await new Promise((resolve, reject) => {
    server.once('error', reject).listen(port, HOST, resolve);
  });
  const bound = server.address().port;
  const hosts = new Set([`${HOST}:${bound}`, `localhost:${bound}`]);

  server.on('request', (request, response) => {
    // Another name in "Host" is another site's page that had its name pointed here.
    if (hosts.has(request.headers.host)) return answer(request, response, files);
    response.writeHead(421).end();
  });
  server.on('upgrade', (request, socket, head) => {
    const isOurs = hosts.has(request.headers.origin?.replace(/^http:\/\//, ''));
    if (request.url !== '/audio' || !isOurs || !hosts.has(request.headers.host)) {
      return socket.end('HTTP/1.1 403 Forbidden\r\nConnection: close\r\n\r\n');
    }
    if (sockets.clients.size >= MAX_CONNECTIONS) {
      return socket.end('HTTP/1.1 503 Service Unavailable\r\nConnection: close\r\n\r\n');
    }
    sockets.handleUpgrade(request, socket, head, (accepted) => {
      accepted.connection = new Connection(accepted, { hasExample: files.has('/example.flac') });
    });
  });

  return {
    url: `http://${HOST}:${bound}/`,
    close() {
      for (const client of sockets.clients) client.connection.close();
      return new Promise((resolve) => {
        server.close(resolve);
        server.closeAllConnections();
      });
    },
  };
}

function readOptions() {
  const { values } = parseArgs({
    options: {
      port: { type: 'string', default: '0' },
      open: { type: 'boolean', default: false },
      help: { type: 'boolean', short: 'h', default: false },
    },
  });
  const port = Number(values.port);
  if (!/^\d+$/.test(values.port) || port > 65535) throw new Error(`No such port: ${values.port}`);
  return { ...values, port };
}

async function main() {
  const options = readOptions();
  if (options.help) {
    console.log('usage: npm run demo -- [--port N] [--open]');
    return;
  }
  const demo = await startDemo(options);
  console.log(`Live page: ${demo.url}  (Ctrl+C ends it)`);
  if (options.open) {
    spawn('xdg-open', [demo.url], { stdio: 'ignore', detached: true })
      .on('error', () => console.error('No program opens pages here; open the address yourself.'))
      .unref();
  }
  for (const signal of ['SIGINT', 'SIGTERM']) {
    process.once(signal, async () => {
      await demo.close();
      process.exit(0);
    });
  }
}

if (process.argv[1] === fileURLToPath(import.meta.url)) {
  main().catch((error) => {
    console.error(error.message);
    process.exitCode = 1;
  });
}

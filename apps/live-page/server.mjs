// The live page's server: node apps/live-page/server.mjs [--port N] [--open]
// Listens on the loopback interface only, serves a fixed list of files, and takes WebSocket connections
// from its own page alone.
import { spawn } from 'node:child_process';
import { existsSync, readdirSync, readFileSync } from 'node:fs';
import { createServer } from 'node:http';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { parseArgs } from 'node:util';
import { Connection } from './connection.mjs';
import { require } from './dependencies.mjs';
import { MAX_MESSAGE_BYTES } from './page/protocol.mjs';

const { WebSocketServer } = require('ws');
const HOST = '127.0.0.1';
const MAX_CONNECTIONS = 8;
const here = fileURLToPath(new URL('.', import.meta.url));
const recording = path.join(here, '../../examples/audio/noisy.flac');
const EXAMPLE = '/example.flac';

const TYPES = {
  '.html': 'text/html; charset=utf-8',
  '.css': 'text/css; charset=utf-8',
  '.mjs': 'text/javascript; charset=utf-8',
  '.svg': 'image/svg+xml',
};
const HEADERS = {
  'Content-Security-Policy':
    "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self'; connect-src 'self'; " +
    "media-src blob:; base-uri 'none'; form-action 'none'; frame-ancestors 'none'",
  'X-Content-Type-Options': 'nosniff',
  'Referrer-Policy': 'no-referrer',
  'Cache-Control': 'no-store',
};

/** Everything that can be asked for, by its exact address, as it was when the server started. */
function readFiles() {
  const files = new Map();
  for (const name of readdirSync(path.join(here, 'page'))) {
    const body = readFileSync(path.join(here, 'page', name));
    files.set(`/${name}`, { body, type: TYPES[path.extname(name)] });
  }
  files.set('/', files.get('/index.html'));
  if (existsSync(recording)) {
    files.set(EXAMPLE, { body: readFileSync(recording), type: 'audio/flac' });
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

/** What a browser calls this server in `Host`, and in `Origin` behind "http://". */
export function namesOf(port) {
  // Left to the address parser, since the usual port is not named.
  return new Set([HOST, 'localhost'].map((name) => new URL(`http://${name}:${port}`).host));
}

/** Ends a connection that is not taken. The other side may have gone, or may never close its half. */
function refuse(socket, status) {
  socket.on('error', () => {});
  socket.once('finish', () => socket.destroy());
  socket.end(`HTTP/1.1 ${status}\r\nConnection: close\r\n\r\n`);
}

/**
 * @param {{ port?: number }} [options] port 0: any free one
 * @returns {Promise<{ url: string, close: () => Promise<void> }>}
 */
export async function startServer({ port = 0 } = {}) {
  const files = readFiles();
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
  const hosts = namesOf(bound);

  server.on('request', (request, response) => {
    // Another name in "Host" is another site's page that had its name pointed here.
    if (hosts.has(request.headers.host)) return answer(request, response, files);
    response.writeHead(421).end();
  });
  server.on('upgrade', (request, socket, head) => {
    const isOurs = hosts.has(request.headers.origin?.replace(/^http:\/\//, ''));
    if (request.url !== '/audio' || !isOurs || !hosts.has(request.headers.host)) {
      return refuse(socket, '403 Forbidden');
    }
    if (sockets.clients.size >= MAX_CONNECTIONS) {
      return refuse(socket, '503 Service Unavailable');
    }
    sockets.handleUpgrade(request, socket, head, (accepted) => {
      accepted.connection = new Connection(accepted, files.has(EXAMPLE) ? EXAMPLE : null);
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
    console.log('usage: node apps/live-page/server.mjs [--port N] [--open]');
    return;
  }
  const running = await startServer(options);
  console.log(`Live page: ${running.url}  (Ctrl+C ends it)`);
  if (options.open) {
    spawn('xdg-open', [running.url], { stdio: 'ignore', detached: true })
      .on('error', () => console.error('No program opens pages here; open the address yourself.'))
      .unref();
  }
  for (const signal of ['SIGINT', 'SIGTERM']) {
    process.once(signal, async () => {
      await running.close();
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

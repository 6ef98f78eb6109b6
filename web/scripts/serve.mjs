// Any server of static files does; this one needs nothing: node web/scripts/serve.mjs [FOLDER [PORT]]
import { createReadStream, existsSync, statSync } from 'node:fs';
import { createServer } from 'node:http';
import path from 'node:path';
import { fileURLToPath, pathToFileURL } from 'node:url';

const TYPES = {
  '.html': 'text/html; charset=utf-8',
  '.css': 'text/css; charset=utf-8',
  '.js': 'text/javascript; charset=utf-8',
  '.mjs': 'text/javascript; charset=utf-8',
  '.svg': 'image/svg+xml',
  '.wasm': 'application/wasm',
  '.flac': 'audio/flac',
};
const PAGE = fileURLToPath(new URL('../../build/web-page', import.meta.url));

/**
 * @param {{ port?: number, headers?: Record<string, string> }} [options]
 * @returns {Promise<{ url: string, requests: string[], close: () => Promise<void> }>} on the loopback interface
 */
export async function serveFolder(folder = PAGE, { port = 0, headers = {} } = {}) {
  const requests = [];
  const server = createServer((request, response) => {
    const { pathname } = new URL(request.url, 'http://localhost');
    const wanted = path.join(folder, path.normalize(decodeURIComponent(pathname)));
    const file = pathname.endsWith('/') ? path.join(wanted, 'index.html') : wanted;
    requests.push(pathname);
    if (!existsSync(file) || !statSync(file).isFile()) return response.writeHead(404).end();
    const type = TYPES[path.extname(file)] ?? 'application/octet-stream';
    response.writeHead(200, {
      ...headers,
      'Content-Type': type,
      'Content-Length': statSync(file).size,
    });
    createReadStream(file).pipe(response);
  });
  await new Promise((resolve, reject) => {
    server.once('error', reject).listen(port, '127.0.0.1', resolve);
  });
  return {
    url: `http://127.0.0.1:${server.address().port}/`,
    requests,
    close: () => new Promise((resolve) => server.close(resolve).closeAllConnections()),
  };
}

if (import.meta.url === pathToFileURL(process.argv[1]).href) {
  const [folder, port = '0'] = process.argv.slice(2);
  console.log((await serveFolder(folder, { port: Number(port) })).url);
}

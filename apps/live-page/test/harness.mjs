// What the tests of the live page stand on: a server that ends with the test, a bare connection to it.
import { once } from 'node:events';
import { request } from 'node:http';
import { require } from '../dependencies.mjs';
import { startServer } from '../server.mjs';

const { WebSocket } = require('ws');

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

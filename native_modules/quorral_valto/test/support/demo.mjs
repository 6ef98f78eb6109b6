// The live page's server and a bare connection to it, without a browser.
import { once } from 'node:events';
import { request } from 'node:http';
import { WebSocket } from 'ws';
import { startDemo } from '../../demo/server.mjs';
import { noisyRecording } from './browser.mjs';

/** A server that ends with the test. */
export async function serve(t, options) {
  const demo = await startDemo({ example: noisyRecording, ...options });
  t.after(() => demo.close());
  return demo;
}

/** { status, headers, body } of a request whose path is sent as it stands. */
export async function ask(url, { path = '/', ...options } = {}) {
  const { hostname, port } = new URL(url);
  const sent = request({ hostname, port, path, ...options }).end();
  const [response] = await once(sent, 'response');
  const chunks = await response.toArray();
  const { statusCode: status, headers } = response;
  return { status, headers, body: Buffer.concat(chunks) };
}

/** A socket with `said`, the messages so far, and `closed`, which resolves to { code, reason }. */
export function connect(url, { path = 'audio', origin = new URL(url).origin } = {}) {
  const socket = new WebSocket(new URL(path, url.replace('http', 'ws')), { origin });
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
    const complaint = socket.said.find((message) => message.type === 'error');
    throw new Error(`closed before "${type}": ${complaint?.message ?? reason}`);
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

// What the module asks of whoever runs it: a place to print, and nothing else.
import { MorvaError } from './errors.mjs';

const NO_SUCH_FILE = 8;
const NO_ENTRY = 44; // both as the module's C library numbers them

/**
 * @param {() => WebAssembly.Memory} memory the module's, once there is one
 * @param {(line: string) => void} print
 */
export function hostFor(memory, print) {
  let line = '';
  const view = () => new DataView(memory().buffer);

  function environ_sizes_get(count, size) {
    view().setUint32(count, 0, true);
    view().setUint32(size, 0, true);
    return 0;
  }

  function fd_write(_file, parts, count, written) {
    let total = 0;
    for (let i = 0; i < count; ++i) {
      const at = view().getUint32(parts + 8 * i, true);
      const length = view().getUint32(parts + 8 * i + 4, true);
      line += String.fromCharCode(...new Uint8Array(memory().buffer, at, length));
      total += length;
    }
    view().setUint32(written, total, true);
    const lines = line.split('\n');
    line = lines.pop();
    lines.forEach(print);
    return 0;
  }

  function proc_exit(status) {
    throw new MorvaError('ERR_MORVA_ENGINE', `The engine ended with ${status}.`);
  }

  const refuse = () => NO_SUCH_FILE;
  return {
    env: { emscripten_notify_memory_growth() {}, __syscall_stat64: () => -NO_ENTRY },
    wasi_snapshot_preview1: {
      environ_sizes_get,
      environ_get: () => 0,
      fd_write,
      proc_exit,
      fd_close: refuse,
      fd_seek: refuse,
      fd_read: refuse,
    },
  };
}

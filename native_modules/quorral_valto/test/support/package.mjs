// Where the package under test lies, copies of its binary for tests that damage it, test modules.
import { cpSync, existsSync, mkdirSync, mkdtempSync, rmSync } from 'node:fs';
import { createRequire } from 'node:module';
import os from 'node:os';
import path from 'node:path';
import { fileURLToPath } from 'node:url';

export const require = createRequire(import.meta.url);
const here = path.dirname(fileURLToPath(import.meta.url));

export const testDir = path.join(here, '..');
export const packageDir = path.dirname(require.resolve('quorral_valto'));

const build = path.resolve(
  process.env.QUORRAL_VALTO_BUILD ?? path.join(packageDir, '../../build/release/quorral_valto'),
);
const packaged = path.join(packageDir, 'prebuilds', 'linux-x64');
export const binaryDir = existsSync(packaged) ? packaged : build;
export const binaryFile = path.join(binaryDir, 'quorral_valto.node');

const addons = process.env.QUORRAL_VALTO_TEST_ADDONS ?? path.join(build, '..', 'test_addons');
export const enginePath = path.join(addons, 'valto_engine_probe.node');
export const bindingPath = path.join(addons, 'binding_probe.node');
export const failingPath = path.join(addons, 'failing', 'quorral_valto.node');

export const underSanitizer = (process.env.LD_PRELOAD ?? '').includes('asan');

export const NC_MODELS = ['small_NC_8k', 'small_NC', 'full_NC-ca03f4'];
export const VAD_MODELS = ['default_VAD'];
export const WEIGHTS = [
  'NC_small_8k.mvw',
  'NC_small_16k.mvw',
  'c6.xs.f.ca03f4.mvw',
  'VAD_weight.mvw',
];

/** A fresh folder that is removed when the test ends. */
export function temporaryFolder(t, name = 'quorral-') {
  const folder = mkdtempSync(path.join(os.tmpdir(), name));
  t.after(() => rmSync(folder, { recursive: true, force: true }));
  return folder;
}

/** A copy of the binary with its weights in a folder of the given name; the path of the module. */
export function copyBinary(t, name = 'copy') {
  const folder = path.join(temporaryFolder(t), name);
  mkdirSync(folder, { recursive: true });
  cpSync(binaryDir, folder, { recursive: true });
  return path.join(folder, 'quorral_valto.node');
}

/** A copy of the whole package, as it would lie in another node_modules. */
export function copyPackage(t, name = 'copy') {
  const folder = path.join(temporaryFolder(t), name, 'quorral_valto');
  for (const entry of ['package.json', 'index.cjs', 'index.mjs', 'lib']) {
    cpSync(path.join(packageDir, entry), path.join(folder, entry), { recursive: true });
  }
  cpSync(binaryDir, path.join(folder, 'prebuilds', 'linux-x64'), { recursive: true });
  return folder;
}

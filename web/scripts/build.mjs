// Lays out what ships and the page, from the sources, the module (scripts/build wasm) and the models:
//
//   node web/scripts/build.mjs     web/dist, the package's files; build/web-page, static files of the page
import { createHash } from 'node:crypto';
import { cpSync, mkdirSync, readdirSync, readFileSync, rmSync, writeFileSync } from 'node:fs';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { build } from 'esbuild';

const web = fileURLToPath(new URL('..', import.meta.url));
const repository = path.join(web, '..');
const dist = path.join(web, 'dist');
const page = path.join(repository, 'build/web-page');
const AUDIO_THREAD = ['processor.mjs', 'frame-queue.mjs'];

/** The text of models.mjs: the list of shipped models, and a version that changes with any byte of what is kept. */
function modelList() {
  const shipped = JSON.parse(readFileSync(path.join(repository, 'models/shipped.json'), 'utf8'));
  const { version } = JSON.parse(readFileSync(path.join(web, 'package.json'), 'utf8'));
  const hash = createHash('sha256').update(readFileSync(path.join(dist, 'morva_sdk.wasm')));
  const rows = shipped.map((model) => {
    const bytes = readFileSync(path.join(repository, 'models', model.file));
    hash.update(bytes);
    const fields = JSON.stringify({ ...model, size: bytes.length }).slice(1, -1);
    return `  { ${fields}, url: new URL('./models/${model.file}', import.meta.url) },\n`;
  });
  const whole = `${version}-${hash.digest('hex').slice(0, 12)}`;
  return `export const VERSION = '${whole}';\nexport const MODELS = [\n${rows.join('')}];\n`;
}

async function layOutPackage() {
  rmSync(dist, { recursive: true, force: true });
  mkdirSync(path.join(dist, 'models'), { recursive: true });
  cpSync(path.join(repository, 'build/wasm/morva_sdk.wasm'), path.join(dist, 'morva_sdk.wasm'));
  for (const name of readdirSync(path.join(repository, 'models'))) {
    if (/\.mvw$|^ATTR/.test(name)) {
      cpSync(path.join(repository, 'models', name), path.join(dist, 'models', name));
    }
  }
  for (const name of readdirSync(path.join(web, 'src'))) {
    if (!AUDIO_THREAD.includes(name)) cpSync(path.join(web, 'src', name), path.join(dist, name));
  }
  cpSync(path.join(repository, 'LICENSE'), path.join(dist, 'LICENSE'));
  cpSync(path.join(repository, 'build/wasm/licences'), dist, { recursive: true });
  writeFileSync(path.join(dist, 'models.mjs'), modelList());
  // One file: bundlers copy it as it stands.
  await build({
    entryPoints: [path.join(web, 'src/processor.mjs')],
    outfile: path.join(dist, 'processor.mjs'),
    bundle: true,
    format: 'esm',
    target: 'es2022',
    logLevel: 'warning',
  });
}

/** The live page, less what talks to its server; the engine runs in a worker of the page. */
function layOutPage() {
  rmSync(page, { recursive: true, force: true });
  cpSync(path.join(repository, 'apps/live-page/page'), page, { recursive: true });
  rmSync(path.join(page, 'server-link.mjs'));
  cpSync(path.join(web, 'page'), page, { recursive: true });
  cpSync(path.join(web, 'examples'), page, { recursive: true });
  cpSync(dist, path.join(page, 'quorral_valto_web'), { recursive: true });
  cpSync(path.join(repository, 'examples/audio/noisy.flac'), path.join(page, 'example.flac'));
}

await layOutPackage();
layOutPage();

// Tests the package as its users get it, and the live page on top of it: packed, installed without scripts
// into an empty folder that has the layout of this repository, then all suites from there. Before that the
// checks of the sources: lint, publint, types.
//
//   node scripts/test.mjs [--build <folder of a preset>] [--sanitizer | --suites] [test files]
//
// --suites: the checks of the sources are left out.
// --sanitizer: these too; the build carries AddressSanitizer, whose library is preloaded into the runtime.
import { execFileSync, spawnSync } from 'node:child_process';
import {
  cpSync,
  mkdirSync,
  mkdtempSync,
  readdirSync,
  renameSync,
  rmSync,
  symlinkSync,
  writeFileSync,
} from 'node:fs';
import os from 'node:os';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { parseArgs } from 'node:util';

const root = fileURLToPath(new URL('..', import.meta.url));
const repository = path.join(root, '../..');
const MODULE = 'native_modules/quorral_valto';
const { values: settings, positionals } = parseArgs({
  allowPositionals: true,
  options: {
    build: { type: 'string', default: path.join(repository, 'build/release') },
    sanitizer: { type: 'boolean', default: false },
    suites: { type: 'boolean', default: false },
  },
});
const build = path.resolve(settings.build);
const bin = (name) => path.join(root, 'node_modules', '.bin', name);
const say = (what) => console.log(`== ${what}`);
const run = (command, args, options = {}) =>
  execFileSync(command, args, { cwd: root, stdio: 'inherit', ...options });

function pack(folder) {
  const target = `${process.platform}-${process.arch}`;
  run(path.join(repository, 'scripts/package'), ['npm', `${target}=${build}`, '--out', folder]);
  return path.join(
    folder,
    readdirSync(folder).find((file) => file.endsWith('.tgz')),
  );
}

function install(tarball, folder) {
  const inside = (...parts) => path.join(folder, ...parts);
  mkdirSync(inside('native_modules'), { recursive: true });
  writeFileSync(inside('package.json'), '{ "private": true }\n');
  const quiet = ['--silent', '--no-audit', '--no-fund', '--offline'];
  run('npm', ['install', '--ignore-scripts', ...quiet, tarball], { cwd: folder });
  renameSync(inside('node_modules/quorral_valto'), inside(MODULE));
  symlinkSync(inside(MODULE), inside('node_modules/quorral_valto'));
  const around = [`${MODULE}/test`, 'apps/live-page', 'models/shipped.json'];
  for (const each of [...around, 'examples/node/denoise.mjs', 'examples/audio/noisy.flac']) {
    cpSync(path.join(repository, each), inside(each), { recursive: true });
  }
  for (const name of ['ws', 'playwright-core']) {
    symlinkSync(path.join(root, 'node_modules', name), inside('node_modules', name));
  }
}

function sanitizerEnvironment() {
  const library = (name) =>
    execFileSync('gcc', [`-print-file-name=${name}`], { encoding: 'utf8' }).trim();
  return {
    LD_PRELOAD: `${library('libasan.so')} ${library('libstdc++.so')}`,
    // The runtime frees little when it ends; leaks of ours are found by the memory tests.
    ASAN_OPTIONS: 'detect_leaks=0:abort_on_error=0:exitcode=99',
    UBSAN_OPTIONS: 'print_stacktrace=1',
  };
}

function suite(folder) {
  const files = [`${MODULE}/test`, 'apps/live-page/test']
    .flatMap((tests) => readdirSync(path.join(folder, tests)).map((name) => `${tests}/${name}`))
    .filter((file) => file.endsWith('.test.mjs'));
  const wanted = positionals.map((file) => path.basename(file));
  const chosen = files.filter((file) => !wanted.length || wanted.includes(path.basename(file)));
  const env = {
    ...process.env,
    QUORRAL_VALTO_TEST_ADDONS: path.join(build, 'test_addons'),
    ...(settings.sanitizer ? sanitizerEnvironment() : {}),
  };
  return spawnSync(process.execPath, ['--test', ...chosen], { cwd: folder, env, stdio: 'inherit' });
}

const work = mkdtempSync(path.join(os.tmpdir(), 'quorral-package-'));
process.on('exit', () => rmSync(work, { recursive: true, force: true }));
const checksSources = !settings.sanitizer && !settings.suites;
if (checksSources) {
  say('lint');
  run(bin('biome'), ['check'], { cwd: repository });
}
say('pack and install');
const tarball = pack(work);
const app = path.join(work, 'app with space');
install(tarball, app);
if (checksSources) {
  say('publint');
  run(bin('publint'), ['run', '--strict', tarball]);
  say('types');
  const roots = path.join(root, 'node_modules/@types');
  const lib = [
    '--target',
    'es2022',
    '--lib',
    'es2022,dom',
    '--typeRoots',
    roots,
    '--types',
    'node',
  ];
  const strict = ['--strict', '--noUncheckedIndexedAccess', '--exactOptionalPropertyTypes'];
  const options = ['--noEmit', '--module', 'node16', ...lib, ...strict];
  run(bin('tsc'), [...options, path.join(app, MODULE, 'test/types/usage.mts')]);
}
say('suite');
process.exitCode = suite(app).status ?? 1;

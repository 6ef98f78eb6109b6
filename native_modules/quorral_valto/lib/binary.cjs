'use strict';
// Finds and loads the native module. Its weight files lie beside it, so it is always loaded from where
// it is installed, never from a copy.

const fs = require('node:fs');
const path = require('node:path');
const { ValtoError } = require('./errors.cjs');

const target = `${process.platform}-${process.arch}`;
const root = path.join(__dirname, '..');
const prebuilds = path.join(root, 'prebuilds');

// An archive cannot be mapped by the system's loader; packagers put such files beside the archive.
const outsideArchive = (file) => file.replace(/\.asar(?=[\\/])/g, '.asar.unpacked');

function candidates() {
  // Inside an archive it is not looked for: Electron would load a copy, far from the weight files.
  const packaged = outsideArchive(path.join(prebuilds, `quorral_valto.${target}.node`));
  // Only a checkout of this project has the build's own file; elsewhere "../../build" is the host
  // application's.
  if (!fs.existsSync(path.join(root, 'CMakeLists.txt'))) return [packaged];
  const built = (folder) =>
    path.join(root, '../../build', folder, 'quorral_valto/quorral_valto.node');
  return [packaged, built('release'), built(target)];
}

function prebuiltTargets() {
  const folder = outsideArchive(prebuilds);
  const files = fs.existsSync(folder) ? fs.readdirSync(folder) : [];
  return files.flatMap((file) => file.match(/^quorral_valto\.(.*)\.node$/)?.[1] ?? []);
}

function isMusl() {
  return process.platform === 'linux' && !process.report?.getReport?.().header.glibcVersionRuntime;
}

function remedy() {
  const targets = prebuiltTargets();
  if (targets.length && !targets.includes(target)) {
    return `This package has binaries for ${targets.join(', ')} only.`;
  }
  if (isMusl()) return 'The binary needs glibc; this system runs another C library (musl?).';
  return (
    'Reinstall the package. When the application is packed into an archive, keep the folder ' +
    '"prebuilds" of this package unpacked.'
  );
}

function load() {
  const tried = [];
  for (const file of candidates()) {
    if (!fs.existsSync(file)) {
      tried.push({ file, reason: 'no such file' });
      continue;
    }
    try {
      const raw = require(file);
      // The same file once more, asked for its second export object.
      const second = { exports: { sessions: {} } };
      process.dlopen(second, path.toNamespacedPath(file));
      return { raw, sessions: second.exports.sessions, directory: path.dirname(file) };
    } catch (cause) {
      tried.push({ file, reason: cause.message, cause });
    }
  }
  const lines = tried.map(({ file, reason }) => `  ${file}: ${reason}`);
  throw new ValtoError(
    'ERR_VALTO_LOAD',
    `Cannot load the native module for ${target} (Node.js ${process.version}). Tried:\n` +
      `${lines.join('\n')}\n${remedy()}`,
    { cause: tried.find((attempt) => attempt.cause)?.cause },
  );
}

module.exports = { load };

// Copies the built module with everything that lies beside it into prebuilds/, where the package
// carries it, and the project's licence into the package. Runs before `npm pack`.
// A checkout keeps no copy afterwards: its loader takes the build folder.
//
//   node scripts/stage.mjs           stage ($QUORRAL_VALTO_BUILD, else build/release/quorral_valto)
//   node scripts/stage.mjs --clean   remove what was staged
import { cpSync, existsSync, rmSync } from 'node:fs';
import path from 'node:path';
import { fileURLToPath } from 'node:url';

const root = fileURLToPath(new URL('..', import.meta.url));
const target = path.join(root, 'prebuilds');
const licence = path.join(root, 'LICENSE');

function clean() {
  for (const staged of [target, licence]) rmSync(staged, { recursive: true, force: true });
}

function stage() {
  const built = path.join(root, '../../build/release/quorral_valto');
  const source = path.resolve(process.env.QUORRAL_VALTO_BUILD ?? built);
  if (!existsSync(path.join(source, 'quorral_valto.node'))) {
    console.error(`No built module in ${source}: run cmake --build --preset release first.`);
    process.exit(1);
  }
  cpSync(source, path.join(target, 'linux-x64'), { recursive: true });
  cpSync(path.join(root, '../../LICENSE'), licence);
}

clean();
if (!process.argv.includes('--clean')) stage();

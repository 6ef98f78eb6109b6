// Copies the built module with everything that lies beside it into prebuilds/, where the package
// carries it, and the project's licence into the package. Runs before `npm pack`. Usage: node scripts/stage.mjs [folder of the built module]
import { cpSync, existsSync, mkdirSync, readdirSync, rmSync } from 'node:fs';
import path from 'node:path';
import { fileURLToPath } from 'node:url';

const root = fileURLToPath(new URL('..', import.meta.url));
const source = path.resolve(
  process.argv[2] ??
    process.env.QUORRAL_VALTO_BUILD ??
    path.join(root, '../../build/release/quorral_valto'),
);
const target = path.join(root, 'prebuilds', 'linux-x64');

if (!existsSync(path.join(source, 'quorral_valto.node'))) {
  console.error(`No built module in ${source}: run cmake --build --preset release first.`);
  process.exit(1);
}
rmSync(target, { recursive: true, force: true });
mkdirSync(target, { recursive: true });
for (const name of readdirSync(source)) cpSync(path.join(source, name), path.join(target, name));
cpSync(path.join(root, '../../LICENSE'), path.join(root, 'LICENSE'));

// What cleaning costs in a browser, beside RNNoise as two npm packages carry it: node bench/web/bench.mjs [ROUNDS]
// One page, the bundled recording at 48 kHz, everyone in turn; needs scripts/build wasm before.
import { cpSync, mkdirSync, mkdtempSync, rmSync, writeFileSync } from 'node:fs';
import { createRequire } from 'node:module';
import os from 'node:os';
import path from 'node:path';
import { fileURLToPath } from 'node:url';
import { openBrowser, openPage, recording } from '../../apps/live-page/browser.mjs';
import { serveFolder } from '../../web/scripts/serve.mjs';

const web = fileURLToPath(new URL('../../web', import.meta.url));
const { build } = createRequire(path.join(web, 'package.json'))('esbuild');
const folder = mkdtempSync(path.join(os.tmpdir(), 'morva-bench-'));
const rounds = Number(process.argv[2] ?? 20);

const served = path.join(folder, 'served');
mkdirSync(served);
await build({
  entryPoints: [fileURLToPath(new URL('page.mjs', import.meta.url))],
  outdir: served,
  bundle: true,
  format: 'esm',
  target: 'es2022',
  nodePaths: [path.join(web, 'node_modules')],
  logLevel: 'error',
});
cpSync(path.join(web, 'dist'), path.join(served, 'dist'), { recursive: true });
cpSync(recording, path.join(served, 'recording.flac'));
const icon = '<link rel="icon" href="data:,">';
writeFileSync(
  path.join(served, 'index.html'),
  `<!doctype html>${icon}<script type="module" src="page.js"></script>`,
);
// Isolated pages have a clock of microseconds.
const isolation = {
  'Cross-Origin-Opener-Policy': 'same-origin',
  'Cross-Origin-Embedder-Policy': 'require-corp',
};
const server = await serveFolder(served, { headers: isolation });
const browser = await openBrowser(folder);
try {
  const { page, complaints } = await openPage(browser, server.url);
  await page.waitForFunction(() => globalThis.bench !== undefined);
  const { costs, quanta } = await page.evaluate((count) => globalThis.bench(count), rounds);
  console.log(`${browser.version()}, ${rounds} rounds of 1 s; microseconds a frame of 10 ms\n`);
  const names = Object.keys(costs);
  const peers = names.filter((name) => name.startsWith('RNNoise'));
  console.log(['median'.padStart(32), 'best', ...peers.map((name) => `x ${name}`)].join('  '));
  for (const name of names) {
    const { median, best } = costs[name];
    const ratios = peers.map((peer) =>
      (median / costs[peer].median).toFixed(2).padEnd(peer.length),
    );
    console.log(
      `${name.padEnd(24)} ${median.toFixed(0).padStart(7)} ${best.toFixed(0).padStart(5)}  ${ratios.join('    ')}`,
    );
  }
  console.log(
    '\nper cent of the time of a render quantum of 128 samples (2.67 ms): median, p99, maximum',
  );
  for (const [name, shares] of Object.entries(quanta)) {
    console.log(`${name.padEnd(24)} ${shares.map((share) => (100 * share).toFixed(1)).join('  ')}`);
  }
  if (complaints.length > 0) throw new Error(complaints.join('\n'));
} finally {
  await browser.close();
  await server.close();
  rmSync(folder, { recursive: true });
}

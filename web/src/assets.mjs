// The files of this package that are fetched: the module, the models, the audio thread's code. Each is fetched once
// and kept in the browser's cache under this version's name, where pages have one.
import { MorvaError, requireSupport } from './errors.mjs';
import { MODELS, VERSION } from './models.mjs';

const CACHE = 'quorral_valto_web';
// Written out, so that bundlers see them.
const MODULE = new URL('./morva_sdk.wasm', import.meta.url);
const PROCESSOR = new URL('./processor.mjs', import.meta.url);

const lastPart = (url) => url.pathname.split('/').at(-1);
const locate = (name, url, baseUrl) => (baseUrl === undefined ? url : new URL(name, baseUrl));

/** Where the audio thread's code lies. */
export const processorUrl = (baseUrl) => locate(lastPart(PROCESSOR), PROCESSOR, baseUrl);

/** Names of the models, with kind and rate. */
export const models = MODELS.map(({ name, kind, rate }) => Object.freeze({ name, kind, rate }));

/** The noise model for a sampling rate. */
export const modelFor = (rate) =>
  MODELS.find(({ kind, maxSampleRate }) => kind === 'NC' && rate <= maxSampleRate)?.name;

export const voiceModel = MODELS.find(({ kind }) => kind === 'VAD').name;

async function openCache() {
  try {
    const name = `${CACHE}-${VERSION}`;
    for (const other of await caches.keys()) {
      if (other.startsWith(`${CACHE}-`) && other !== name) await caches.delete(other);
    }
    return await caches.open(name);
  } catch {
    return null; // an insecure page, private browsing, no browser: the HTTP cache has to do
  }
}

async function download(url, report) {
  const response = await fetch(url);
  if (!response.ok) {
    throw new MorvaError('ERR_MORVA_FETCH', `${url} cannot be fetched: ${response.status}`);
  }
  const parts = [];
  for (const reader = response.body.getReader(); ; ) {
    const { done, value } = await reader.read();
    if (done) break;
    parts.push(value);
    report(value.length);
  }
  return new Uint8Array(await new Blob(parts).arrayBuffer());
}

async function obtain(cache, url, report) {
  const kept = await cache?.match(url);
  if (kept) {
    const bytes = new Uint8Array(await kept.arrayBuffer());
    report(bytes.length);
    return bytes;
  }
  const bytes = await download(url, report);
  await cache?.put(url, new Response(bytes)).catch(() => {}); // a full disk is no reason to stop
  return bytes;
}

/** @type {Promise<WebAssembly.Module> | undefined} one for all engines and contexts of this page */
let compiled;

/**
 * The compiled module and the bytes of models.
 * @param {{ names: string[], baseUrl?: string | URL,
 *   onProgress?: (state: { loaded: number, total: number }) => void }} options
 */
export async function loadAssets({ names, baseUrl, onProgress = () => {} }) {
  requireSupport();
  const wanted = names.map((name) => {
    const model = MODELS.find((each) => each.name === name);
    if (model === undefined) throw new MorvaError('ERR_MORVA_MODEL', `No such model: ${name}`);
    return model;
  });
  const total = wanted.reduce((sum, { size }) => sum + size, 0);
  let loaded = 0;
  const report = (length) => {
    loaded += length;
    onProgress({ loaded, total });
  };
  const cache = await openCache();
  compiled ??= obtain(cache, locate(lastPart(MODULE), MODULE, baseUrl), () => {}).then((bytes) =>
    WebAssembly.compile(bytes),
  );
  compiled.catch(() => {
    compiled = undefined; // may be tried again
  });
  const models = wanted.map(async ({ name, kind, file, url }) => {
    const bytes = await obtain(cache, locate(`models/${file}`, url, baseUrl), report);
    return { name, kind, bytes };
  });
  const [module, ...read] = await Promise.all([compiled, ...models]);
  return { module, models: read };
}

// An engine of one's own, for workers and for whole files.
import { models as all, loadAssets } from './assets.mjs';
import { Engine } from './engine.mjs';

/**
 * Fetches module and models and starts an engine on this thread.
 * @param {{ models?: string[], baseUrl?: string | URL, onDiagnostic?: (text: string) => void,
 *   onProgress?: (state: { loaded: number, total: number }) => void }} [options] `models`: all when left out
 */
export async function loadEngine({ models = all.map(({ name }) => name), ...options } = {}) {
  const assets = await loadAssets({ names: models, ...options });
  const engine = new Engine(assets.module, options.onDiagnostic);
  for (const model of assets.models) engine.addModel(model);
  return engine;
}

// The page as static files: the sound is cleaned by the engine in a worker.
import { EngineLink } from './engine-link.mjs';
import { startPage } from './live-page.mjs';

startPage(new EngineLink(new URL('engine-worker.mjs', import.meta.url)));

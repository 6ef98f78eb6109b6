// The page as the server gives it away: the sound is cleaned by the server, through a WebSocket.
import { startPage } from './live-page.mjs';
import { ServerLink } from './server-link.mjs';

startPage(new ServerLink(new URL('/audio', location.href.replace(/^http/, 'ws'))));

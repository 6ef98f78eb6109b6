// What the server takes from elsewhere: this checkout's own package and what is installed beside it for
// development. Run `npm install` in the package's folder (scripts/setup does).
import { createRequire } from 'node:module';

export const require = createRequire(
  new URL('../../native_modules/quorral_valto/package.json', import.meta.url),
);

// A noise canceller for pipes: raw mono samples, 16 bits at 48000 Hz, from standard input to standard output.
import { pipeline } from 'node:stream/promises';
import { initialize, NoiseCancellerStream } from 'quorral_valto';

initialize();
const canceller = new NoiseCancellerStream({ sampleRate: 48000 });
await pipeline(process.stdin, canceller, process.stdout);

// Compiled, not run: the types under `require`.
import valto = require('quorral_valto');

valto.initialize();
const canceller: valto.NoiseCanceller = new valto.NoiseCanceller({
  sampleRate: 16000,
  frameMs: 10,
});
const cleaned: Int16Array = canceller.process(new Int16Array(canceller.frameSize));
canceller.close();
export = cleaned;

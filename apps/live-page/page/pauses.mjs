// How far the noise in the pauses of a recording goes down, as docs/quality.md lays it down and
// training/morva_training/measures.py has it for Python. Imports nothing and touches no document: the
// command line's report embeds this file.

const SPEECH_SCORE = 0.5; // below it nobody speaks
const [SETTLE_MS, EDGE_MS] = [350, 30]; // after and before speech, no pause either
const FEWEST_MS = 300;
const [LEAST_NOISE_DB, LEAST_LEFT_DB] = [-75, -100];

/** Numbers of the frames that are a pause. */
function calmFrames(scores, frameMs) {
  const [settle, edge] = [SETTLE_MS, EDGE_MS].map((ms) => Math.round(ms / frameMs));
  const calm = new Uint8Array(scores.length).fill(1);
  scores.forEach((score, k) => {
    if (score >= SPEECH_SCORE) calm.fill(0, Math.max(0, k - edge), k + settle);
  });
  return [...calm.keys()].filter((k) => calm[k] === 1);
}

/** Median of the frames' levels, dB re full scale. */
function medianLevel(samples, frames, frameSize, cut = 0) {
  const powers = Float64Array.from(frames, (k) => {
    const frame = samples.subarray(Math.round(k * frameSize), Math.round((k + 1) * frameSize));
    let sum = 0;
    for (const sample of frame) {
      if (sample !== 0) sum += ((Math.abs(sample) + cut) / 32768) ** 2;
    }
    return sum / frame.length;
  }).sort();
  const median = (powers[powers.length >> 1] + powers[(powers.length - 1) >> 1]) / 2;
  return 10 * Math.log10(median + 1e-12);
}

/**
 * In words; null when there are hardly any pauses, or nothing is to be heard in them.
 * @param {{ before: Int16Array, after: Int16Array, rate: number, scores: ArrayLike<number>,
 *   frameMs: number, cut?: number }} recording `scores`: the voice score of each frame; `cut`: how much nearer
 *   to zero the samples of `after` stand than what they come from, on average
 */
export function noiseInPauses({ before, after, rate, scores, frameMs, cut }) {
  const frameSize = (rate * frameMs) / 1000;
  const whole = Math.floor(Math.min(before.length, after.length) / frameSize);
  const frames = calmFrames(scores.slice(0, whole), frameMs);
  if (frames.length * frameMs < FEWEST_MS) return null;
  const noise = medianLevel(before, frames, frameSize);
  if (noise < LEAST_NOISE_DB) return null;
  const left = Math.max(LEAST_LEFT_DB, medianLevel(after, frames, frameSize, cut));
  const change = Math.round(noise - left);
  return `${Math.abs(change)} dB ${change < 0 ? 'louder' : 'quieter'}`;
}

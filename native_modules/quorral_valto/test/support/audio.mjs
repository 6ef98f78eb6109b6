// Seeded sound for tests.

/** Numbers in 0..1, the same for the same seed. */
export function randomSource(seed) {
  let state = seed >>> 0;
  return () => {
    state = (state + 0x6d2b79f5) >>> 0;
    let t = state;
    t = Math.imul(t ^ (t >>> 15), t | 1);
    t ^= t + Math.imul(t ^ (t >>> 7), t | 61);
    return ((t ^ (t >>> 14)) >>> 0) / 4294967296;
  };
}

/** White noise with the given peak, 16-bit. */
export function noise(length, seed, peak = 3000) {
  const random = randomSource(seed);
  return Int16Array.from({ length }, () => Math.round((2 * random() - 1) * peak));
}

/** Mean power of samples in dB re one squared unit. */
export function levelDb(samples) {
  const power = samples.reduce((sum, x) => sum + x * x, 0) / samples.length;
  return 10 * Math.log10(power + 1e-9);
}

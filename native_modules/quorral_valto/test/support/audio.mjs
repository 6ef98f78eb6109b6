// Seeded sound for tests.

/** Numbers in 0..1, the same for the same seed. */
export function randomSource(seed) {
  let state = 1 + seed * 7919;
  return () => {
    state = (state * 48271) % 0x7fffffff;
    return state / 0x7fffffff;
  };
}

/** White noise with the given peak, 16-bit. */
export function noise(length, seed, peak = 3000) {
  const random = randomSource(seed);
  return Int16Array.from({ length }, () => Math.round((2 * random() - 1) * peak));
}

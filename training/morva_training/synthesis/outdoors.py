"""Rain, wind, water, traffic and fire."""

from __future__ import annotations

import numpy as np
from scipy import fft as sfft

from .impacts import METAL, PLASTIC, WOOD, hits
from .machines import engine
from .sources import (
    BAND_HZ,
    STEP_HZ,
    Rng,
    hump,
    log_uniform,
    moving_noise,
    normal,
    spectrum_slope,
    steps_of,
    stretched,
    unit,
    wander,
)


def _drops(rng: Rng, count: int, per_second: float, sound: np.ndarray, rate: int, spread: float) -> np.ndarray:
    """A sound at random times and strengths."""
    train = np.zeros(count, np.float32)
    number = rng.poisson(per_second * count / rate)
    np.add.at(
        train, rng.integers(count, size=number), np.exp(spread * normal(rng, number)) * np.sign(normal(rng, number))
    )
    size = sfft.next_fast_len(count + len(sound), real=True)
    return sfft.irfft(sfft.rfft(train, size) * sfft.rfft(sound, size), size)[:count]


def rain(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Hiss, and drops on something near."""
    steps = steps_of(count, rate)
    hiss = spectrum_slope(rng, (-1.0, 4.0), 2.0) + rng.uniform(0.02, 0.2) * wander(rng, steps, rng.uniform(0.2, 3.0))
    out = unit(moving_noise(rng, hiss, count, rate))
    surface = (METAL, PLASTIC, WOOD)[rng.integers(3)]
    sound = hits(rng, surface, 1, rate)[0][: rate // 8]
    drops = _drops(rng, count, log_uniform(rng, 4.0, 400.0), sound, rate, rng.uniform(0.5, 1.2))
    return out + unit(drops) * np.float32(10 ** (rng.uniform(-20.0, 8.0) / 20))


def fire(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Crackling, frying, rustling paper and bags: short bursts in flurries over a soft floor."""
    steps = steps_of(count, rate)
    floor = spectrum_slope(rng, (-6.0, 0.0)) + 0.4 * wander(rng, steps, rng.uniform(0.5, 6.0))
    size = int(rng.uniform(0.001, 0.012) * rate)
    sound = normal(rng, size) * np.exp(-6.9 * np.arange(size) / size).astype(np.float32)
    crackles = _drops(rng, count, log_uniform(rng, 20.0, 1500.0), sound, rate, rng.uniform(0.5, 1.5))
    crackles *= np.exp(rng.uniform(0.3, 1.5) * stretched(wander(rng, steps, rng.uniform(1.0, 8.0))[:, 0], count))
    return unit(crackles) + unit(moving_noise(rng, floor, count, rate)) * np.float32(
        10 ** (rng.uniform(-25.0, 3.0) / 20)
    )


def wind(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Gusts that grow brighter as they grow, and their buffeting at the microphone."""
    steps = steps_of(count, rate)
    gust = wander(rng, steps, log_uniform(rng, 0.2, 2.0)) * rng.uniform(0.3, 1.1)
    octaves = np.log2(BAND_HZ / log_uniform(rng, 60.0, 400.0))
    gains = gust - np.maximum(octaves, 0.0) * (rng.uniform(0.6, 1.3) - 0.15 * np.clip(gust, -2.0, 2.0))
    if rng.random() < 0.5:
        buffets = np.abs(wander(rng, steps, rng.uniform(4.0, 15.0)))
        gains = gains + buffets * rng.uniform(0.5, 2.0) * (octaves < 0)
    if rng.random() < 0.3:  # it whistles
        gains = gains + rng.uniform(1.0, 3.0) * hump(log_uniform(rng, 300.0, 2000.0), 0.25)
    return moving_noise(rng, gains, count, rate)


def water(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Taps, streams, showers, waves: bands that bubble each for itself."""
    steps = steps_of(count, rate)
    gains = spectrum_slope(rng, (-4.0, 2.0)) + rng.uniform(0.1, 0.8) * wander(
        rng, steps, log_uniform(rng, 2.0, 25.0), len(BAND_HZ)
    )
    if rng.random() < 0.4:
        gains = gains + rng.uniform(0.3, 1.2) * wander(rng, steps, rng.uniform(0.05, 0.4))
    return moving_noise(rng, gains, count, rate)


def traffic(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Cars that pass, their tyres brightest when they are near, over the rest of the city."""
    steps = steps_of(count, rate)
    time = np.arange(steps)[:, None] / STEP_HZ
    power = np.exp(2 * (spectrum_slope(rng, (-7.0, -4.0)) - rng.uniform(0.5, 3.0)))[None]
    for _ in range(rng.integers(1, 5)):
        seconds = rng.uniform(0.3, 2.5)
        nearness = 1.0 / (1.0 + np.square((time - rng.uniform(-1.0, count / rate + 1.0)) / seconds))
        tyres = hump(log_uniform(rng, 500.0, 1300.0), rng.uniform(0.8, 1.6)) + spectrum_slope(rng, (-4.0, -1.0), 2.0)
        far = -0.5 * (1.0 - nearness) * np.maximum(0.0, np.log2(BAND_HZ / 1000.0))
        power = power + np.square(nearness) * np.exp(2 * (tyres + far)) * 10 ** rng.uniform(-1.0, 0.5)
    out = unit(moving_noise(rng, np.log(power) / 2, count, rate))
    if rng.random() < 0.3:
        out = out + unit(engine(rng, count, rate)) * np.float32(10 ** (rng.uniform(-15.0, 3.0) / 20))
    return out

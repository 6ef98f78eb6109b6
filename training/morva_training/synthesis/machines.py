"""Machines: rotation heard as partials, noise that goes round with it, and load that changes."""

from __future__ import annotations

import numpy as np

from .sources import (
    Rng,
    cycle_of,
    log_uniform,
    moving_noise,
    played,
    spectrum_slope,
    steps_of,
    stretched,
    turns,
    unit,
    wander,
)


def _rotation(rng: Rng, steps: int, hz: float, drift: float, loads: float) -> np.ndarray:
    """The frequency of rotation: slow drift, and work that slows it and lets it go again."""
    curve = 1.0 + drift * wander(rng, steps, rng.uniform(0.1, 2.0))[:, 0]
    if rng.random() < loads:
        curve *= 1.0 - rng.uniform(0.05, 0.3) * (wander(rng, steps, rng.uniform(0.2, 1.0))[:, 0] > 0.3)
        curve = np.convolve(np.pad(curve, 4, mode="edge"), np.full(9, 1 / 9), mode="valid")
    if rng.random() < 0.15:  # being switched on or off
        ramp = 1.0 - np.exp(-np.arange(steps) / rng.uniform(10, 80))
        curve *= ramp if rng.random() < 0.5 else ramp[::-1]
    return np.maximum(hz * curve, 1.0)


def _partials(rng: Rng, hz: float, rate: int, slope: float, blades: int) -> np.ndarray:
    """Amplitudes of what fits below half the rate: some of them missing, those of the blades stronger."""
    number = np.arange(1, max(2, min(400, int(0.42 * rate / hz))))
    strength = number**-slope * rng.lognormal(0.0, 0.9, len(number))
    return strength * np.where(number % blades == 0, 3.0, 1.0) * (rng.random(len(number)) < 0.8)


def _machine(
    rng: Rng, count: int, rate: int, hz: float, tonal_db: tuple[float, float], drift: float, loads: float
) -> np.ndarray:
    steps, turn_hz = steps_of(count, rate), hz
    out = np.zeros(count, np.float32)
    rotation = _rotation(rng, steps, turn_hz, drift, loads)
    turn = turns(rotation, count, rate)
    for _ in range(rng.integers(1, 3)):  # another shaft turns at a fixed ratio
        amplitudes = _partials(rng, turn_hz, rate, rng.uniform(0.3, 1.8), int(rng.integers(1, 9)))
        out += rng.uniform(0.3, 1.0) * played(cycle_of(rng, amplitudes), turn)
        turn, turn_hz = turn * (ratio := rng.uniform(1.1, 3.0)), turn_hz * ratio
    gains = spectrum_slope(rng, (-6.0, 1.0)) + rng.uniform(0.0, 0.3) * wander(rng, steps, rng.uniform(0.5, 8.0))
    effort = np.log(rotation / hz + 0.05)[:, None]  # runs slower, sounds softer
    noise = unit(moving_noise(rng, gains + 2.0 * effort, count, rate))
    if rng.random() < 0.6:  # the noise goes round, too
        noise *= 1.0 + rng.uniform(0.2, 0.9) * played(cycle_of(rng, 1.0 / np.arange(1, 6) ** 2), turn) / 2.0
    tonal = unit(out) * stretched(np.exp(effort[:, 0]), count)
    return tonal * 10 ** (rng.uniform(*tonal_db) / 20) + noise


def fan(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Fans, extractors, air conditioning: mostly noise, blades and bearings in it."""
    return _machine(rng, count, rate, log_uniform(rng, 10.0, 120.0), (-25.0, -3.0), 0.003, 0.05)


def engine(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Engines, pumps and compressors: low partials, never quite even."""
    return _machine(rng, count, rate, log_uniform(rng, 8.0, 60.0), (-6.0, 10.0), 0.03, 0.4)


def tool(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Drills, mixers, hair dryers, vacuum cleaners: high partials that the work slows down."""
    return _machine(rng, count, rate, log_uniform(rng, 80.0, 700.0), (-8.0, 8.0), 0.01, 0.5)


def hum(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Mains, transformers, ballasts, the whine of electronics, over a floor of noise."""
    base = float(rng.choice([50.0, 60.0, 100.0, 120.0, log_uniform(rng, 300.0, 6000.0)]))
    turn = turns(np.full(8, base), count, rate)
    tone = played(cycle_of(rng, _partials(rng, base, rate, rng.uniform(0.5, 2.0), 2)), turn)
    floor = unit(moving_noise(rng, np.tile(spectrum_slope(rng, (-6.0, 0.0)), (steps_of(count, rate), 1)), count, rate))
    return tone + floor * np.float32(10 ** (rng.uniform(-20.0, 12.0) / 20))


def coloured(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Noise of a random spectrum that stays, breathes or flickers."""
    steps = steps_of(count, rate)
    gains = np.tile(spectrum_slope(rng, (-7.0, 2.0), rng.uniform(0.0, 6.0)), (steps, 1))
    if rng.random() < 0.6:
        gains += rng.uniform(0.05, 0.7) * wander(rng, steps, log_uniform(rng, 0.2, 12.0))
    if rng.random() < 0.4:
        gains += rng.uniform(0.05, 0.5) * wander(rng, steps, log_uniform(rng, 0.2, 12.0), gains.shape[1])
    return moving_noise(rng, gains, count, rate)

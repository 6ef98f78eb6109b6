"""Noise that sounds like a recording and is none of it: its statistics, imposed on fresh noise.

Measured per band: the distribution of levels, how quickly they change (the modulation spectrum), how
the bands move together, and the fine spectrum that stays. Statistics of two recordings can be mixed,
moved over frequency, quickened and slowed, so that a few recordings stand for very many places.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
from scipy import fft as sfft
from scipy.ndimage import uniform_filter1d
from scipy.special import ndtr

from .sources import BAND_HZ, STEP_HZ, Rng, bands_to_bins, bins_of, complex_normal, moving_noise, steps_of

LEVELS = 17  # of a distribution
SPEEDS = 33  # of a modulation spectrum, evenly spaced from 0 to half the steps
SHORTEST = 0.8  # seconds of which something can be said


@dataclass(frozen=True)
class Texture:
    """Statistics of log amplitudes per band."""

    levels: np.ndarray  # [LEVELS, bands] quantiles
    speeds: np.ndarray  # [SPEEDS, bands] amplitudes of the modulation
    together: np.ndarray  # [bands, bands] root of the correlation
    fine: np.ndarray  # [bins] what single bins add


def measured(samples: np.ndarray, rate: int) -> Texture:
    """Of a recording of at least SHORTEST seconds."""
    size = 2 * (bins_of(rate) - 1)
    frames = np.lib.stride_tricks.sliding_window_view(samples, size)[:: size // 2]
    window = np.sin(np.pi * (np.arange(size) + 0.5) / size).astype(np.float32)
    power = np.square(np.abs(sfft.rfft(frames * window, axis=-1))) + 1e-3
    weights = bands_to_bins(rate).T
    bands = np.log(uniform_filter1d(power @ (weights / (weights.sum(0) + 1e-6)) + 1e-3, 3, axis=0)) / 2
    spectrum = np.log(power.mean(axis=0)) / 2
    base = np.log(np.exp(2 * bands).mean(axis=0)) / 2
    moving = bands - bands.mean(axis=0)
    moving /= moving.std(axis=0) + 1e-3
    values, vectors = np.linalg.eigh(moving.T @ moving / len(moving))
    together = vectors * np.sqrt(np.maximum(values, 0.0))
    together = (together @ vectors.T).astype(np.float32)
    return Texture(
        levels=np.quantile(bands, np.linspace(0.0, 1.0, LEVELS), axis=0).astype(np.float32),
        speeds=_modulation(moving),
        together=together,
        fine=np.clip(spectrum - base @ weights.T, -2.5, 2.5).astype(np.float32),
    )


def _modulation(moving: np.ndarray) -> np.ndarray:
    """Mean modulation spectrum [SPEEDS, bands] of stretches that overlap by half."""
    size = 2 * (SPEEDS - 1)
    padded = np.pad(moving, [(0, max(0, size - len(moving))), (0, 0)])
    starts = range(0, len(padded) - size + 1, size // 2)
    window = np.hanning(size + 1)[:size, None]
    power = np.mean([np.square(np.abs(sfft.rfft(padded[s : s + size] * window, axis=0))) for s in starts], axis=0)
    return np.sqrt(uniform_filter1d(power, 3, axis=0) + 1e-3).astype(np.float32)


def mixed(first: Texture, second: Texture, share: float) -> Texture:
    """The levels of both in between; movement and fine spectrum of the first."""
    shift = np.median(first.levels) - np.median(second.levels)  # how loud it was recorded says nothing
    levels = (1.0 - share) * first.levels + share * (second.levels + shift)
    return Texture(levels, first.speeds, first.together, (1.0 - share) * first.fine)


def varied(rng: Rng, texture: Texture) -> Texture:
    """Moved over frequency by up to half an octave, quicker or slower, livelier or calmer."""
    shift = rng.uniform(-1.5, 1.5)
    bands, position = np.arange(len(BAND_HZ)), np.clip(np.arange(len(BAND_HZ)) + shift, 0, len(BAND_HZ) - 1.0)
    low = np.minimum(position.astype(int), len(bands) - 2)
    part = (position - low).astype(np.float32)
    levels = texture.levels[:, low] * (1 - part) + texture.levels[:, low + 1] * part
    levels = levels.mean(0) + (levels - levels.mean(0)) * rng.uniform(0.7, 1.2)
    speed = np.minimum(np.arange(SPEEDS) * rng.uniform(0.6, 1.6), SPEEDS - 1).astype(int)
    return Texture(levels, texture.speeds[speed], texture.together, texture.fine * rng.uniform(0.3, 1.0))


def played(rng: Rng, texture: Texture, count: int, rate: int) -> np.ndarray:
    """Fresh noise with these statistics."""
    steps = steps_of(count, rate)
    size = sfft.next_fast_len(steps + 32, real=True)
    fraction = sfft.rfftfreq(size, 0.5 / (SPEEDS - 1))
    low = np.minimum(fraction.astype(int), SPEEDS - 2)
    part = (fraction - low)[:, None].astype(np.float32)
    speeds = texture.speeds[low] * (1 - part) + texture.speeds[low + 1] * part
    speeds /= np.sqrt(np.mean(np.square(speeds), axis=0))
    moving = sfft.irfft((complex_normal(rng, len(low), len(BAND_HZ)) @ texture.together) * speeds, n=size, axis=0)
    moving = moving[:steps] / (moving.std(axis=0) + 1e-6)
    rank = ndtr(moving) * (LEVELS - 1)
    low = np.minimum(rank.astype(int), LEVELS - 2)
    part = (rank - low).astype(np.float32)
    band = np.arange(len(BAND_HZ))
    gains = texture.levels[low, band] * (1 - part) + texture.levels[low + 1, band] * part
    return moving_noise(rng, gains - np.median(gains), count, rate, texture.fine)


def longest_modulation() -> float:
    """Seconds that the slowest measured movement takes."""
    return 2 * (SPEEDS - 1) / STEP_HZ

"""What every synthesised sound is made of: quick randomness, noise of a moving spectrum, cycles, decays.

Everything costs a few passes over the samples: Gaussian values are looked up by random 16-bit numbers
among the distribution's own quantiles, and a sound of any number of partials is one cycle of it that is
read at a moving speed.
"""

from __future__ import annotations

import functools

import numpy as np
from scipy import fft as sfft
from scipy.special import ndtri

STEP_HZ = 62.5  # steps of a moving spectrum per second
BAND_HZ = np.geomspace(50.0, 16000.0, 26)
CYCLE = 8192
_QUANTILES = ndtri((np.arange(65536) + 0.5) / 65536).astype(np.float32)

Rng = np.random.Generator


def normal(rng: Rng, shape: int | tuple[int, ...]) -> np.ndarray:
    """Gaussian values of unit variance."""
    return _QUANTILES.take(rng.integers(65536, size=shape, dtype=np.uint16), mode="clip")


def complex_normal(rng: Rng, *shape: int) -> np.ndarray:
    return normal(rng, (*shape, 2)).view(np.complex64)[..., 0]


def log_uniform(rng: Rng, low: float, high: float) -> float:
    return float(low * (high / low) ** rng.random())


def steps_of(count: int, rate: int) -> int:
    """How many steps a moving spectrum needs for `count` samples, wherever it begins."""
    return int(count * STEP_HZ / rate) + 3


def bins_of(rate: int) -> int:
    return int(rate / STEP_HZ) + 1


@functools.lru_cache(maxsize=4)
def bands_to_bins(rate: int) -> np.ndarray:
    """Weights [bands, bins] that draw straight lines between the bands over the logarithm of frequency."""
    frequency = np.linspace(0.0, rate / 2, bins_of(rate))
    position = np.interp(np.log(np.maximum(frequency, 1.0)), np.log(BAND_HZ), np.arange(len(BAND_HZ)))
    return np.maximum(0.0, 1.0 - np.abs(position - np.arange(len(BAND_HZ))[:, None])).astype(np.float32)


def moving_noise(rng: Rng, log_gains: np.ndarray, count: int, rate: int, fine: np.ndarray | None = None) -> np.ndarray:
    """Noise whose spectrum moves: natural logs of amplitudes [steps_of(count, rate), bands].

    `fine` are logs per bin that stay. Frames of noise of their own overlap by half, so their powers add.
    """
    curves = log_gains.astype(np.float32) @ bands_to_bins(rate)
    spectra = complex_normal(rng, *curves.shape) * np.exp(curves if fine is None else curves + fine)
    frames = sfft.irfft(spectra, axis=-1)
    size = frames.shape[-1]
    frames *= np.sin(np.pi * (np.arange(size) + 0.5) / size).astype(np.float32)
    half = size // 2
    joined = frames[1:, :half] + frames[:-1, half:]
    return joined.reshape(-1)[(start := int(rng.integers(half))) : start + count]


def wander(rng: Rng, steps: int, hz: float, channels: int = 1) -> np.ndarray:
    """Gaussian curves [steps, channels] of unit variance that move about `hz` times a second."""
    size = sfft.next_fast_len(2 * steps, real=True)
    frequency = sfft.rfftfreq(size, 1 / STEP_HZ)
    shape = 1.0 / (1.0 + np.square(frequency / hz))
    shape *= np.sqrt(size**2 / (2.0 * np.sum(np.square(shape)))) / np.sqrt(2.0)
    spectra = complex_normal(rng, len(frequency), channels) * shape[:, None].astype(np.float32)
    return sfft.irfft(spectra, n=size, axis=0)[:steps]


def spectrum_slope(rng: Rng, tilt_db: tuple[float, float], bumps_db: float = 4.0) -> np.ndarray:
    """Logs of amplitudes per band: a slope per octave and a smooth random shape on top."""
    octaves = np.log2(BAND_HZ / 1000.0)
    shape = np.interp(np.arange(len(BAND_HZ)), np.linspace(0, len(BAND_HZ) - 1, 9), rng.normal(0.0, bumps_db, 9))
    return (rng.uniform(*tilt_db) * octaves + shape) * (np.log(10.0) / 20.0)


def hump(centre_hz: float, octaves: float) -> np.ndarray:
    """Logs of amplitudes per band of a bell around a frequency."""
    return -0.5 * np.square(np.log2(BAND_HZ / centre_hz) / octaves)


def stretched(points: np.ndarray, count: int) -> np.ndarray:
    """A curve of `count` samples through evenly spaced points."""
    return np.interp(np.linspace(0.0, len(points) - 1.0, count), np.arange(len(points)), points).astype(np.float32)


def cycle_of(rng: Rng, amplitudes: np.ndarray) -> np.ndarray:
    """One cycle of the partials 1, 2, ... with random phases, of unit power."""
    spectrum = np.zeros(CYCLE // 2 + 1, np.complex64)
    partials = min(len(amplitudes), CYCLE // 4)
    spectrum[1 : partials + 1] = amplitudes[:partials] * np.exp(2j * np.pi * rng.random(partials))
    cycle = sfft.irfft(spectrum)
    return cycle / (np.sqrt(np.mean(np.square(cycle))) + 1e-12)


def turns(frequency: np.ndarray, count: int, rate: int) -> np.ndarray:
    """Where in its cycle a sound is at each sample, its frequency going through evenly spaced points."""
    coarse = np.cumsum(frequency) * (count / (len(frequency) - 1) / rate)
    return np.interp(np.linspace(0.0, len(frequency) - 1.0, count), np.arange(len(frequency)), coarse)


def played(cycle: np.ndarray, turn: np.ndarray) -> np.ndarray:
    return cycle[(turn * CYCLE).astype(np.int32) & (CYCLE - 1)]


def decays(frequency: np.ndarray, seconds: np.ndarray, count: int, rate: int) -> np.ndarray:
    """Decaying oscillations [modes, count] that start at zero; `seconds` until they are 60 dB down."""
    rates = (2j * np.pi * frequency - 6.9 / np.maximum(seconds, 1e-3))[:, None] / rate
    block = 256
    rough = np.exp(rates * np.arange(0, count, block)).astype(np.complex64)
    fine = np.exp(rates * np.arange(block)).astype(np.complex64)
    return (rough[:, :, None] * fine[:, None, :]).imag.reshape(len(frequency), -1)[:, :count]


def added(out: np.ndarray, piece: np.ndarray, position: int) -> None:
    """Adds what of the piece lies within `out`."""
    piece = piece[max(0, -position) : max(0, len(out) - position)]
    position = max(0, position)
    out[position : position + len(piece)] += piece


def unit(samples: np.ndarray) -> np.ndarray:
    """Of unit power, whatever it was."""
    return (samples / (np.sqrt(np.mean(np.square(samples))) + 1e-9)).astype(np.float32, copy=False)

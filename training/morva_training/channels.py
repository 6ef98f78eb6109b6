"""What microphones, converters, connections and codecs do to the sum of speech and noise.

Whatever is linear (gains over frequency and over time) is done to the parts of a piece alike and stays in
the target. A `Channel` does the rest, to what is heard alone.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
from scipy import fft as sfft

FULL_SCALE = 32768.0
CONVERTER_HZ = 13600.0  # where the rate conversion in front of the features ends


def smooth_gain(rng: np.random.Generator, bins: int, rate: int, deviation_db: float) -> np.ndarray:
    """A smooth random equaliser over the bins up to rate / 2: six points, evenly spaced in octaves."""
    points = np.cumsum(rng.normal(0.0, deviation_db, 6)) * 0.6
    frequency = np.linspace(0.0, rate / 2, bins)
    position = np.log2(1 + frequency / 200.0) / np.log2(1 + rate / 400.0) * 5
    curve = np.interp(position, np.arange(6), points - points.mean())
    return (10 ** (curve / 20)).astype(np.float32)


def microphone_gain(rng: np.random.Generator, bins: int, rate: int) -> np.ndarray:
    """A cut of the lows and a few resonances of capsule and case."""
    frequency = np.linspace(0.0, rate / 2, bins, dtype=np.float32)
    gain = 1.0 / np.sqrt(1.0 + (rng.uniform(40.0, 350.0) / np.maximum(frequency, 1.0)) ** rng.choice([2, 4]))
    for _ in range(rng.integers(0, 4)):
        centre = 600.0 * (rate / 1200.0) ** rng.random()
        width = centre * rng.uniform(0.05, 0.4)
        gain *= 1.0 + (10 ** (rng.uniform(-10.0, 12.0) / 20) - 1.0) / (1.0 + np.square((frequency - centre) / width))
    return gain.astype(np.float32)


def low_pass(bins: int, rate: int, edge_hz: float) -> np.ndarray:
    """A steep edge."""
    steepness = np.clip((np.arange(bins) / bins - edge_hz / (rate / 2)) * 200, -40, 40)
    return (1 / (1 + np.exp(steepness))).astype(np.float32)


def gain_steps(rng: np.random.Generator, count: int, rate: int) -> np.ndarray:
    """An automatic gain or a hand at the knob: one or two changes by up to 12 dB, sudden or slow."""
    db = np.zeros(count // (rate // 100) + 2)
    for _ in range(rng.integers(1, 3)):
        start, length = rng.integers(len(db)), int(rng.choice([1, 5, 50]))
        db += rng.uniform(-12.0, 12.0) * np.clip((np.arange(len(db)) - start) / length, 0.0, 1.0)
    return _drawn(10 ** (db / 20), count)


def gaps(rng: np.random.Generator, count: int, rate: int) -> np.ndarray:
    """Lost packets of 10 to 60 ms, some of them in bursts."""
    gain = np.ones(count // (rate // 200) + 2)
    for start in rng.integers(len(gain), size=rng.integers(1, 6)):
        for _ in range(rng.integers(1, 4)):
            gain[start : start + 2 * int(rng.integers(1, 7))] = 0.0
            start += int(rng.integers(4, 40))
    return _drawn(gain, count)


def _drawn(points: np.ndarray, count: int) -> np.ndarray:
    """A line through evenly spaced points."""
    position = np.linspace(0.0, len(points) - 1.0, count)
    return np.interp(position, np.arange(len(points)), points).astype(np.float32)


def companded(samples: np.ndarray, rate: int, coarseness: float) -> np.ndarray:
    """Logarithmic 8-bit samples as telephones send them, or fewer bits."""
    steps, bend = 127.0 / 4.0**coarseness, 255.0
    level = np.log1p(bend * np.minimum(1.0, np.abs(samples) / FULL_SCALE)) / np.log1p(bend)
    level = np.rint(level * steps) / steps
    return (np.sign(samples) * np.expm1(level * np.log1p(bend)) / bend * FULL_SCALE).astype(np.float32)


def in_blocks(samples: np.ndarray, rate: int, coarseness: float) -> np.ndarray:
    """A few bits a sample, their step following the loudest sample of every 4 ms, as adaptive differences do."""
    size = rate // 250
    blocks = np.pad(samples, (0, -len(samples) % size)).reshape(-1, size)
    step = np.abs(blocks).max(axis=1, keepdims=True) / (48.0 / 6.0**coarseness) + 1.0
    return (np.rint(blocks / step) * step).reshape(-1)[: len(samples)].astype(np.float32)


def bands_of_codec(rate: int) -> tuple[np.ndarray, np.ndarray]:
    """The first bins and the widths of the bands of `in_bands`."""
    size = rate // 50
    edges = np.concatenate([[0], np.unique(np.geomspace(4, size // 2, 18).astype(int))[:-1]])
    return edges, np.diff(np.append(edges, size // 2))


def in_bands(samples: np.ndarray, rate: int, coarseness: float) -> np.ndarray:
    """What perceptual codecs leave: coarse steps per band and frame, coarser above, and holes where it is soft."""
    size = rate // 50
    padded = np.pad(samples, (size // 2, size + size // 2))
    frames = np.lib.stride_tricks.sliding_window_view(padded, size)[:: size // 2]
    window = np.sin(np.pi * (np.arange(size) + 0.5) / size).astype(np.float32)
    spectra = sfft.rfft((frames * window).astype(np.float32), axis=-1)[..., : size // 2]
    power = np.square(spectra.real) + np.square(spectra.imag)
    edges, widths = bands_of_codec(rate)
    level = np.sqrt(np.add.reduceat(power, edges, axis=-1) / widths)
    loudest = level.max(axis=-1, keepdims=True)
    step = level * (0.3 + 1.6 * coarseness) * np.linspace(0.5, 1.5, len(edges)) + 1e-4 * 10**coarseness * loudest + 1e-3
    step = np.repeat(step, widths, axis=-1).astype(np.float32)
    coarse = np.zeros((len(spectra), size // 2 + 1), np.complex64)
    coarse.real[:, : size // 2] = np.rint(spectra.real / step) * step
    coarse.imag[:, : size // 2] = np.rint(spectra.imag / step) * step
    pieces = sfft.irfft(coarse, n=size, axis=-1) * window
    joined = pieces[1:, : size // 2] + pieces[:-1, size // 2 :]
    return joined.reshape(-1)[: len(samples)]


CODECS = {"companded": companded, "blocks": in_blocks, "bands": in_bands}


@dataclass(frozen=True)
class Channel:
    """What is done to the sum alone: nothing, unless fields say otherwise."""

    clip: float | None = None  # share of its peak at which the microphone clips the sum
    codec: str | None = None  # one of CODECS
    coarseness: float = 0.0  # 0 to 1

    def heard(self, total: np.ndarray, rate: int) -> np.ndarray:
        limit = FULL_SCALE if self.clip is None else min(FULL_SCALE, self.clip * np.abs(total).max())
        total = np.clip(total, -limit, limit)
        if self.codec is None:
            return total
        return np.clip(CODECS[self.codec](total, rate, self.coarseness), -FULL_SCALE, FULL_SCALE)

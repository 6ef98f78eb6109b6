"""Frames, windows and bands of the noise models, in NumPy, for whole recordings at once.

Everything here mirrors the engine's arithmetic, so that the network hears in training what it
hears in a call. Samples are floats on the 16-bit scale. A model frame is two hops long; frame t
covers hops t - 1 and t, the hop before the first being silence.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
from scipy import fft as sfft

FEATURE_OFFSET = 1000.0  # keeps the logarithm of a silent band finite
REFERENCE_AMPLITUDE = 2000.0
ACTIVITY_ENERGY = 100.0
ENERGY_FRAMES = 10


@dataclass(frozen=True)
class Layout:
    """The fixed numbers of one noise model."""

    rate: int
    frame: int
    compress: int
    preview: int = 3
    first_bin: int = 0

    @property
    def hop(self) -> int:
        return self.frame // 2

    @property
    def bins(self) -> int:
        """Bins the network sees; the bin at half the rate is always cleared."""
        return self.frame // 2

    @property
    def bands(self) -> int:
        return self.bins * (self.compress + 2) >> (self.compress + 1)

    @property
    def active_frames(self) -> int:
        """How many active frames the level gain averages over (three seconds)."""
        return self.rate * 3 // self.hop

    def band_widths(self) -> np.ndarray:
        """Bins per band: single bins first, then doubling widths, one width per octave."""
        single = self.bins >> self.compress
        widths = [1] * single
        width, start = 2, single
        while start < self.bins:
            widths += [width] * (start // width)
            start, width = 2 * start, 2 * width
        return np.array(widths)

    def band_of_bin(self) -> np.ndarray:
        return np.repeat(np.arange(self.bands), self.band_widths())

    def band_starts(self) -> np.ndarray:
        return np.concatenate([[0], np.cumsum(self.band_widths())[:-1]])


FULL_32K = Layout(rate=32000, frame=640, compress=3)
SMALL_16K = Layout(rate=16000, frame=320, compress=2)
SMALL_8K = Layout(rate=8000, frame=160, compress=1)


def vorbis_window(size: int) -> np.ndarray:
    """Power-complementary window sampled at whole points: zero first, peak at size / 2."""
    index = np.arange(size)
    return np.sin(np.pi / 2 * np.sin(index * (np.pi / size)) ** 2).astype(np.float32)


def hamming_window(size: int) -> np.ndarray:
    return (0.54 - 0.46 * np.cos(np.arange(size) * (2 * np.pi / (size - 1)))).astype(np.float32)


def frames_of(samples: np.ndarray, hop: int) -> np.ndarray:
    """All model frames [..., T, 2 * hop] of samples [..., T * hop] (a view of a padded copy)."""
    count = samples.shape[-1] // hop
    pad = [(0, 0)] * (samples.ndim - 1) + [(hop, 0)]
    padded = np.pad(samples[..., : count * hop], pad)
    view = np.lib.stride_tricks.sliding_window_view(padded, 2 * hop, axis=-1)
    return view[..., ::hop, :][..., :count, :]


def analyse(samples: np.ndarray, layout: Layout) -> np.ndarray:
    """Spectra [..., T, frame / 2 + 1], complex64, of samples [..., T * hop]."""
    frames = frames_of(samples, layout.hop) * vorbis_window(layout.frame)
    return sfft.rfft(frames.astype(np.float32, copy=False), axis=-1)


def frame_energies(spectra: np.ndarray, frame: int) -> np.ndarray:
    """Mean square per sample of each frame, estimated from windowed half spectra.

    The window halves the energy of a steady frame; Parseval with the mirrored half gives the rest.
    """
    power = np.square(spectra.real) + np.square(spectra.imag)
    return 2.0 * power.sum(axis=-1) / (frame * frame * 0.5)


def level_gains(
    energies: np.ndarray,
    active_frames: int,
    reference: float = REFERENCE_AMPLITUDE,
    threshold: float = ACTIVITY_ENERGY,
    history: float | None = None,
) -> np.ndarray:
    """The gain before the features for every frame of a stream, [T].

    A frame is active when the mean energy of the last ten frames reaches the threshold; the gain
    brings the mean energy of the last active frames to the reference. `history` is the mean
    energy of a long stream that went before; without it the stream has just started.
    """
    padded = np.concatenate([np.zeros(ENERGY_FRAMES - 1), energies])
    windowed = np.convolve(padded, np.full(ENERGY_FRAMES, 1.0 / ENERGY_FRAMES), mode="valid")
    active = windowed >= threshold
    past = np.full(active_frames, history) if history is not None else np.array([reference**2])
    sums = np.concatenate([[0.0], np.cumsum(np.concatenate([past, energies[active]]))])
    last = len(past) + np.cumsum(active)
    first = np.maximum(last - active_frames, 0)
    mean = (sums[last] - sums[first]) / (last - first)
    return np.where(mean > 1e-6, reference / np.sqrt(np.maximum(mean, 1e-6)), 1.0)


def compress_bands(power: np.ndarray, layout: Layout) -> np.ndarray:
    """Band powers [..., K] of bin powers [..., B]."""
    return np.add.reduceat(power, layout.band_starts(), axis=-1)


def log_features(spectra: np.ndarray, gains: np.ndarray, layout: Layout) -> np.ndarray:
    """Log band powers [..., T, K] before standardisation."""
    seen = spectra[..., layout.first_bin : layout.first_bin + layout.bins]
    power = np.square(seen.real) + np.square(seen.imag)
    bands = compress_bands(power * np.square(gains)[..., None], layout)
    return np.log(bands + FEATURE_OFFSET).astype(np.float32)

"""What changes a voice: whispering, and a head of another size."""

from __future__ import annotations

import numpy as np
from scipy import fft as sfft
from scipy.ndimage import gaussian_filter1d, uniform_filter1d

FRAMES_HZ = 50.0


def _spectra(samples: np.ndarray, rate: int) -> tuple[np.ndarray, np.ndarray]:
    """Frames of 20 ms that overlap by half, as spectra, and their window."""
    size = int(rate / FRAMES_HZ)
    frames = np.lib.stride_tricks.sliding_window_view(np.pad(samples, (size, size)), size)[:: size // 2]
    window = np.sin(np.pi * (np.arange(size) + 0.5) / size).astype(np.float32)
    return sfft.rfft((frames * window).astype(np.float32, copy=False), axis=-1), window


def _joined(spectra: np.ndarray, window: np.ndarray, count: int) -> np.ndarray:
    size = len(window)
    pieces = sfft.irfft(spectra.astype(np.complex64, copy=False), n=size, axis=-1) * window
    out = np.zeros((len(pieces) + 1, size // 2), np.float32)
    out[:-1] += pieces[:, : size // 2]
    out[1:] += pieces[:, size // 2 :]
    return out.reshape(-1)[size : size + count]


def whispered(rng: np.random.Generator, samples: np.ndarray, rate: int) -> np.ndarray:
    """The same words without a voice: the smoothed spectrum, excited by noise, thin below 500 Hz."""
    spectra, window = _spectra(samples, rate)
    envelope = gaussian_filter1d(np.abs(spectra), 4.0, axis=-1)
    frequency = np.arange(envelope.shape[-1]) * FRAMES_HZ
    noise = rng.standard_normal((*envelope.shape, 2)).astype(np.float32)
    return _joined(
        envelope * (noise[..., 0] + 1j * noise[..., 1]) * (frequency / (frequency + 500.0)), window, len(samples)
    )


def formants_moved(samples: np.ndarray, rate: int, factor: float, highest_hz: float) -> np.ndarray:
    """The same pitch from a shorter or longer throat: the smooth spectrum, stretched below `highest_hz`."""
    spectra, window = _spectra(samples, rate)
    power = np.square(spectra.real) + np.square(spectra.imag)
    envelope = np.log(uniform_filter1d(uniform_filter1d(power, 7, axis=-1), 5, axis=-1) + 1.0)
    bins = np.arange(envelope.shape[-1])
    source = np.minimum(bins / factor, len(bins) - 1.001)
    low = source.astype(int)
    part = (source - low).astype(np.float32)
    moved = envelope[:, low] * (1 - part) + envelope[:, low + 1] * part
    share = np.clip((highest_hz / FRAMES_HZ - bins) / 10.0, 0.0, 1.0).astype(np.float32)
    gain = np.exp(0.5 * np.clip(moved - envelope, -4.0, 4.0) * share)
    return _joined(spectra * gain, window, len(samples))

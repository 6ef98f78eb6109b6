"""Scores of one processed recording. Samples are floats, -1..1, mono; levels in dB."""

from __future__ import annotations

import numpy as np
import tree  # noqa: F401
from morva_training.measures import noise_in_pauses, pauses_of
from scipy.fft import irfft, next_fast_len, rfft
from scipy.optimize import minimize_scalar
from scipy.signal import resample_poly

PESQ_RATE = 16000


def aligned(
    reference: np.ndarray, result: np.ndarray, rate: int, longest: float = 0.15
) -> tuple[np.ndarray, np.ndarray]:
    """Both signals with the result's delay taken out to a hundredth of a sample.

    A result that stands early counts as delayed by less than nothing: systems that round their delay differently are
    treated alike.
    """
    count = min(len(reference), len(result))
    if not (np.any(reference) and np.any(result)):
        return reference[:count], result[:count]
    size = next_fast_len(2 * count)
    cross = rfft(result[:count], size) * np.conj(rfft(reference[:count], size))
    correlation = irfft(cross, size)
    limit = int(longest * rate)
    lags = np.arange(-limit, limit + 1)
    delay = _peak(cross[: size * PESQ_RATE // rate // 2], size, int(lags[np.argmax(correlation[lags])]))
    shifted = _advanced(result, delay)
    first, last = max(0, int(np.ceil(-delay))), min(count, len(result) - int(np.ceil(delay)))
    return reference[first:last], shifted[first:last]


def _peak(cross: np.ndarray, size: int, coarse: int) -> float:
    """Where the correlation peaks between the samples beside `coarse`, to a hundredth of a sample."""
    turns = 2j * np.pi * np.arange(len(cross)) / size

    def depth(delay: float) -> float:
        return -float(np.real(np.sum(cross * np.exp(turns * delay))))

    return float(minimize_scalar(depth, bounds=(coarse - 1, coarse + 1), method="bounded", options={"xatol": 0.01}).x)


def _advanced(samples: np.ndarray, delay: float) -> np.ndarray:
    """The samples `delay` samples earlier; zeros come in at the edges."""
    margin = int(np.ceil(abs(delay))) + 64
    padded = np.pad(np.asarray(samples, np.float64), margin)
    padded = np.pad(padded, (0, next_fast_len(len(padded)) - len(padded)))
    spectrum = rfft(padded)
    turns = 2j * np.pi * np.arange(len(spectrum)) / len(padded)
    return irfft(spectrum * np.exp(turns * delay), len(padded))[margin : margin + len(samples)]


def at_rate(samples: np.ndarray, rate: int, wanted: int) -> np.ndarray:
    if rate == wanted:
        return samples
    divisor = int(np.gcd(rate, wanted))
    return resample_poly(samples, wanted // divisor, rate // divisor)


def pesq_score(reference: np.ndarray, result: np.ndarray, rate: int) -> float:
    """Wide-band PESQ (narrow-band for 8 kHz material); NaN where there is no speech or no sound at all."""
    from pesq import PesqError, pesq

    mode, wanted = ("nb", 8000) if rate == 8000 else ("wb", PESQ_RATE)
    heard, clean = at_rate(result, rate, wanted), at_rate(reference, rate, wanted)
    if not (np.any(heard) and np.any(clean)):
        return float("nan")
    try:
        return float(pesq(wanted, clean, heard, mode))
    except PesqError:
        return float("nan")


def stoi_score(reference: np.ndarray, result: np.ndarray, rate: int) -> float:
    from pystoi import stoi

    return float(stoi(at_rate(reference, rate, 10000), at_rate(result, rate, 10000), 10000))


def pause_attenuation(speech: np.ndarray, noisy: np.ndarray, result: np.ndarray, rate: int) -> float:
    """How far the noise in the pauses of clean speech goes down; NaN where that cannot be said."""
    before, after = noise_in_pauses(noisy, result, pauses_of(speech, rate), rate)
    return before - after

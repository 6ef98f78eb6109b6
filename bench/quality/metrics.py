"""Scores of one processed recording. Samples are floats, -1..1, mono; levels in dB."""

from __future__ import annotations

import numpy as np
import tree  # noqa: F401
from morva_training.measures import level_db, pauses_of
from scipy.signal import correlate, resample_poly

PESQ_RATE = 16000


def aligned(
    reference: np.ndarray, result: np.ndarray, rate: int, longest: float = 0.15
) -> tuple[np.ndarray, np.ndarray]:
    """Both signals with the result's delay taken out (whole samples, at most `longest` seconds)."""
    count = min(len(reference), len(result))
    reference, result = reference[:count], result[:count]
    limit = int(longest * rate)
    correlation = correlate(result, reference, mode="full", method="fft")
    middle = count - 1
    delay = int(np.argmax(correlation[middle : middle + limit]))
    return reference[: count - delay], result[delay:]


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
    """How far the noise in the pauses is pushed down; NaN with less than 0.3 s of pause.

    The cleaned level is not taken below -100 dB of full scale, so that digital silence does not count as infinite.
    """
    count = min(len(speech), len(noisy), len(result))
    quiet = pauses_of(speech[:count], rate)
    if quiet.sum() < 0.3 * rate or level_db(noisy[:count][quiet]) < -75:
        return float("nan")
    return level_db(noisy[:count][quiet]) - max(level_db(result[:count][quiet]), -100.0)

"""Scores of one processed recording. Samples are floats, -1..1, mono; levels in dB."""

from __future__ import annotations

import sys
from pathlib import Path

import numpy as np
from scipy.signal import correlate, resample_poly

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "training"))

from morva_training.scoring import best_f1, roc_auc  # noqa: E402, F401

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


def si_sdr(reference: np.ndarray, result: np.ndarray) -> float:
    """Scale-invariant signal-to-distortion ratio in dB."""
    reference = reference - reference.mean()
    result = result - result.mean()
    target = reference * (np.dot(result, reference) / (np.dot(reference, reference) + 1e-12))
    return float(10 * np.log10((np.sum(target**2) + 1e-12) / (np.sum((result - target) ** 2) + 1e-12)))


def at_rate(samples: np.ndarray, rate: int, wanted: int) -> np.ndarray:
    if rate == wanted:
        return samples
    divisor = int(np.gcd(rate, wanted))
    return resample_poly(samples, wanted // divisor, rate // divisor)


def pesq_score(reference: np.ndarray, result: np.ndarray, rate: int) -> float:
    """Wide-band PESQ (narrow-band for 8 kHz material); NaN where the measure finds no speech."""
    from pesq import PesqError, pesq

    mode, wanted = ("nb", 8000) if rate == 8000 else ("wb", PESQ_RATE)
    try:
        return float(pesq(wanted, at_rate(reference, rate, wanted), at_rate(result, rate, wanted), mode))
    except PesqError:
        return float("nan")


def stoi_score(reference: np.ndarray, result: np.ndarray, rate: int) -> float:
    from pystoi import stoi

    return float(stoi(at_rate(reference, rate, 10000), at_rate(result, rate, 10000), 10000))


def level_db(samples: np.ndarray) -> float:
    return float(10 * np.log10(np.mean(np.square(samples, dtype=np.float64)) + 1e-12))


def pauses_of(speech: np.ndarray, rate: int, settle: float = 0.35, edge: float = 0.02) -> np.ndarray:
    """Samples where nobody speaks: 45 dB below the loud speech, `settle` seconds after its end."""
    block = rate // 100
    count = len(speech) // block
    power = np.square(speech[: count * block].reshape(count, block)).mean(axis=1)
    busy = power > np.percentile(power, 95) * 10**-4.5
    quiet = np.ones(count, bool)
    for index in np.flatnonzero(busy):
        quiet[max(0, index - int(edge * 100) - 1) : index + int(settle * 100)] = False
    return np.repeat(quiet, block)


def pause_attenuation(speech: np.ndarray, noisy: np.ndarray, result: np.ndarray, rate: int) -> float:
    """How far the noise in the pauses is pushed down; NaN with less than 0.3 s of pause.

    The cleaned level is not taken below -100 dB of full scale, so that digital silence does not count as infinite.
    """
    count = min(len(speech), len(noisy), len(result))
    quiet = pauses_of(speech[:count], rate)
    quiet = np.append(quiet, np.zeros(count - len(quiet), bool))
    if quiet.sum() < 0.3 * rate or level_db(noisy[:count][quiet]) < -75:
        return float("nan")
    return level_db(noisy[:count][quiet]) - max(level_db(result[:count][quiet]), -100.0)

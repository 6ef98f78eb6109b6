"""How much of the speech itself is lost, whatever happens to the noise. Levels in dB, samples of any scale.

A loss is the least-squares gain of the clean speech within the result, over the bins of a group, turned
around: what is left of the noise is another sound and averages out. Zero: the speech is as it was.
"""

from __future__ import annotations

from typing import NamedTuple

import numpy as np
from scipy.signal import stft

QUIET = 1e-10
OCTAVES_HZ = (125, 250, 500, 1000, 2000, 4000, 8000, 16000)
HISS_HZ = 4000  # consonants: frames whose power above this is within 10 dB of the rest
WIDE_HZ = 8000  # up to which all systems hear: consonants and onsets count below, the treble above
WORD_PAUSE = 0.2  # seconds of pause before a word
ONSET = 0.03  # seconds


class Losses(NamedTuple):
    """By how many dB the speech itself is lower in the result; NaN where there is too little of it to say."""

    consonants: float
    onsets: float
    treble: float  # above 8 kHz
    octaves: dict[int, float]  # by lower edge in Hz


def _spectra(samples: np.ndarray, rate: int) -> tuple[np.ndarray, np.ndarray]:
    """Frequencies, and the spectrum by frame (5 ms apart) and bin."""
    hertz, _, spectrum = stft(samples, rate, nperseg=rate // 50, noverlap=rate // 50 - rate // 200, boundary=None)
    return hertz, spectrum.T


def _loss_db(speech: np.ndarray, result: np.ndarray, where: np.ndarray) -> float:
    """Least-squares gain of the speech within the result over these bins: what is left of the noise averages out."""
    power = np.sum(np.abs(speech[where]) ** 2)
    if np.count_nonzero(where) < 50 or power <= QUIET:
        return float("nan")
    gain = np.sum(np.real(result[where] * np.conj(speech[where]))) / power
    return float(-20 * np.log10(max(gain, 1e-3)))


def losses(reference: np.ndarray, result: np.ndarray, rate: int) -> Losses:
    """Bins count within 30 dB of the loud ones of their own octave, so that soft treble counts like loud bass."""
    hertz, speech = _spectra(np.asarray(reference, np.float64), rate)
    _, cleaned = _spectra(np.asarray(result, np.float64), rate)
    power = np.abs(speech) ** 2
    frame_power = power.sum(axis=1)
    talking = frame_power > np.percentile(frame_power, 95) * 1e-4

    audible = np.zeros_like(power, bool)
    octaves: dict[int, np.ndarray] = {}
    for low in OCTAVES_HZ:
        bins = (hertz >= low) & (hertz < 2 * low)
        if 2 * low > 1.02 * rate / 2 or not bins.any():
            continue
        loud = np.percentile(power[:, bins], 99)
        # Less than 60 dB below the whole: nothing but the rounding of a file that ends below this octave.
        if loud > np.percentile(power, 99) * 1e-6:
            audible[:, bins] = power[:, bins] > loud * 1e-3
        octaves[low] = np.broadcast_to(bins, power.shape)

    high, wide = hertz >= HISS_HZ, hertz < WIDE_HZ
    hiss = power[:, high].sum(axis=1) > 0.1 * power[:, ~high].sum(axis=1)
    return Losses(
        consonants=_loss_db(speech, cleaned, audible & (hiss & talking)[:, None] & high & wide),
        onsets=_loss_db(speech, cleaned, audible & _onset_frames(talking)[:, None] & wide),
        treble=_loss_db(speech, cleaned, audible & ~wide),
        octaves={low: _loss_db(speech, cleaned, audible & bins) for low, bins in octaves.items()},
    )


def _onset_frames(talking: np.ndarray, frames_per_second: int = 200) -> np.ndarray:
    """The first ONSET seconds of every word that follows a pause."""
    pause, onset = round(WORD_PAUSE * frames_per_second), round(ONSET * frames_per_second)
    marks = np.zeros(len(talking), bool)
    silent_for = 0
    for index, talks in enumerate(talking):
        if talks and silent_for >= pause:
            marks[index : index + onset] = True
        silent_for = 0 if talks else silent_for + 1
    return marks

"""What is measured the same way in training, bench and demo, in NumPy: levels, pauses, voice, ratios, areas.

Powers are means of squares of the samples, on any scale; levels and ratios are in dB.
"""

from __future__ import annotations

import numpy as np
from scipy.ndimage import binary_closing, binary_opening
from scipy.signal import butter, sosfiltfilt

PAUSE_DB = -45.0  # below the loud speech nobody speaks
PAUSE_SCORE = 0.5  # where only a voice score is known, nobody speaks below it
PAUSE_SETTLE, PAUSE_EDGE = 0.35, 0.03  # seconds after and before speech that are no pause either
FEWEST_PAUSES, LEAST_NOISE_DB, LEAST_LEFT_DB = 30, -75.0, -100.0  # blocks; levels, re full scale
VOICE_DB, DOUBT_DB = -30.0, -42.0
ABOVE_FLOOR_DB = 6.0  # at which an ending has faded out
GAP, ISLAND = 20, 3  # blocks of 10 ms: shorter gaps are voice, shorter islands none
LOWEST_VOICE_HZ = 80.0


def level_db(samples: np.ndarray) -> float:
    return float(10 * np.log10(np.mean(np.square(samples, dtype=np.float64)) + 1e-12))


def si_sdr(reference: np.ndarray, result: np.ndarray) -> float:
    """Scale-invariant signal-to-distortion ratio, of both without their means; NaN where one is silent."""
    reference = reference - np.mean(reference, dtype=np.float64)
    result = result - np.mean(result, dtype=np.float64)
    energy = np.dot(reference, reference)
    if energy <= 0.0 or not np.any(result):
        return float("nan")
    target = reference * (np.dot(result, reference) / energy)
    return float(10 * np.log10((np.sum(target**2) + 1e-12) / (np.sum((result - target) ** 2) + 1e-12)))


def block_powers(samples: np.ndarray, block: int) -> np.ndarray:
    count = len(samples) // block
    return np.square(samples[: count * block].reshape(count, block)).mean(axis=1)


def active_level(samples: np.ndarray, rate: int) -> float:
    """RMS of the blocks of 20 ms within 30 dB of the loudest one."""
    power = block_powers(samples, rate // 50)
    if not len(power) or power.max() <= 0:
        return 0.0
    return float(np.sqrt(power[power > power.max() * 1e-3].mean()))


def calm_blocks(spoken: np.ndarray) -> np.ndarray:
    """The blocks of 10 ms (bool) that are a pause: PAUSE_SETTLE after one that is spoken to PAUSE_EDGE before the next."""
    calm = np.ones(len(spoken), bool)
    for index in np.flatnonzero(spoken):
        calm[max(0, index - round(PAUSE_EDGE * 100)) : index + round(PAUSE_SETTLE * 100)] = False
    return calm


def pauses_of(speech: np.ndarray, rate: int) -> np.ndarray:
    """The pauses (blocks, bool) of clean speech: what lies below PAUSE_DB of its loud blocks (95th percentile)."""
    power = block_powers(speech, rate // 100)
    loud = np.percentile(power, 95) if len(power) else 0.0
    return calm_blocks(power > loud * 10 ** (PAUSE_DB / 10))


def pauses_of_scores(scores: np.ndarray) -> np.ndarray:
    """The pauses (blocks, bool) of a recording whose voice scores per block are known, and not its clean speech."""
    return calm_blocks(scores >= PAUSE_SCORE)


def noise_in_pauses(noisy: np.ndarray, result: np.ndarray, pauses: np.ndarray, rate: int) -> tuple[float, float]:
    """Level of the noise before and after, in dB of full scale: the median over the blocks that are a pause.

    NaN with too few pauses and where nothing is to be heard in them before. What is left is not taken below
    LEAST_LEFT_DB, so that digital silence does not count as infinite.
    """
    powers = [block_powers(samples, rate // 100) for samples in (noisy, result)]
    count = min(len(pauses), *map(len, powers))
    calm = np.flatnonzero(pauses[:count])
    if len(calm) < FEWEST_PAUSES:
        return float("nan"), float("nan")
    before, after = (float(10 * np.log10(np.median(power[calm]) + 1e-12)) for power in powers)
    return (before, max(after, LEAST_LEFT_DB)) if before >= LEAST_NOISE_DB else (float("nan"), float("nan"))


def relative_power(samples: np.ndarray, block: int) -> np.ndarray:
    """Power per block over that of the loud ones; zeros when nothing is there."""
    power = block_powers(samples, block)
    if not len(power) or power.max() <= 0:
        return np.zeros(len(power))
    return power / np.percentile(power[power > power.max() * 1e-5], 90)


def block_labels(speech: np.ndarray, block: int) -> tuple[np.ndarray, np.ndarray]:
    """Voice (bool) and weight per block of 10 ms of clean speech.

    As people mark it: voice begins where the power, and that above 80 Hz (what lies below is the rumble of
    desks and traffic), comes within 30 dB of the speaker's loud blocks; it ends where the level has fallen to the
    recording's floor, or 45 dB below the loud blocks; a gap of less than 200 ms is voice, an island below 30 ms none.
    What else lies between 30 and 42 dB is neither: weight 0.
    """
    count = len(speech) // block
    if count == 0:
        return np.zeros(0, bool), np.ones(0, np.float32)
    samples = speech[: count * block].astype(np.float64)
    high_pass = butter(4, LOWEST_VOICE_HZ, "highpass", fs=100 * block, output="sos")
    voiced = sosfiltfilt(high_pass, samples, padlen=min(len(samples) - 1, 10 * block))
    # Both: the filter rings ahead of a start, and rumble is loud without it.
    power = 10 * np.log10(np.minimum(relative_power(samples, block), relative_power(voiced, block)) + 1e-10)
    voice = _with_endings(binary_opening(power > VOICE_DB, np.ones(ISLAND)), power)
    voice = binary_closing(np.pad(voice, GAP), np.ones(GAP))[GAP:-GAP]
    weight = np.where(~voice & (power > DOUBT_DB), 0.0, 1.0)
    for start in np.flatnonzero(np.diff(voice.astype(int)) == 1) + 1:
        weight[start : start + 5] = 2.0
    return voice, weight.astype(np.float32)


def _with_endings(voice: np.ndarray, power_db: np.ndarray) -> np.ndarray:
    """Each stretch of voice goes on until its level is at the floor: the tenth percentile of what is not silence."""
    floor = np.percentile(power_db[power_db > -90], 10) if (power_db > -90).any() else VOICE_DB
    heard = voice | (power_db > np.clip(floor + ABOVE_FLOOR_DB, PAUSE_DB, VOICE_DB))
    stretch = np.cumsum(np.diff(heard, prepend=False))  # odd within a stretch that is heard
    begun = {int(s): i for i, s in reversed(list(enumerate(stretch))) if voice[i]}
    return heard & np.array([i >= begun.get(int(s), len(voice)) for i, s in enumerate(stretch)])


def frame_labels(values: np.ndarray, blocks: int) -> np.ndarray:
    """Mean of the block values over caller's frames of `blocks` blocks."""
    count = len(values) // blocks
    return values[: count * blocks].reshape(count, blocks).astype(np.float32).mean(axis=1)


def roc_auc(scores: np.ndarray, labels: np.ndarray) -> float:
    """Area under the receiver operating curve; ties count half."""
    positive, negative = scores[labels], np.sort(scores[~labels])
    below = np.searchsorted(negative, positive, "left") + np.searchsorted(negative, positive, "right")
    return float(below.mean() / (2 * max(1, len(negative))))


def f1_of_thresholds(scores: np.ndarray, labels: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
    """The thresholds from high to low, and the F1 of what lies at or above each."""
    order = np.argsort(-scores)
    thresholds, hits = scores[order], np.cumsum(labels[order])
    f1 = 2 * hits / (np.arange(1, len(scores) + 1) + labels.sum())
    whole = np.append(np.diff(thresholds) != 0, True)  # equal scores pass together
    return thresholds[whole], f1[whole]


def best_f1(scores: np.ndarray, labels: np.ndarray) -> tuple[float, float]:
    """The best F1 over all thresholds and the threshold that gives it."""
    thresholds, f1 = f1_of_thresholds(scores, labels)
    best = int(np.argmax(f1))
    return float(f1[best]), float(thresholds[best])


def quick_threshold(scores: np.ndarray, labels: np.ndarray, slack: float) -> float:
    """The lowest threshold with an F1 that is worse than the best by no more than `slack`.

    Around its best the F1 hardly changes, but a lower threshold notices a word's start earlier.
    """
    thresholds, f1 = f1_of_thresholds(scores, labels)
    return float(thresholds[np.flatnonzero(f1 >= f1.max() - slack)[-1]])

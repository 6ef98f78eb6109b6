"""The bench's scores, where the right answer is known."""

from __future__ import annotations

import metrics
import numpy as np
import pytest

from morva_training.scoring import quick_threshold


def tone(seconds: float = 1.0, rate: int = 16000) -> np.ndarray:
    rng = np.random.default_rng(3)
    return rng.standard_normal(int(seconds * rate)).astype(np.float32) * 0.1


@pytest.mark.parametrize("snr", [-5.0, 0.0, 20.0])
@pytest.mark.parametrize("scale", [0.1, 1.0])
def test_si_sdr_is_the_ratio_and_ignores_scale(snr: float, scale: float) -> None:
    rng = np.random.default_rng(1)
    clean = rng.standard_normal(200000)
    noise = rng.standard_normal(200000) * 10 ** (-snr / 20)
    assert metrics.si_sdr(clean, scale * (clean + noise)) == pytest.approx(snr, abs=0.1)


@pytest.mark.parametrize("delay", [0, 7, 320])
def test_alignment_finds_the_delay(delay: int) -> None:
    clean = tone()
    result = np.concatenate([np.zeros(delay, np.float32), 0.5 * clean])[: len(clean)]
    reference, shifted = metrics.aligned(clean, result, 16000)
    assert len(reference) == len(clean) - delay
    assert np.allclose(shifted, 0.5 * reference)


def test_pause_attenuation() -> None:
    rate = 16000
    speech = np.concatenate([np.zeros(rate, np.float32), tone(), np.zeros(rate, np.float32)])
    noise = 0.01 * np.random.default_rng(2).standard_normal(len(speech)).astype(np.float32)
    result = speech + noise
    result[:rate] *= 0.1
    result[2 * rate :] *= 0.1
    assert metrics.pause_attenuation(speech, speech + noise, result, rate) == pytest.approx(20, abs=0.5)
    assert np.isnan(metrics.pause_attenuation(tone(), tone(), tone(), rate))


def test_area_under_the_curve_with_ties() -> None:
    labels = np.array([True, True, False, False])
    assert metrics.roc_auc(np.array([0.9, 0.4, 0.4, 0.1]), labels) == pytest.approx(0.875)
    assert metrics.best_f1(np.array([0.9, 0.8, 0.4, 0.1]), labels) == (1.0, 0.8)


def test_separable_labels() -> None:
    labels = np.array([False] * 50 + [True] * 50)
    assert metrics.roc_auc(np.arange(100.0), labels) == 1.0
    assert metrics.roc_auc(-np.arange(100.0), labels) == 0.0
    assert metrics.roc_auc(np.zeros(100), labels) == 0.5
    assert metrics.best_f1(np.arange(100.0), labels) == (1.0, 50.0)
    assert quick_threshold(np.arange(100.0), labels, 0.0) == 50.0
    assert quick_threshold(np.arange(100.0), labels, 0.02) == 48.0  # 2 of 52 wrong: F1 0.98


def test_identical_speech_is_perfect() -> None:
    stoi = pytest.importorskip("pystoi")
    assert stoi
    rng = np.random.default_rng(5)
    speech = (rng.standard_normal(32000) * np.repeat(rng.random(20), 1600)).astype(np.float32)
    assert metrics.stoi_score(speech, speech, 16000) == pytest.approx(1.0, abs=1e-3)

"""Voice activity: labels and batches (its features: test_agreement)."""

from __future__ import annotations

from pathlib import Path

import numpy as np
import pytest

from morva_training.measures import block_labels, frame_labels
from morva_training.voice import VoiceBatches


def bursts(rng: np.random.Generator, blocks: list[int]) -> np.ndarray:
    """Noise of the given loudness (0 or 1) per 10 ms block at 8 kHz."""
    gain = np.repeat(np.array(blocks, float), 80)
    return (rng.standard_normal(len(gain)) * (3000 * gain + 1)).astype(np.float32)


def test_labels_close_gaps_and_drop_islands() -> None:
    pattern = [0] * 10 + [1] * 20 + [0] * 5 + [1] * 10 + [0] * 30 + [1] * 1 + [0] * 20
    voice, weight = block_labels(bursts(np.random.default_rng(1), pattern), 80)
    assert np.flatnonzero(voice).tolist() == list(range(10, 45))
    assert weight[10] == 2.0 and weight[0] == 1.0
    voice, weight = block_labels(np.zeros(8000, np.float32), 80)
    assert not voice.any() and (weight == 1).all()
    assert frame_labels(np.array([1, 1, 0, 1, 1, 1, 0]), 3).tolist() == pytest.approx([2 / 3, 1.0])


def test_rumble_is_no_voice() -> None:
    """A hum below all voices, as loud as the words: before them there is nothing."""
    words = bursts(np.random.default_rng(2), [0] * 60 + [1] * 30 + [0] * 60)
    hum = 3000 * np.sin(2 * np.pi * 30 / 8000 * np.arange(len(words)))
    quiet, _ = block_labels(words, 80)
    humming, weight = block_labels(words + hum.astype(np.float32), 80)
    assert not humming[:59].any() and (humming != quiet).sum() <= 2
    assert weight[1:50].min() == 1.0


def test_batches(store: Path) -> None:
    batches, lengths = iter(VoiceBatches(store, 3, seed=2)), set()
    for _ in range(6):
        batch = next(batches)
        lengths.add(batch["features"].shape[1])
        assert batch["features"].shape[2] == 61 and batch["features"].isfinite().all()
        assert batch["voice"].shape == batch["weight"].shape == batch["features"].shape[:2]
        assert set(batch["voice"].unique().tolist()) <= {0.0, 1.0}
        assert batch["speech"].min() >= 0 and batch["speech"].max() <= 1
    assert len(lengths) > 1, "several frame lengths must be heard"

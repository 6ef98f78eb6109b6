"""Voice activity: labels, the level tracker and the features against the frame-by-frame reference."""

from __future__ import annotations

from pathlib import Path

import numpy as np
import pytest
import torch

from morva_training.convert import plain_values
from morva_training.engine import VoiceModel, calibrated
from morva_training.networks import PlainGatedNetwork
from morva_training.train_voice import voice_weight
from morva_training.voice import (
    VOICE_RECIPE,
    VoiceBatches,
    block_labels,
    frame_labels,
    network_input,
    stream_features,
    tracked_gains,
)


def bursts(rng: np.random.Generator, blocks: list[int]) -> np.ndarray:
    """Noise of the given loudness (0 or 1) per 10 ms block at 8 kHz."""
    gain = np.repeat(np.array(blocks, float), 80)
    return (rng.standard_normal(len(gain)) * (3000 * gain + 1)).astype(np.float32)


def test_labels_close_gaps_and_drop_islands() -> None:
    pattern = [0] * 10 + [1] * 20 + [0] * 5 + [1] * 10 + [0] * 30 + [1] * 1 + [0] * 20
    voice, weight = block_labels(bursts(np.random.default_rng(1), pattern))
    expected = np.zeros(len(pattern), bool)
    expected[10:45] = True
    assert voice.tolist() == expected.tolist()
    assert weight[10] == 2.0 and weight[0] == 1.0


def test_rumble_is_no_voice() -> None:
    """A hum below all voices, as loud as the words: before them there is nothing."""
    words = bursts(np.random.default_rng(2), [0] * 60 + [1] * 30 + [0] * 60)
    hum = 3000 * np.sin(2 * np.pi * 30 / 8000 * np.arange(len(words)))
    quiet, _ = block_labels(words)
    humming, weight = block_labels(words + hum.astype(np.float32))
    assert not humming[:59].any() and (humming != quiet).sum() <= 2
    assert weight[1:50].min() == 1.0


def test_no_speech_has_no_voice() -> None:
    voice, weight = block_labels(np.zeros(8000, np.float32))
    assert not voice.any() and (weight == 1).all()


def test_longer_frames_average_their_blocks() -> None:
    assert frame_labels(np.array([1, 1, 0, 1, 1, 1, 0]), 3).tolist() == pytest.approx([2 / 3, 1.0])


@pytest.mark.parametrize("frame", [80, 160, 240, 320])
def test_stream_equals_reference(frame: int) -> None:
    """Levels, features and network over a whole stream against one call after the other."""
    rng = np.random.default_rng(frame)
    torch.manual_seed(frame)
    loudness = np.repeat(10 ** rng.uniform(-2, 1.0, 12), 1000)
    samples = (rng.standard_normal(12000) * 2000 * loudness).clip(-32768, 32767).astype(np.float32)
    network = PlainGatedNetwork(305, 10, 1, linear_output=True)
    mean, variance = rng.uniform(8, 12, 61), rng.uniform(3, 8, 61)
    model = VoiceModel(voice_weight(network, mean, variance, [-1.0, 0.0, 1.0]))
    count = len(samples) // frame
    expected = [model.logit(samples[i * frame : (i + 1) * frame]) for i in range(count)]
    features = torch.from_numpy(stream_features(samples[None], frame))
    as_tensor = [torch.tensor(v, dtype=torch.float32) for v in (mean, variance)]
    with torch.no_grad():
        logits, _ = network(network_input(features, *as_tensor), network.initial_state(1))
    assert np.allclose(logits[0, :, 0].numpy(), expected, atol=2e-3)


def test_level_tracker_rises_at_once_and_ignores_silence() -> None:
    quiet = np.zeros((1, 5, 80), np.float32)
    loud = np.full((1, 3, 80), 20000.0, np.float32)
    gains = tracked_gains(np.concatenate([quiet, loud, quiet], axis=1))[0]
    assert np.allclose(gains[:5], 1.0)
    assert gains[5] < 0.11
    assert np.allclose(gains[8:], gains[7])


def test_calibration_points() -> None:
    points = [-2.0, 0.5, 3.0]
    assert calibrated(0.5, points) == 0.5
    assert calibrated(3.0, points) == pytest.approx(0.99999)
    assert calibrated(-5.0, points) == pytest.approx(1e-5)
    assert calibrated(-0.75, points) == pytest.approx(0.25)


def test_batches(store: Path) -> None:
    batches = iter(VoiceBatches(store, 3, seed=2, recipe=VOICE_RECIPE))
    lengths = set()
    for _ in range(6):
        batch = next(batches)
        lengths.add(batch["features"].shape[1])
        assert batch["features"].shape[2] == 61 and batch["features"].isfinite().all()
        assert batch["voice"].shape == batch["weight"].shape == batch["features"].shape[:2]
        assert set(batch["voice"].unique().tolist()) <= {0.0, 1.0}
    assert len(lengths) > 1, "several frame lengths must be heard"


def test_output_matrix_stands_in_both_branches() -> None:
    values = plain_values(PlainGatedNetwork(305, 10, 1, linear_output=True))
    assert np.array_equal(values["WeightLinear"][-1], values["WeightNonLinear"][-1])
    assert values["WeightNonLinear"][-1].shape == (10, 1)

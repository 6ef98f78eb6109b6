"""Losses: better gains score better, and what each term leaves alone."""

from __future__ import annotations

from pathlib import Path

import pytest
import torch

from morva_training.batches import Batch, MixtureBatches
from morva_training.losses import LEVEL_WEIGHTS, LevelLoss, LossWeights, LoudnessModel, MaskLoss, pause_frames
from morva_training.mixing import Recipe
from morva_training.spectra import FULL_32K

CPU = torch.device("cpu")
NOTHING = {**dict.fromkeys(vars(LossWeights()), 0.0), "deepest_db": -40.0}


@pytest.fixture(scope="module")
def batch(store: Path) -> Batch:
    recipe = Recipe(seconds=3.0, noise_only_share=0.15)
    return Batch.of(next(iter(MixtureBatches(store, recipe, 12, seed=2))), FULL_32K, CPU)


def test_better_gains_score_better(batch: Batch) -> None:
    """The best gains beat none and silence, and each term alone ranks them above its own worst."""
    none, silence = torch.zeros_like(batch.product), torch.full_like(batch.product, -9.0)
    good = torch.log((batch.product / batch.noisy_power).clamp(1e-4, 1.0))
    everything = MaskLoss(FULL_32K, LossWeights(), CPU)
    assert all(everything(good, batch)[0] < everything(other, batch)[0] for other in (none, silence))
    for term in set(NOTHING) - {"deepest_db"}:
        alone = MaskLoss(FULL_32K, LossWeights(**{**NOTHING, term: 1.0}), CPU)
        worst = none if term in ("phase", "pause", "envelope") else silence
        assert alone(good, batch)[0] < alone(worst, batch)[0], term
    speech, model = batch.speech_power[batch.has_speech], LoudnessModel(FULL_32K, CPU)
    identity = model.quality(speech, speech)
    assert (identity > 4.3).all() and torch.allclose(model.quality(speech, 4.0 * speech), identity, atol=1e-2)

    noise = (batch.noisy_power - 2 * batch.product + batch.speech_power).clamp_min(1e-9)
    good = torch.log((1 - (noise / batch.noisy_power).sqrt()).clamp(1e-4, 1.0))
    level = LevelLoss(FULL_32K, LEVEL_WEIGHTS, CPU, mask_share=0.0)
    assert level(good, batch)[1]["level_error_db"] < 1.0
    assert all(level(good, batch)[0] < level(other, batch)[0] for other in (none, silence))


def test_narrow_recordings_have_little_say_above_their_band(batch: Batch) -> None:
    loss = MaskLoss(FULL_32K, LossWeights(pause=0.0, loudness=0.0), CPU)
    gains = torch.zeros_like(batch.product).requires_grad_()
    loss(gains, batch)[0].backward()
    narrow = gains.grad[~batch.wideband]
    assert len(narrow) and batch.wideband[~batch.has_speech].all()
    assert narrow[:, :, 140:168].abs().max() == 0, "7 to 8.4 kHz: neither speech nor silence is certain"
    assert narrow[:, :, 168:].sum() > 0, "the only lesson there is to close the mask"
    assert gains.grad[batch.wideband][:, :, 168:].abs().max() > 0


def test_pauses_stay_clear_of_speech() -> None:
    power = torch.full((2, 60, 3), 1e-9)
    power[:, 20:30] = 1.0
    silent = pause_frames(power, torch.tensor([True, False]))
    assert silent[0].nonzero().flatten().tolist() == [*range(18), *range(32, 60)] and silent[1].all()

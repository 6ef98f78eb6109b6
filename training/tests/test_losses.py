"""Losses: band sums against plain bin arithmetic, and that better masks score better."""

from __future__ import annotations

from pathlib import Path

import numpy as np
import pytest
import torch

from morva_training.batches import EXPONENT, Batch, MixtureBatches, band_sums
from morva_training.losses import LEVEL_WEIGHTS, LevelLoss, LossWeights, LoudnessModel, MaskLoss, pause_frames
from morva_training.mixing import Recipe
from morva_training.spectra import FULL_32K, SMALL_16K

CPU = torch.device("cpu")
NOTHING = dict.fromkeys(vars(LossWeights()), 0.0)


@pytest.fixture(scope="module")
def batch(store: Path) -> Batch:
    recipe = Recipe(seconds=3.0, noise_only_share=0.15)
    return Batch(**next(iter(MixtureBatches(store, FULL_32K, recipe, 12, seed=2))))


def test_band_sums_are_exact_for_masked_spectra() -> None:
    rng = np.random.default_rng(1)
    x, s = (rng.standard_normal((2, 5, 160)) + 1j * rng.standard_normal((2, 5, 160)) for _ in range(2))
    sums = {k: v.numpy() for k, v in band_sums(x.astype(np.complex64), s.astype(np.complex64), SMALL_16K).items()}
    gain = rng.random((2, 5, SMALL_16K.bands))
    masked = x * gain[..., SMALL_16K.band_of_bin()]

    def squeezed(z: np.ndarray) -> np.ndarray:
        return np.abs(z) ** EXPONENT * np.exp(1j * np.angle(z))

    for factor, kind, product, direct in (
        (gain, "power", "product", masked - s),
        (gain**EXPONENT, "compressed", "phase_product", squeezed(masked) - squeezed(s)),
        (gain**EXPONENT, "compressed", "product_compressed", np.abs(masked) ** EXPONENT - np.abs(s) ** EXPONENT),
    ):
        error = factor**2 * sums[f"noisy_{kind}"] - 2 * factor * sums[product] + sums[f"speech_{kind}"]
        assert np.allclose(error.sum(-1), np.square(np.abs(direct)).sum(-1), rtol=1e-3), product


def test_better_masks_score_better(batch: Batch) -> None:
    """The best mask beats none and silence, and each term alone ranks it above its own worst."""
    none, silence = (torch.full_like(batch.features, value) for value in (9.0, -9.0))
    good = torch.logit((batch.product / batch.noisy_power).clamp(1e-4, 0.9999).sqrt())
    everything = MaskLoss(FULL_32K, LossWeights(), CPU)
    assert all(everything(good, batch)[0] < everything(other, batch)[0] for other in (none, silence))
    for term in NOTHING:
        alone = MaskLoss(FULL_32K, LossWeights(**{**NOTHING, term: 1.0}), CPU)
        worst = none if term in ("phase", "pause") else silence
        assert alone(good, batch)[0] < alone(worst, batch)[0], term
    speech, model = batch.speech_power[batch.has_speech], LoudnessModel(FULL_32K, CPU)
    identity = model.quality(speech, speech)
    assert (identity > 4.3).all() and torch.allclose(model.quality(speech, 4.0 * speech), identity, atol=1e-2)

    noise = (batch.noisy_power - 2 * batch.product + batch.speech_power).clamp_min(1e-9)
    good = torch.logit((1 - (noise / batch.noisy_power).sqrt()).clamp(1e-4, 0.9999).sqrt())
    level = LevelLoss(FULL_32K, LEVEL_WEIGHTS, CPU, mask_share=0.0)
    assert level(good, batch)[1]["level_error_db"] < 1.0
    assert all(level(good, batch)[0] < level(other, batch)[0] for other in (none, silence))


def test_narrow_recordings_have_little_say_above_their_band(batch: Batch) -> None:
    loss = MaskLoss(FULL_32K, LossWeights(pause=0.0, loudness=0.0), CPU)
    logits = torch.zeros_like(batch.features).requires_grad_()
    loss(logits, batch)[0].backward()
    narrow = logits.grad[~batch.wideband]
    assert len(narrow) and batch.wideband[~batch.has_speech].all()
    assert narrow[:, :, 76:80].abs().max() == 0, "7.2 to 8 kHz: neither speech nor silence is certain"
    assert narrow[:, :, 82:].sum() > 0, "the only lesson there is to close the mask"
    assert (loss.trusted[81:] > 0).all() and (loss.trusted[81:] < 0.5).all()
    assert logits.grad[batch.wideband][:, :, 80:].abs().max() > 0


def test_pauses_stay_clear_of_speech() -> None:
    power = torch.full((2, 60, 3), 1e-9)
    power[:, 20:30] = 1.0
    silent = pause_frames(power, torch.tensor([True, False]))
    assert silent[0].nonzero().flatten().tolist() == [*range(18), *range(32, 60)] and silent[1].all()

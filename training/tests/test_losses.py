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
    good = torch.logit((batch.product / batch.noisy_power).clamp(1e-4, 0.9999).sqrt())
    others = [torch.full_like(batch.features, value) for value in (9.0, 0.0, -9.0)]
    loss = MaskLoss(FULL_32K, LossWeights(), CPU)
    assert all(loss(good, batch)[0] < loss(other, batch)[0] for other in others)
    for term in vars(LossWeights()):
        alone = MaskLoss(FULL_32K, LossWeights(**{**dict.fromkeys(vars(LossWeights()), 0.0), term: 1.0}), CPU)
        logits = torch.full_like(batch.features, 0.5).requires_grad_()
        alone(logits, batch)[0].backward()
        assert logits.grad.isfinite().all() and logits.grad.abs().sum() > 0, term
        worst = others[0] if term in ("phase", "pause") else others[2]
        assert alone(good, batch)[0] < alone(worst, batch)[0], term


def test_narrow_recordings_have_little_say_above_their_band(batch: Batch) -> None:
    loss = MaskLoss(FULL_32K, LossWeights(pause=0.0, loudness=0.0), CPU)
    logits = torch.zeros_like(batch.features).requires_grad_()
    loss(logits, batch)[0].backward()
    narrow = ~batch.wideband
    assert narrow.any() and batch.wideband.any() and batch.wideband[~batch.has_speech].all()
    edge = logits.grad[narrow][:, :, 76:80]  # 7.2 to 8 kHz: neither speech nor silence is certain
    assert edge.abs().max() == 0
    assert (loss.trusted[81:] > 0).all() and (loss.trusted[81:] < 0.5).all()
    assert logits.grad[narrow][:, :, 82:].sum() > 0, "the only lesson there is to close the mask"
    assert logits.grad[batch.wideband][:, :, 80:].abs().max() > 0


def test_quality_of_identity_and_its_order(batch: Batch) -> None:
    model = LoudnessModel(FULL_32K, CPU)
    speech, noise = batch.speech_power[batch.has_speech], batch.noisy_power[batch.has_speech]
    identity = model.quality(speech, speech)
    assert (identity > 4.3).all() and torch.allclose(model.quality(speech, 4.0 * speech), identity, atol=1e-2)
    scores = [model.quality(speech, speech + share * noise).mean() for share in (0.001, 0.03, 1.0)]
    assert scores[0] > scores[1] > scores[2]


def test_pauses_stay_clear_of_speech() -> None:
    power = torch.full((2, 60, 3), 1e-9)
    power[:, 20:30] = 1.0
    silent = pause_frames(power, torch.tensor([True, False]))
    assert silent[0].nonzero().flatten().tolist() == [*range(18), *range(32, 60)]
    assert silent[1].all()


def test_level_loss_is_least_for_the_mask_that_removes_the_noise(batch: Batch) -> None:
    loss = LevelLoss(FULL_32K, LEVEL_WEIGHTS, CPU, mask_share=0.0)
    noise = (batch.noisy_power - 2 * batch.product + batch.speech_power).clamp_min(1e-9)
    gain = (1 - (noise / batch.noisy_power).sqrt()).clamp(1e-4, 0.9999)
    good, parts = loss(torch.logit(gain.sqrt()), batch)
    assert parts["level_error_db"] < 1.0
    assert all(good < loss(torch.full_like(batch.features, value), batch)[0] for value in (-9.0, 9.0))

"""Losses: band sums against plain bin arithmetic, and that better masks score better."""

from __future__ import annotations

from pathlib import Path

import numpy as np
import pytest
import torch

from morva_training.batches import EXPONENT, Batch, MixtureBatches, band_sums
from morva_training.losses import LevelLoss, LossWeights, LoudnessModel, MaskLoss, over_time, pause_frames
from morva_training.mixing import Recipe
from morva_training.spectra import FULL_32K, SMALL_16K

CPU = torch.device("cpu")


@pytest.fixture(scope="module")
def batch(store: Path) -> Batch:
    recipe = Recipe(seconds=3.0, noise_only_share=0.15)
    return Batch(**next(iter(MixtureBatches(store, FULL_32K, recipe, 12, seed=9))))


def best_mask(batch: Batch) -> torch.Tensor:
    gain = (batch.product / batch.noisy_power).clamp(1e-4, 0.9999)
    return torch.logit(gain.sqrt())


def test_band_sums_are_exact_for_masked_spectra() -> None:
    rng = np.random.default_rng(1)
    x, s = (rng.standard_normal((2, 5, 160)) + 1j * rng.standard_normal((2, 5, 160)) for _ in range(2))
    x, s = x.astype(np.complex64), s.astype(np.complex64)
    sums = {k: v.numpy() for k, v in band_sums(x, s, SMALL_16K).items()}
    gain = rng.random((2, 5, SMALL_16K.bands))
    masked = x * gain[..., SMALL_16K.band_of_bin()]
    error = gain**2 * sums["noisy_power"] - 2 * gain * sums["product"] + sums["speech_power"]
    assert np.allclose(error.sum(-1), np.square(np.abs(masked - s)).sum(-1), rtol=1e-4)

    def squeezed(z: np.ndarray) -> np.ndarray:
        return np.abs(z) ** EXPONENT * np.exp(1j * np.angle(z))

    g = gain**EXPONENT
    error = g**2 * sums["noisy_compressed"] - 2 * g * sums["phase_product"] + sums["speech_compressed"]
    assert np.allclose(error.sum(-1), np.square(np.abs(squeezed(masked) - squeezed(s))).sum(-1), rtol=1e-3)
    error = g**2 * sums["noisy_compressed"] - 2 * g * sums["product_compressed"] + sums["speech_compressed"]
    direct = np.square(np.abs(masked) ** EXPONENT - np.abs(s) ** EXPONENT).sum(-1)
    assert np.allclose(error.sum(-1), direct, rtol=1e-3)


def test_a_good_mask_beats_none_and_silence(batch: Batch) -> None:
    loss = MaskLoss(FULL_32K, LossWeights(), CPU)
    good, _ = loss(best_mask(batch), batch)
    for value in (9.0, 0.0, -9.0):
        other, _ = loss(torch.full_like(batch.features, value), batch)
        assert good < other


@pytest.mark.parametrize("term", ["compressed", "phase", "lost_speech", "ratio", "loudness", "pause"])
def test_every_term_has_a_gradient(batch: Batch, term: str) -> None:
    none = dict.fromkeys(vars(LossWeights()), 0.0)
    loss = MaskLoss(FULL_32K, LossWeights(**{**none, term: 1.0}), CPU)
    logits = torch.full_like(batch.features, 0.5).requires_grad_()
    loss(logits, batch)[0].backward()
    assert logits.grad.isfinite().all() and logits.grad.abs().sum() > 0


def test_narrow_recordings_have_little_say_above_their_band(batch: Batch) -> None:
    loss = MaskLoss(FULL_32K, LossWeights(pause=0.0, loudness=0.0), CPU)
    logits = torch.zeros_like(batch.features).requires_grad_()
    loss(logits, batch)[0].backward()
    narrow = ~batch.wideband
    assert narrow.any() and batch.wideband.any()
    edge = logits.grad[narrow][:, :, 76:80]  # 7.2 to 8 kHz: neither speech nor silence is certain
    assert edge.abs().max() == 0
    weights = loss.trusted[81:]
    assert (weights > 0).all() and (weights < 0.5).all()
    assert logits.grad[narrow][:, :, 82:].sum() > 0, "the only lesson there is to close the mask"
    assert logits.grad[batch.wideband][:, :, 80:].abs().max() > 0


def test_quality_of_identity_and_its_order(batch: Batch) -> None:
    model = LoudnessModel(FULL_32K, CPU)
    speech, noise = batch.speech_power[batch.has_speech], batch.noisy_power[batch.has_speech]
    assert (model.quality(speech, speech) > 4.3).all()
    scores = [model.quality(speech, speech + share * noise).mean() for share in (0.001, 0.03, 1.0)]
    assert scores[0] > scores[1] > scores[2]
    louder = model.quality(speech, 4.0 * speech)
    assert torch.allclose(louder, model.quality(speech, speech), atol=1e-2)


def test_time_aggregate_weighs_bursts() -> None:
    steady = torch.full((1, 320), 1.0)
    burst = torch.zeros(1, 320)
    burst[:, 32:64] = 10.0
    assert over_time(burst) > over_time(steady)
    assert torch.allclose(over_time(steady), torch.ones(1), atol=1e-2)


def test_pauses_stay_clear_of_speech() -> None:
    power = torch.full((2, 60, 3), 1e-9)
    power[:, 20:30] = 1.0
    silent = pause_frames(power, torch.tensor([True, False]))
    assert silent[0].nonzero().flatten().tolist() == [*range(18), *range(32, 60)]
    assert silent[1].all()


def test_level_loss_is_least_for_the_mask_that_removes_the_noise(batch: Batch) -> None:
    loss = LevelLoss(FULL_32K, CPU, mask_share=0.0)
    noise = (batch.noisy_power - 2 * batch.product + batch.speech_power).clamp_min(1e-9)
    gain = (1 - (noise / batch.noisy_power).sqrt()).clamp(1e-4, 0.9999)
    good, parts = loss(torch.logit(gain.sqrt()), batch)
    assert parts["level_error_db"] < 1.0
    assert good < loss(torch.full_like(batch.features, -9.0), batch)[0]
    assert good < loss(torch.full_like(batch.features, 9.0), batch)[0]

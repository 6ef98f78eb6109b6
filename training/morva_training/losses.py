"""Losses of the noise models, on band sums (see batches).

Five terms, each on the spectrum after the engine's squaring of the mask:
- compressed spectra: magnitudes to the power 0.3, with and without the phase error;
- lost speech: the same distance where the masked band is weaker than the speech;
- signal-to-noise ratio of the result in decibels, levelled off at 30 dB;
- a loudness distance after the psychoacoustic model of ITU-T P.862: Bark bands, Zwicker's law,
  masking dead zone, heavier weight on added than on missing loudness, L6 over syllables and L2
  over the piece, mapped to the listening-quality scale of P.862.2;
- noise left in pauses, in decibels, levelled off at -40 dB.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
import torch
from torch import Tensor, nn

from .batches import EXPONENT, Batch
from .measures import PAUSE_DB
from .spectra import Layout

SPEECH_SPL = 79.0  # dB, level at which P.862 listens
TRUSTED_EDGE_HZ = 7000.0  # of recordings without content above 8 kHz
HIGH_EDGE_HZ, HIGH_SHARE = 8400.0, 0.3  # what such recordings may say about the noise above
SYLLABLE_HOPS = 32
# Fitted to P.862.2 scores of noisy and cleaned recordings: frames and bands are not quite the standard's.
OFFSET, SYMMETRIC, ASYMMETRIC = 4.41, 0.107, 0.0547
DEEPEST_DB = -40.0


@dataclass(frozen=True)
class LossWeights:
    compressed: float = 8.0
    phase: float = 2.0
    lost_speech: float = 5.0
    ratio: float = 0.17  # per dB
    loudness: float = 1.4  # per point of listening quality
    pause: float = 0.012  # per dB of noise left in pauses


LEVEL_WEIGHTS = LossWeights(loudness=0.0, ratio=0.01)  # of the level model's share of the mask loss


def bark(frequency: np.ndarray) -> np.ndarray:
    return 26.81 * frequency / (1960.0 + frequency) - 0.53


def hearing_threshold_db(frequency: np.ndarray) -> np.ndarray:
    """Threshold in quiet (Terhardt), dB SPL."""
    k = np.maximum(frequency, 50.0) / 1000.0
    return 3.64 * k**-0.8 - 6.5 * np.exp(-0.6 * (k - 3.3) ** 2) + 1e-3 * k**4


class LoudnessModel:
    """Groups of bands about half a Bark wide up to 8 kHz and their loudness."""

    def __init__(self, layout: Layout, device: torch.device) -> None:
        width_hz = layout.rate / layout.frame
        edges = np.concatenate([layout.band_starts(), [layout.bins]]) * width_hz
        low, high = edges[:-1], edges[1:]
        used = [k for k in range(layout.bands) if low[k] >= 100.0 and high[k] <= 8000.0]
        groups: list[list[int]] = []
        for k in used:
            if groups and bark(high[groups[-1][-1]]) - bark(low[groups[-1][0]]) < 0.42:
                groups[-1].append(k)
            else:
                groups.append([k])
        matrix = np.zeros((layout.bands, len(groups)), np.float32)
        for column, members in enumerate(groups):
            matrix[members, column] = 1.0
        centre = np.array([(low[g[0]] + high[g[-1]]) / 2 for g in groups])
        widths = np.array([bark(high[g[-1]]) - bark(low[g[0]]) for g in groups])
        threshold = 10 ** (hearing_threshold_db(centre) / 10)
        self.matrix = torch.from_numpy(matrix).to(device)
        self.widths = torch.tensor(widths, dtype=torch.float32, device=device)
        self.threshold = torch.tensor(threshold, dtype=torch.float32, device=device)
        speech_band = (low >= 350.0) & (high <= 3250.0)
        decay = 0.8 * 0.2 ** torch.arange(4.0, -1.0, -1.0)
        self.smoothing = decay[None, None].to(device)
        self.speech_band = torch.tensor(speech_band.astype(np.float32), device=device)

    def loudness(self, power: Tensor) -> Tensor:
        relative = power / self.threshold
        return 0.1866 * (self.threshold / 0.5) ** 0.23 * ((0.5 + 0.5 * relative) ** 0.23 - 1.0).clamp_min(0.0)

    def levelled(self, band_power: Tensor) -> Tensor:
        """Sound pressure (power) per group with the piece at the listening level."""
        level = (band_power * self.speech_band).sum(-1).mean(-1) + 1e-6
        return (band_power @ self.matrix) * (10 ** (SPEECH_SPL / 10) / level)[:, None, None]

    def compensated(self, x: Tensor, y: Tensor) -> tuple[Tensor, Tensor]:
        """Steady differences of spectrum are put on the speech, quick ones of level on the result."""
        spoken = (x.sum(-1, keepdim=True) > 3e5).float()
        tilt = ((y * spoken).mean(1, keepdim=True) + 1e3) / ((x * spoken).mean(1, keepdim=True) + 1e3)
        x = x * tilt.clamp(0.01, 100.0)
        ratio = (x.sum(-1) + 5e3) / (y.sum(-1) + 5e3)
        smooth = nn.functional.conv1d(nn.functional.pad(ratio[:, None], (4, 0), value=1.0), self.smoothing)
        return x, y * smooth.transpose(1, 2).clamp(3e-4, 5.0)

    def quality(self, speech: Tensor, result: Tensor) -> Tensor:
        """Listening quality (1 to 4.6) per piece, from band powers [B, T, K]."""
        x, y = self.compensated(self.levelled(speech), self.levelled(result))
        lx, ly = self.loudness(x), self.loudness(y)
        distance = ((lx - ly).abs() - 0.25 * torch.minimum(lx, ly)).clamp_min(0.0) + 1e-6
        asymmetry = ((y + 50.0) / (x + 50.0)) ** 1.2
        asymmetry = torch.where(asymmetry < 3.0, asymmetry * 0.0, asymmetry.clamp_max(12.0))
        total = self.widths.sum()
        symmetric = ((distance * self.widths).square().sum(-1) / total).sqrt() * total
        asymmetric = (distance * asymmetry * self.widths).sum(-1)
        weight = ((x.sum(-1) + 1e5) / 1e7) ** 0.04
        symmetric = over_time((symmetric / weight).clamp_max(45.0))
        asymmetric = over_time((asymmetric / weight).clamp_max(45.0))
        raw = OFFSET - SYMMETRIC * symmetric - ASYMMETRIC * asymmetric
        return 0.999 + 4.0 * torch.sigmoid(1.3669 * raw - 3.8224)


def over_time(distance: Tensor) -> Tensor:
    """L6 over syllables, L2 over the piece; distances per frame [B, T] to one per piece."""
    count = distance.shape[1] // SYLLABLE_HOPS * SYLLABLE_HOPS
    parts = distance[:, :count].reshape(distance.shape[0], -1, SYLLABLE_HOPS) + 1e-4
    syllables = parts.pow(6).mean(-1).pow(1 / 6)
    return syllables.square().mean(-1).sqrt()


def pause_frames(speech_power: Tensor, has_speech: Tensor) -> Tensor:
    """Frames [B, T] where nobody speaks, two frames clear of speech."""
    power = speech_power.sum(-1)
    loud = torch.quantile(power, 0.95, dim=1, keepdim=True)
    busy = (power > loud * 10 ** (PAUSE_DB / 10)) & has_speech[:, None]
    near = nn.functional.max_pool1d(busy.float()[:, None], 5, 1, 2)[:, 0]
    return 1.0 - near


class MaskLoss:
    """Loss of the mask's logits [B, T, K] against a batch."""

    def __init__(self, layout: Layout, weights: LossWeights, device: torch.device) -> None:
        self.weights = weights
        self.loudness = LoudnessModel(layout, device)
        widths = layout.band_widths()
        edges = (layout.band_starts() + widths) * (layout.rate / layout.frame)
        share = widths**-0.5
        self.band_weight = torch.tensor(share / (share * widths).sum(), dtype=torch.float32, device=device)
        lower = layout.band_starts() * (layout.rate / layout.frame)
        # Without any say above 8 kHz the mask opens there whenever a narrow-band talker speaks, and
        # the noise comes and goes with the words; with a full say it would mute everybody's treble.
        trusted = np.where(edges <= TRUSTED_EDGE_HZ, 1.0, np.where(lower >= HIGH_EDGE_HZ, HIGH_SHARE, 0.0))
        self.trusted = torch.tensor(trusted.astype(np.float32), device=device)

    def __call__(self, logits: Tensor, batch: Batch, skip: int = 0) -> tuple[Tensor, dict[str, float]]:
        """The loss and its terms; the first `skip` frames, where the memory is empty, do not count."""
        w = self.weights
        cut = slice(skip, None)
        log_gain = 2.0 * torch.nn.functional.logsigmoid(logits[:, cut])
        gain = log_gain.exp()
        compressed = (EXPONENT * log_gain).exp()
        bands = torch.where(batch.wideband[:, None], torch.ones_like(self.trusted), self.trusted)[:, None]
        bands = bands * self.band_weight

        a2, s2 = batch.noisy_compressed[:, cut], batch.speech_compressed[:, cut]
        both, phased = batch.product_compressed[:, cut], batch.phase_product[:, cut]
        magnitude = compressed.square() * a2 - 2.0 * compressed * both + s2
        phase = 2.0 * compressed * (both - phased)
        lost = (s2.sqrt() - compressed * a2.sqrt()).clamp_min(0.0).square()
        spectral = (bands * (w.compressed * magnitude + w.phase * phase + w.lost_speech * lost)).sum(-1).mean()

        speech = batch.has_speech.float()
        count = speech.sum().clamp_min(1.0)
        heard = bands / self.band_weight
        px, ps, pxs = batch.noisy_power[:, cut], batch.speech_power[:, cut], batch.product[:, cut]
        error = (heard * (gain.square() * px - 2.0 * gain * pxs + ps)).sum((1, 2))
        signal = (heard * ps).sum((1, 2))
        ratio = -10.0 * torch.log10((error + 1e-3 * signal + 1e-9) / (signal + 1e-9))
        ratio = (speech * ratio).sum() / count

        quality = self.loudness.quality(ps, gain.square() * px)
        quality = (speech * quality).sum() / count

        silent = (pause_frames(ps, batch.has_speech))[:, :, None]
        before, after = (silent * px).sum((1, 2)), (silent * gain.square() * px).sum((1, 2))
        counted = (before > 1e-4 * px.sum((1, 2))).float()
        left = (10.0 * torch.log10((after + 1e-9) / (before + 1e-9))).clamp_min(DEEPEST_DB)
        left = (counted * left).sum() / counted.sum().clamp_min(1.0)

        loss = spectral - w.ratio * ratio - w.loudness * quality + w.pause * left
        parts = {"spectral": spectral, "ratio_db": ratio, "quality": quality, "pause_db": left}
        return loss, {name: part.item() for name, part in parts.items()}


class LevelLoss:
    """Loss of the noise-level model: error in dB of the power that the mask removes.

    The engine smooths the removed power over about ten hops, so powers are compared over 0.3 s.
    Noise 50 dB below the whole piece counts as that faint, or silence would rule the loss. A share
    of the mask loss keeps the model a noise suppressor.
    """

    WINDOW, STRIDE = 30, 10
    FAINTEST = 10**-5.0

    def __init__(self, layout: Layout, weights: LossWeights, device: torch.device, mask_share: float = 0.15) -> None:
        self.mask_loss = MaskLoss(layout, weights, device)
        self.mask_share = mask_share

    def __call__(self, logits: Tensor, batch: Batch, skip: int = 0) -> tuple[Tensor, dict[str, float]]:
        cut = slice(skip, None)
        kept = torch.sigmoid(logits[:, cut]).square()
        px, ps, pxs = batch.noisy_power[:, cut], batch.speech_power[:, cut], batch.product[:, cut]
        removed = ((1.0 - kept).square() * px).sum(-1)
        noise = (px - 2.0 * pxs + ps).clamp_min(0.0).sum(-1)
        floor = self.FAINTEST * px.sum(-1).mean(1, keepdim=True) + 1e-9
        error_db = 10.0 * (torch.log10(self._pooled(removed) + floor) - torch.log10(self._pooled(noise) + floor))
        level = error_db.abs().mean()
        mask, parts = self.mask_loss(logits, batch, skip)
        return 0.1 * level + self.mask_share * mask, {"level_error_db": level.item(), **parts}

    def _pooled(self, power: Tensor) -> Tensor:
        return nn.functional.avg_pool1d(power[:, None], self.WINDOW, self.STRIDE)[:, 0]

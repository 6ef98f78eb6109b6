"""Losses of the noise models, on the spectra of a batch.

A network answers with one gain per bin; the terms look at the spectrum with these gains:
- compressed spectra: magnitudes to the power 0.3, with and without the phase error, and once more where the
  result is weaker than the speech;
- the waveform: signal-to-noise ratio of the result in decibels, levelled off at 30 dB;
- lost speech in decibels, in bands half a Bark wide, wherever the band is not far below its own loud moments:
  a soft consonant counts as much as a vowel;
- the envelope: log-likelihood ratio (Itakura 1975) of the linear predictions of speech and result;
- a loudness distance after the psychoacoustic model of ITU-T P.862: Bark bands, Zwicker's law,
  masking dead zone, heavier weight on added than on missing loudness, L6 over syllables and L2
  over the piece, mapped to the listening-quality scale of P.862.2;
- noise left in pauses, in decibels, levelled off where nobody hears more.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
import torch
from torch import Tensor, nn

from .batches import Batch
from .measures import PAUSE_DB
from .networks import filter_factors
from .spectra import Layout, compress_bands, power_of

EXPONENT = 0.3  # of magnitudes in the compressed spectra
EVEN_UP_TO_HZ = 2000.0  # bins above have less and less say
SPEECH_SPL = 79.0  # dB, level at which P.862 listens
TRUSTED_EDGE_HZ = 7000.0  # of recordings without content above 8 kHz
HIGH_EDGE_HZ, HIGH_SHARE = 8400.0, 0.3  # what such recordings may say about the noise above
SYLLABLE_HOPS = 32
# Fitted to P.862.2 scores of noisy and cleaned recordings: frames and bands are not quite the standard's.
OFFSET, SYMMETRIC, ASYMMETRIC = 4.41, 0.107, 0.0547
SPOKEN_DB, SPOKEN_RANGE_DB = -40.0, 10.0  # below a band's loud moments nothing is missed; how that comes up
MOST_LOST_DB = 30.0
AUDIBLE = 1e-4  # of a band's mean power
FAINTEST, FAINTEST_FILTERED = (
    1e-20,
    1e-7,
)  # power beside unit speech that results of masks and of a filter have at least
PREDICTION_ORDER, PREDICTION_FLOOR_DB, UNLIKELIEST = 16, -45.0, 2.0


@dataclass(frozen=True)
class LossWeights:
    compressed: float = 60.0
    phase: float = 10.0
    lost_speech: float = 40.0
    ratio: float = 0.06  # per dB
    lost_db: float = 0.05  # per dB
    envelope: float = 0.7
    loudness: float = 0.3  # per point of listening quality
    pause: float = 0.012  # per dB of noise left in pauses
    deepest_db: float = -30.0  # more than this in pauses earns nothing


LEVEL_WEIGHTS = LossWeights(  # of the level model's share of the mask loss
    compressed=8.0, phase=2.0, lost_speech=5.0, loudness=0.0, ratio=0.01, lost_db=0.0, envelope=0.0, deepest_db=-40.0
)


def bark(frequency: np.ndarray) -> np.ndarray:
    return 26.81 * frequency / (1960.0 + frequency) - 0.53


def hearing_threshold_db(frequency: np.ndarray) -> np.ndarray:
    """Threshold in quiet (Terhardt), dB SPL."""
    k = np.maximum(frequency, 50.0) / 1000.0
    return 3.64 * k**-0.8 - 6.5 * np.exp(-0.6 * (k - 3.3) ** 2) + 1e-3 * k**4


def half_barks(layout: Layout, highest: float) -> list[np.ndarray]:
    """Neighbouring bins from 100 Hz up, in groups about half a Bark wide."""
    width_hz = layout.rate / layout.frame
    edge = np.arange(layout.bins + 1) * width_hz
    used = np.flatnonzero((edge[:-1] >= 100.0) & (edge[1:] <= highest))
    groups: list[list[int]] = []
    for k in used:
        if groups and bark(edge[k + 1]) - bark(edge[groups[-1][0]]) < 0.42:
            groups[-1].append(k)
        else:
            groups.append([k])
    return [np.array(g) for g in groups]


def sums_over(groups: list[np.ndarray], bins: int) -> np.ndarray:
    """The matrix [bins, groups] that adds up each group's bins."""
    matrix = np.zeros((bins, len(groups)), np.float32)
    for column, members in enumerate(groups):
        matrix[members, column] = 1.0
    return matrix


class LoudnessModel:
    """Groups of bins about half a Bark wide up to 8 kHz and their loudness."""

    def __init__(self, layout: Layout, device: torch.device) -> None:
        width_hz = layout.rate / layout.frame
        low = np.arange(layout.bins) * width_hz
        high = low + width_hz
        groups = half_barks(layout, 8000.0)
        matrix = sums_over(groups, layout.bins)
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

    def levelled(self, power: Tensor) -> Tensor:
        """Sound pressure (power) per group with the piece at the listening level."""
        level = (power * self.speech_band).sum(-1).mean(-1) + 1e-6
        return (power @ self.matrix) * (10 ** (SPEECH_SPL / 10) / level)[:, None, None]

    def compensated(self, x: Tensor, y: Tensor) -> tuple[Tensor, Tensor]:
        """Steady differences of spectrum are put on the speech, quick ones of level on the result."""
        spoken = (x.sum(-1, keepdim=True) > 3e5).float()
        tilt = ((y * spoken).mean(1, keepdim=True) + 1e3) / ((x * spoken).mean(1, keepdim=True) + 1e3)
        x = x * tilt.clamp(0.01, 100.0)
        ratio = (x.sum(-1) + 5e3) / (y.sum(-1) + 5e3)
        smooth = nn.functional.conv1d(nn.functional.pad(ratio[:, None], (4, 0), value=1.0), self.smoothing)
        return x, y * smooth.transpose(1, 2).clamp(3e-4, 5.0)

    def quality(self, speech: Tensor, result: Tensor) -> Tensor:
        """Listening quality (1 to 4.6) per piece, from powers [B, T, bins]."""
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


class LostSpeech:
    """How much weaker than the speech a result is, in decibels, where somebody speaks."""

    def __init__(self, layout: Layout, device: torch.device) -> None:
        groups = half_barks(layout, layout.rate / 2)
        self.matrix = torch.from_numpy(sums_over(groups, layout.bins)).to(device)
        self.last_bins = torch.tensor([g[-1] for g in groups], device=device)

    def __call__(self, speech: Tensor, result: Tensor, heard: Tensor) -> Tensor:
        """Mean loss per piece from powers [B, T, bins]; `heard` [B, 1, bins] says which bins are known."""
        wanted, got = speech @ self.matrix + 1e-9, result @ self.matrix + 1e-9
        level = 10.0 * torch.log10(wanted)
        loud = torch.quantile(level, 0.95, dim=1, keepdim=True)
        faintest = loud.amax(-1, keepdim=True) - 60.0  # a band without speech has no loud moments
        spoken = ((level - torch.maximum(loud + SPOKEN_DB, faintest)) / SPOKEN_RANGE_DB).clamp(0.0, 1.0)
        spoken = spoken * (heard[..., self.last_bins] >= 1.0)
        lost = (level - 10.0 * torch.log10(got)).clamp(0.0, MOST_LOST_DB)
        return (spoken * lost).sum((1, 2)) / (spoken.sum((1, 2)) + 1.0)


class Envelope:
    """Log-likelihood ratio of the all-pole envelopes of speech and result, from their power spectra up to 7 kHz."""

    def __init__(self, layout: Layout, device: torch.device) -> None:
        width_hz = layout.rate / layout.frame
        self.bins = min(layout.bins, int(TRUSTED_EDGE_HZ / width_hz))
        turns = np.outer(np.arange(self.bins) + 0.5, np.arange(PREDICTION_ORDER + 1)) * (np.pi / self.bins)
        self.cosines = torch.tensor(np.cos(turns), dtype=torch.float32, device=device)
        lag = torch.arange(PREDICTION_ORDER + 1, device=device)
        self.toeplitz = (lag[:, None] - lag[None]).abs()

    def correlations(self, power: Tensor, floor: Tensor) -> Tensor:
        """Normalised autocorrelations [n, order + 1] over a white floor."""
        sums = power[:, : self.bins] @ self.cosines
        whitened = torch.cat([sums[:, :1] * 1.0001 + floor, sums[:, 1:]], 1)
        return whitened / whitened[:, :1]

    def predictor(self, correlation: Tensor) -> Tensor:
        """Coefficients [n, order + 1] of the prediction error's filter."""
        matrix, right = correlation[:, self.toeplitz[1:, 1:]], correlation[:, 1:]
        taps = torch.cholesky_solve(right[..., None], torch.linalg.cholesky(matrix))[..., 0]
        return torch.cat([torch.ones_like(taps[:, :1]), -taps], 1)

    def __call__(self, speech: Tensor, result: Tensor, spoken: Tensor) -> Tensor:
        """Mean over the frames [B, T] that are `spoken`, of powers [B, T, bins]."""
        loud = torch.quantile(speech.sum(-1), 0.95, dim=1, keepdim=True).expand_as(spoken)
        floor = (loud * 10 ** (PREDICTION_FLOOR_DB / 10))[spoken][:, None]
        wanted, got = (self.correlations(power[spoken], floor) for power in (speech, result))
        if not len(wanted):
            return speech.new_zeros(())
        matrix = wanted[:, self.toeplitz]
        best, other = self.predictor(wanted), self.predictor(got)
        errors = [torch.einsum("ni,nij,nj->n", a, matrix, a) for a in (best, other)]
        return torch.log(errors[1] / errors[0]).clamp(0.0, UNLIKELIEST).mean()


def result_of(log_gain: Tensor, batch: Batch, factors: Tensor | None) -> tuple[Tensor, Tensor]:
    """|Y|^2 and Re(Y S*) of what the masks make of X, and on the lowest bins the filter's factors [B, T, taps, bins]
    of the frames that it spans."""
    gain = log_gain.exp()
    after, product = gain.square() * batch.noisy_power + FAINTEST, gain * batch.product
    if factors is None:
        return after, product
    low = factors.shape[-1]
    y = gain[..., :low] * batch.heard[:, :, batch.ahead] + (factors * batch.heard).sum(2)
    both = power_of(y) + FAINTEST_FILTERED, y.real * batch.speech.real + y.imag * batch.speech.imag
    return tuple(torch.cat([part, whole[..., low:]], -1) for part, whole in zip(both, (after, product)))


class MaskLoss:
    """Loss of gains [B, T, bins], given as natural logarithms, against a batch."""

    def __init__(self, layout: Layout, weights: LossWeights, device: torch.device) -> None:
        self.weights = weights
        self.loudness = LoudnessModel(layout, device)
        self.lost_speech = LostSpeech(layout, device)
        self.envelope = Envelope(layout, device)
        lower = np.arange(layout.bins) * (layout.rate / layout.frame)
        share = np.maximum(lower / EVEN_UP_TO_HZ, 1.0) ** -0.5
        self.bin_weight = torch.tensor(share / share.sum(), dtype=torch.float32, device=device)
        # Without any say above 8 kHz the mask opens there whenever a narrow-band talker speaks, and
        # the noise comes and goes with the words; with a full say it would mute everybody's treble.
        trusted = np.where(lower < TRUSTED_EDGE_HZ, 1.0, np.where(lower >= HIGH_EDGE_HZ, HIGH_SHARE, 0.0))
        self.trusted = torch.tensor(trusted, dtype=torch.float32, device=device)

    def __call__(
        self, log_gain: Tensor, batch: Batch, skip: int = 0, factors: Tensor | None = None
    ) -> tuple[Tensor, dict[str, float]]:
        """The loss and its terms; the first `skip` frames, where the memory is empty, do not count."""
        parts = self.terms(log_gain, batch, skip, factors)
        w = self.weights
        loss = (
            w.compressed * parts["magnitude"]
            + w.phase * parts["phase"]
            + w.lost_speech * parts["lost"]
            - w.ratio * parts["ratio_db"]
            + w.lost_db * parts["lost_db"]
            + w.envelope * parts["envelope"]
            - w.loudness * parts["quality"]
            + w.pause * parts["pause_db"]
        )
        return loss, {name: part.item() for name, part in parts.items()}

    def terms(self, log_gain: Tensor, batch: Batch, skip: int = 0, factors: Tensor | None = None) -> dict[str, Tensor]:
        cut = slice(skip, None)
        px, ps = batch.noisy_power[:, cut], batch.speech_power[:, cut]
        after, product = (part[:, cut] for part in result_of(log_gain, batch, factors))
        heard = torch.where(batch.wideband[:, None], torch.ones_like(self.trusted), self.trusted)[:, None]
        speech = batch.has_speech.float()
        count = speech.sum().clamp_min(1.0)

        s, y = ps ** (EXPONENT / 2), after ** (EXPONENT / 2)
        cosine = product * torch.rsqrt(after * ps)
        bins = heard * self.bin_weight

        def mean(values: Tensor) -> Tensor:
            return (bins * values).sum(-1).mean()

        error = (heard * (after - 2.0 * product + ps)).sum((1, 2))
        signal = (heard * ps).sum((1, 2))
        ratio = -10.0 * torch.log10((error + 1e-3 * signal + 1e-9) / (signal + 1e-9))

        silent = pause_frames(ps, batch.has_speech)
        noise, left = (silent * px.sum(-1)).sum(1), (silent * after.sum(-1)).sum(1)
        counted = (noise > 1e-4 * px.sum((1, 2))).float()
        left = (10.0 * torch.log10((left + 1e-9) / (noise + 1e-9))).clamp_min(self.weights.deepest_db)
        zero = after.new_zeros(())
        return {
            "magnitude": mean((y - s).square()),
            "phase": mean(2.0 * y * s * (1.0 - cosine)),
            "lost": mean((s - y).clamp_min(0.0).square()),
            "ratio_db": (speech * ratio).sum() / count,
            "lost_db": (speech * self.lost_speech(ps, after, heard)).sum() / count if self.weights.lost_db else zero,
            "envelope": self.envelope(ps, after, silent < 0.5) if self.weights.envelope else zero,
            "quality": (speech * self.loudness.quality(ps, after)).sum() / count,
            "pause_db": (counted * left).sum() / counted.sum().clamp_min(1.0),
        }


def pooled(power: Tensor) -> Tensor:
    """Means over 0.3 s of powers [B, T]."""
    return nn.functional.avg_pool1d(power[:, None], 30, 10)[:, 0]


class LevelLoss:
    """Loss of the noise-level model: error in dB of the power that the mask removes.

    The engine smooths the removed power over about ten hops, so powers are compared over 0.3 s.
    Noise 50 dB below the whole piece counts as that faint, or silence would rule the loss. A share
    of the mask loss keeps the model a noise suppressor.
    """

    FAINTEST = 10**-5.0

    def __init__(self, layout: Layout, weights: LossWeights, device: torch.device, mask_share: float = 0.15) -> None:
        self.mask_loss = MaskLoss(layout, weights, device)
        self.mask_share = mask_share

    def __call__(self, log_gain: Tensor, batch: Batch, skip: int = 0) -> tuple[Tensor, dict[str, float]]:
        cut = slice(skip, None)
        kept = log_gain[:, cut].exp()
        px, ps, pxs = batch.noisy_power[:, cut], batch.speech_power[:, cut], batch.product[:, cut]
        removed = ((1.0 - kept).square() * px).sum(-1)
        noise = (px - 2.0 * pxs + ps).clamp_min(0.0).sum(-1)
        floor = self.FAINTEST * px.sum(-1).mean(1, keepdim=True) + 1e-9
        error_db = 10.0 * (torch.log10(pooled(removed) + floor) - torch.log10(pooled(noise) + floor))
        level = error_db.abs().mean()
        mask, parts = self.mask_loss(log_gain, batch, skip)
        return 0.1 * level + self.mask_share * mask, {"level_error_db": level.item(), **parts}


class ThreeAnswersLoss:
    """Loss of a network that answers with masks, shares of noise and a voice score [B, T, 2 K + 1], all as logits."""

    NOISE, VOICE = 0.5, 0.3

    def __init__(self, layout: Layout, weights: LossWeights, device: torch.device) -> None:
        self.layout = layout
        self.mask_loss = MaskLoss(layout, weights, device)
        self.band_of_bin = torch.from_numpy(layout.band_of_bin()).to(device)

    def __call__(self, logits: Tensor, batch: Batch, skip: int = 0) -> tuple[Tensor, dict[str, float]]:
        bands = self.layout.bands
        mask, noise, voice, _ = logits.tensor_split([bands, 2 * bands, 2 * bands + 1], -1)
        factors = filter_factors(logits, self.layout) if self.layout.taps else None
        loss, parts = self.mask_loss(nn.functional.logsigmoid(mask)[..., self.band_of_bin], batch, skip, factors)
        share, level = self.noise_errors(noise[:, skip:], batch, skip)
        score = loss.new_zeros(())
        if batch.voice is not None:
            labels, sure = batch.voice[:, skip:], batch.voice_weight[:, skip:]
            score = nn.functional.binary_cross_entropy_with_logits(voice[:, skip:, 0], labels, sure)
        total = loss + self.NOISE * (share + 0.1 * level) + self.VOICE * score
        mask_part = {"mask": loss.item(), "share": share.item(), "level_error_db": level.item(), "voice": score.item()}
        return total, {**mask_part, **parts}

    def noise_errors(self, logits: Tensor, batch: Batch, skip: int) -> tuple[Tensor, Tensor]:
        """Of each band's share, where anything is heard, and of the level of all noise in dB over 0.3 s."""
        px, ps, pxs = batch.noisy_power[:, skip:], batch.speech_power[:, skip:], batch.product[:, skip:]
        heard = compress_bands(px, self.layout)
        noise = compress_bands((px - 2.0 * pxs + ps).clamp_min(0.0), self.layout)
        target = (noise / heard).clamp_max(1.0)
        audible = (heard > heard.mean(1, keepdim=True) * AUDIBLE).float()
        entropy = nn.functional.binary_cross_entropy_with_logits(logits, target, audible)
        floor = LevelLoss.FAINTEST * heard.sum(-1).mean(1, keepdim=True) + 1e-9
        found, wanted = pooled((torch.sigmoid(logits) * heard).sum(-1)), pooled(noise.sum(-1))
        level = 10.0 * (torch.log10(found + floor) - torch.log10(wanted + floor)).abs()
        return entropy, level.mean()

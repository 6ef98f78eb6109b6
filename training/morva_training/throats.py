"""What changes voices, for many pieces at once: see `voices`."""

from __future__ import annotations

import torch
from torch import Tensor
from torch.nn import functional

from .drawing import Chance, frames_of, joined
from .voices import FRAMES_HZ


def whispered(chance: Chance, samples: Tensor, rate: int) -> Tensor:
    """The same words without a voice: the smoothed spectrum, excited by noise, thin below 500 Hz."""
    spectra, window = frames_of(samples, int(rate / FRAMES_HZ))
    offsets = torch.arange(-12, 13, device=samples.device)
    bell = torch.exp(-0.5 * (offsets / 4.0).square())
    envelope = _smoothed(spectra.abs(), (bell / bell.sum())[None])
    frequency = torch.arange(envelope.shape[-1], device=samples.device) * FRAMES_HZ
    noise = torch.view_as_complex(chance.normal(*envelope.shape, 2))
    return joined(envelope * noise * (frequency / (frequency + 500.0)), window, samples.shape[1])


def formants_moved(
    chance: Chance, samples: Tensor, rate: int, factors: tuple[float, float], highest_hz: Tensor
) -> Tensor:
    """The same pitch from a shorter or longer throat: the smooth spectrum, stretched below `highest_hz` [pieces]."""
    spectra, window = frames_of(samples, int(rate / FRAMES_HZ))
    power = spectra.real.square() + spectra.imag.square()
    envelope = torch.log(_smoothed(power, torch.full((5, 7), 1.0 / 35.0, device=samples.device)) + 1.0)
    bins = torch.arange(envelope.shape[-1], device=samples.device)
    factor = chance.uniform(len(samples), 1, low=factors[0], high=factors[1])
    source = (bins / factor).clamp_max(len(bins) - 1.001)
    low, shape = source.long()[:, None], envelope.shape
    part = (source - source.floor())[:, None]
    moved = envelope.gather(2, low.expand(shape)) * (1 - part) + envelope.gather(2, (low + 1).expand(shape)) * part
    share = ((highest_hz[:, None] / FRAMES_HZ - bins) / 10.0).clamp(0.0, 1.0)[:, None]
    gain = torch.exp(0.5 * (moved - envelope).clamp(-4.0, 4.0) * share)
    return joined(spectra * gain, window, samples.shape[1])


def _smoothed(values: Tensor, kernel: Tensor) -> Tensor:
    """Over frames and bins; what lies beyond the edges is like what lies at them."""
    frames, bins = (size // 2 for size in kernel.shape)
    padded = functional.pad(values[:, None], (bins, bins, frames, frames), mode="replicate")
    return functional.conv2d(padded, kernel[None, None])[:, 0]

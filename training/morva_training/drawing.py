"""Random values for many pieces at once, on the device that trains, and what is done to their samples [pieces, n]."""

from __future__ import annotations

import functools
import math

import torch
from torch import Tensor
from torch.nn import functional

from .pool import Clips

HALF_TAPS, PHASES, CUTS = 8, 1024, 16  # of the interpolation between samples


class Chance:
    """A random generator of a device."""

    def __init__(self, seed: int, device: torch.device) -> None:
        self.device = device
        self.generator = torch.Generator(device).manual_seed(seed)

    def uniform(self, *shape: int, low: float = 0.0, high: float = 1.0) -> Tensor:
        return low + (high - low) * torch.rand(shape, generator=self.generator, device=self.device)

    def log_uniform(self, *shape: int, low: float, high: float) -> Tensor:
        return low * (high / low) ** self.uniform(*shape)

    def normal(self, *shape: int) -> Tensor:
        return torch.randn(shape, generator=self.generator, device=self.device)

    def exponential(self, *shape: int) -> Tensor:
        return -torch.log(1.0 - self.uniform(*shape))

    def below(self, count: Tensor) -> Tensor:
        """Whole numbers from 0 to each count."""
        share = torch.rand(count.shape, generator=self.generator, device=self.device, dtype=torch.float64)
        return torch.minimum((share * count).long(), (count - 1).clamp_min(0))

    def happens(self, share: float, *shape: int) -> Tensor:
        return self.uniform(*shape) < share

    def of(self, odds: Tensor, count: int) -> Tensor:
        return torch.multinomial(odds, count, replacement=True, generator=self.generator)


def rows_of(flags: Tensor) -> Tensor:
    return flags.nonzero()[:, 0]


def strung(
    clips: Clips, chosen: Tensor, offset: Tensor, begin: Tensor, speed: Tensor, fade: Tensor, count: int
) -> Tensor:
    """Clips in a row, [pieces, count] at the clips' levels: `chosen` [pieces, slots], heard from their `offset` on,
    each starting at its `begin` (which rises along a piece) at its piece's speed [pieces], with fades [pieces, slots]
    in samples. Each may still be heard while the next one starts.
    """
    pieces, slots = chosen.shape
    length = ((clips.length[chosen] - offset) / speed[:, None]).floor()
    base, gain = clips.start[chosen] + offset, clips.gain[chosen]
    time = torch.arange(count, device=chosen.device).repeat(pieces, 1)
    slot = torch.searchsorted(begin, time, right=True) - 1
    out = torch.zeros(pieces, count, device=chosen.device)
    for back in range(2 if slots > 1 else 1):
        which = slot - back
        since = time - begin.gather(1, which.clamp_min(0))
        inside = (which >= 0) & (since < length.gather(1, which.clamp_min(0)))
        piece, at = inside.nonzero(as_tuple=True)
        which, since = which[piece, at], since[piece, at]
        left = length[piece, which] - since
        rise = torch.minimum(since + 1, left).float() / fade[piece, which].clamp_min(1)
        level = torch.sin(0.5 * math.pi * rise.clamp_max(1.0)) * gain[piece, which]
        value = interpolated(clips.samples, base[piece, which], since, speed[piece])
        out[piece, at] += value * level
    return out


def interpolated(samples: Tensor, base: Tensor, since: Tensor, speed: Tensor) -> Tensor:
    """Samples at base + since * speed, [n] each; without what would fold at a higher speed."""
    out = torch.empty(len(base), device=base.device)
    plain = speed == 1.0
    still, moved = rows_of(plain), rows_of(~plain)
    out[still] = samples[base[still] + since[still]].float()
    speed = speed[moved]
    position = since[moved].double() * speed
    whole = position.long()
    phase = ((position - whole) * PHASES).long()
    taps = 2 * HALF_TAPS
    first = (base[moved] + whole - HALF_TAPS + 1).clamp(0, len(samples) - taps)
    cut = ((speed - 1.0) * CUTS).ceil().long().clamp(0, CUTS - 1)
    weights = kernels(base.device)[cut * PHASES + phase]
    out[moved] = (samples.unfold(0, taps, 1)[first] * weights).sum(1)
    return out


@functools.cache
def kernels(device: torch.device) -> Tensor:
    """Windowed sines [CUTS * PHASES, taps] for speeds up to 1, 1 + 1 / CUTS, 1 + 2 / CUTS ..."""
    cut = 0.95 / (1.0 + torch.arange(CUTS) / CUTS)
    distance = (torch.arange(PHASES) / PHASES)[:, None] - torch.arange(1 - HALF_TAPS, HALF_TAPS + 1)
    window = (1.0 - (distance / (HALF_TAPS + 0.01)).square()).square()
    shape = cut[:, None, None] * torch.sinc(cut[:, None, None] * distance) * window
    return shape.flatten(0, 1).to(device)


def active_levels(samples: Tensor, block: int) -> Tensor:
    """RMS [pieces] of the blocks within 30 dB of the loudest one."""
    power = samples[:, : samples.shape[1] // block * block].unflatten(1, (-1, block)).square().mean(-1)
    heard = (power > 1e-3 * power.amax(1, keepdim=True)).float()
    return ((power * heard).sum(1) / heard.sum(1).clamp_min(1.0)).sqrt()


def drawn_through(points: Tensor, count: int) -> Tensor:
    """Lines [pieces, count] through evenly spaced points [pieces, p]."""
    return functional.interpolate(points[:, None], count, mode="linear", align_corners=True)[:, 0]


def frames_of(samples: Tensor, size: int) -> tuple[Tensor, Tensor]:
    """Spectra [pieces, frames, size / 2 + 1] of windows that overlap by half, and the window."""
    window = torch.sin(math.pi * (torch.arange(size, device=samples.device) + 0.5) / size)
    padding = size // 2 + -samples.shape[1] % (size // 2)
    padded = functional.pad(samples, (size // 2, padding))
    return torch.fft.rfft(padded.unfold(1, size, size // 2) * window), window


def joined(spectra: Tensor, window: Tensor, count: int) -> Tensor:
    half = len(window) // 2
    frames = torch.fft.irfft(spectra, len(window)) * window
    return (frames[:, 1:, :half] + frames[:, :-1, half:]).flatten(1)[:, :count]

"""Frames, windows and bands of the noise models for whole recordings at once, on the device of their samples.

Everything here mirrors the engine's arithmetic, so that the network hears in training what it
hears in a call. Samples are floats on the 16-bit scale. A model frame is two hops long; frame t
covers hops t - 1 and t, the hop before the first being silence.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np
import torch
from torch import Tensor, nn

FEATURE_OFFSET = 1000.0  # keeps the logarithm of a silent band finite
REFERENCE_AMPLITUDE = 2000.0
ACTIVITY_ENERGY = 100.0
ENERGY_FRAMES = 10


@dataclass(frozen=True)
class Layout:
    """The fixed numbers of one noise model."""

    rate: int
    frame: int
    compress: int = 0
    preview: int = 3
    first_bin: int = 0
    widths: tuple[int, ...] = ()  # bins per band, narrow ones first, where `compress` does not say it
    advance: bool = False  # features hold each band's phase advance beside its power
    taps: int = 0  # frames that a filter of single bins spans, the newest that the network sees first
    ahead: int = 0  # frames that the network sees beyond the one that it answers for

    @property
    def hop(self) -> int:
        return self.frame // 2

    @property
    def mixed_at(self) -> int:
        """Rate of the mixtures that it is trained on, Hz."""
        return max(self.rate, 32000)

    @property
    def bins(self) -> int:
        """Bins the network sees; the bin at half the rate is always cleared."""
        return self.frame // 2

    @property
    def bands(self) -> int:
        return len(self.widths) or self.bins * (self.compress + 2) >> (self.compress + 1)

    @property
    def features(self) -> int:
        """Of one frame."""
        return self.bands * (3 if self.advance else 1)

    @property
    def filtered(self) -> int:
        """Bins that are bands of their own, where a filter over a few frames adds to the mask."""
        return self.widths.count(1) if self.taps else 0

    @property
    def active_frames(self) -> int:
        """How many active frames the level gain averages over (three seconds)."""
        return self.rate * 3 // self.hop

    def band_widths(self) -> np.ndarray:
        """Bins per band: single bins first, then doubling widths, one width per octave."""
        if self.widths:
            return np.array(self.widths)
        single = self.bins >> self.compress
        widths = [1] * single
        width, start = 2, single
        while start < self.bins:
            widths += [width] * (start // width)
            start, width = 2 * start, 2 * width
        return np.array(widths)

    def band_of_bin(self) -> np.ndarray:
        return np.repeat(np.arange(self.bands), self.band_widths())

    def band_starts(self) -> np.ndarray:
        return np.concatenate([[0], np.cumsum(self.band_widths())[:-1]])


FULL_32K = Layout(rate=32000, frame=640, compress=3)
SMALL_16K = Layout(rate=16000, frame=320, compress=2)
SMALL_8K = Layout(rate=8000, frame=160, compress=1)
# Of version NC_1.0.0: 50 Hz wide bins up to 4.8 kHz, then 200 Hz, and 800 Hz from 8 kHz on.
BANDS_16K = Layout(rate=16000, frame=320, preview=1, widths=(1,) * 96 + (4,) * 16, advance=True)
BANDS_48K = Layout(rate=48000, frame=960, preview=1, widths=(1,) * 96 + (4,) * 16 + (16,) * 20, advance=True)


def vorbis_window(size: int) -> Tensor:
    """Power-complementary window sampled at whole points: zero first, peak at size / 2."""
    index = torch.arange(size, dtype=torch.float64)
    return torch.sin(torch.pi / 2 * torch.sin(index * (torch.pi / size)) ** 2).float()


def hamming_window(size: int) -> np.ndarray:
    return (0.54 - 0.46 * np.cos(np.arange(size) * (2 * np.pi / (size - 1)))).astype(np.float32)


def frames_of(samples: Tensor, hop: int) -> Tensor:
    """All model frames [..., T, 2 * hop] of samples [..., T * hop]."""
    whole = samples.shape[-1] // hop * hop
    return nn.functional.pad(samples[..., :whole], (hop, 0)).unfold(-1, 2 * hop, hop)


def analyse(samples: Tensor, layout: Layout) -> Tensor:
    """Spectra [..., T, frame / 2 + 1], complex, of samples [..., T * hop]."""
    return torch.fft.rfft(frames_of(samples, layout.hop) * vorbis_window(layout.frame).to(samples.device))


def power_of(spectra: Tensor) -> Tensor:
    return spectra.real.square() + spectra.imag.square()


def frame_energies(power: Tensor, frame: int) -> Tensor:
    """Mean square per sample of each frame, estimated from the power of windowed half spectra.

    The window halves the energy of a steady frame; Parseval with the mirrored half gives the rest.
    """
    return 2.0 * power.sum(-1) / (frame * frame * 0.5)


def level_gains(energies: Tensor, active_frames: int, history: Tensor | None = None) -> Tensor:
    """The gain before the features for every frame of streams, [B, T].

    A frame is active when the mean energy of the last ten frames reaches the threshold; the gain
    brings the mean energy of the last active frames to the reference. `history` [B] is the mean
    energy of a long stream that went before; where it is NaN the stream has just started.
    """
    energies = energies.double()
    window = energies.new_full((1, 1, ENERGY_FRAMES), 1.0 / ENERGY_FRAMES)
    recent = nn.functional.conv1d(nn.functional.pad(energies[:, None], (ENERGY_FRAMES - 1, 0)), window)[:, 0]
    active = (recent >= ACTIVITY_ENERGY).double()
    started = torch.full_like(energies[:, :1], torch.nan) if history is None else history[:, None].double()
    fresh = started.isnan()
    before = torch.where(fresh, 1.0, float(active_frames))  # frames that count as heard before the first
    each = torch.where(fresh, REFERENCE_AMPLITUDE**2, started)
    sums = torch.cumsum(nn.functional.pad(energies * active, (1, 0)), -1)
    counts = torch.cumsum(nn.functional.pad(active, (1, 0)), -1)
    forgotten = (before + counts - active_frames).clamp_min(0.0)
    past = torch.minimum(forgotten, before)
    gone = torch.searchsorted(counts, (forgotten - past).contiguous())
    total = (before - past) * each + sums - torch.gather(sums, 1, gone)
    mean = (total / (before + counts - forgotten))[:, 1:]
    return torch.where(mean > 1e-6, REFERENCE_AMPLITUDE / mean.clamp_min(1e-6).sqrt(), 1.0).float()


def compress_bands(power: Tensor, layout: Layout) -> Tensor:
    """Band powers [..., K] of bin powers [..., B]: sums over neighbouring bins of one width after the other."""
    widths = layout.band_widths()
    parts, first = [], 0
    for width in sorted(set(widths)):
        last = first + int(width * (widths == width).sum())
        parts.append(power[..., first:last].unflatten(-1, (-1, int(width))).sum(-1))
        first = last
    return torch.cat(parts, -1)


def earlier_frames(spectra: Tensor, taps: int) -> Tensor:
    """[B, T, taps, bins]: each frame and those before it, turned as a tone in the middle of its bin goes on."""
    bins = torch.arange(spectra.shape[-1], device=spectra.device)
    padded = torch.cat([spectra.new_zeros(len(spectra), taps - 1, spectra.shape[-1]), spectra], 1)
    frames = padded.unfold(1, taps, 1).flip(-1).transpose(-1, -2)
    turned = 1 - 2 * (bins * torch.arange(taps, device=spectra.device)[:, None] % 2)
    return frames * turned


def log_features(power: Tensor, gains: Tensor, layout: Layout) -> Tensor:
    """Log band powers [..., T, K] before standardisation."""
    seen = power[..., layout.first_bin : layout.first_bin + layout.bins]
    return torch.log(compress_bands(seen, layout) * gains.square()[..., None] + FEATURE_OFFSET)


def phase_advances(spectra: Tensor, gains: Tensor, layout: Layout) -> Tensor:
    """Real and imaginary parts [..., T, 2 K] of how each band has turned since the frame before, relative to the
    centres of its bins: a steady tone is near the unit circle, noise anywhere within, silence at zero.
    """
    bins = torch.arange(layout.bins, device=spectra.device)
    seen = spectra[..., layout.first_bin : layout.first_bin + layout.bins]
    before = nn.functional.pad(torch.view_as_real(seen), (0, 0, 0, 0, 1, 0))[..., :-1, :, :]
    turned = seen * torch.view_as_complex(before.contiguous()).conj() * (1 - 2 * (bins % 2))
    power = compress_bands(power_of(seen), layout)
    offset = (FEATURE_OFFSET / gains.square())[..., None]
    previous = nn.functional.pad(power, (0, 0, 1, 0))[..., :-1, :]
    scale = ((power + offset) * (previous + offset)).rsqrt()
    return torch.cat([compress_bands(part, layout) * scale for part in (turned.real, turned.imag)], -1)


def features_of(spectra: Tensor, gains: Tensor, layout: Layout) -> Tensor:
    """What the network sees of each frame [..., T, F], before standardisation."""
    logs = log_features(power_of(spectra), gains, layout)
    return torch.cat([logs, phase_advances(spectra, gains, layout)], -1) if layout.advance else logs

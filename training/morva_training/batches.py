"""Training batches: what the network hears and everything the losses need, per band.

The mask is one number per band, so every loss that is quadratic in the masked spectrum depends on
the bins of a band only through a few sums. They are taken here, once and without gradients; the
losses then work on a hundred bands instead of 320 bins.
"""

from __future__ import annotations

from dataclasses import dataclass
from pathlib import Path
from typing import Iterator

import numpy as np
import torch
from torch import Tensor
from torch.utils.data import IterableDataset

from .mixing import MixtureMaker, Recipe, Waves
from .spectra import FULL_32K, Layout, analyse, frame_energies, level_gains, log_features

EXPONENT = 0.3  # of magnitudes in the compressed losses


@dataclass
class Batch:
    """Tensors [B, T, K] unless said otherwise. Spectra are scaled so that speech has unit level."""

    features: Tensor  # log band powers, not standardised
    noisy_power: Tensor  # sum |X|^2
    speech_power: Tensor  # sum |S|^2
    product: Tensor  # sum Re(X S*)
    noisy_compressed: Tensor  # sum |X|^2c
    speech_compressed: Tensor  # sum |S|^2c
    product_compressed: Tensor  # sum |X|^c |S|^c
    phase_product: Tensor  # sum |X|^c |S|^c cos(phase difference)
    wideband: Tensor  # [B] bool
    has_speech: Tensor  # [B] bool

    def to(self, device: torch.device) -> "Batch":
        return Batch(**{name: value.to(device) for name, value in vars(self).items()})


def lower_part(spectra: np.ndarray, layout: Layout) -> np.ndarray:
    """Spectra of the band-limited signal at the layout's rate, from spectra at 32 kHz."""
    ratio = FULL_32K.rate // layout.rate
    return spectra[..., : layout.bins] * np.float32(1.0 / ratio)


def band_sums(noisy: np.ndarray, speech: np.ndarray, layout: Layout) -> dict[str, Tensor]:
    """The losses' sums over bins of spectra [..., T, B]."""
    x, s = torch.from_numpy(noisy), torch.from_numpy(speech)
    x_power = x.real.square() + x.imag.square() + 1e-10
    s_power = s.real.square() + s.imag.square() + 1e-10
    product = x.real * s.real + x.imag * s.imag
    x_compressed, s_compressed = x_power ** (EXPONENT / 2), s_power ** (EXPONENT / 2)
    both = x_compressed * s_compressed
    sums = {
        "noisy_power": x_power,
        "speech_power": s_power,
        "product": product,
        "noisy_compressed": x_compressed.square(),
        "speech_compressed": s_compressed.square(),
        "product_compressed": both,
        "phase_product": both * product * torch.rsqrt(x_power * s_power),
    }
    starts = layout.band_starts()
    return {name: torch.from_numpy(np.add.reduceat(v.numpy(), starts, axis=-1)) for name, v in sums.items()}


def make_item(waves: Waves, layout: Layout, rng: np.random.Generator) -> dict[str, Tensor]:
    """One row of a batch."""
    speech, noisy = lower_part(analyse(np.stack([waves.speech, waves.heard()]), FULL_32K), layout)
    energies = frame_energies(noisy, layout.frame)
    history = float(energies.mean()) * 10 ** rng.uniform(-0.6, 0.6) if rng.random() < 0.5 else None
    gains = level_gains(energies, layout.active_frames, history=history).astype(np.float32)
    reference = speech if waves.has_speech else noisy
    level = np.sqrt(np.mean(np.square(np.abs(reference)))) + 1e-3
    scale = np.float32(1.0 / level)
    item = band_sums(noisy * scale, speech * scale, layout)
    item["features"] = torch.from_numpy(log_features(noisy, gains, layout))
    item["wideband"] = torch.tensor(waves.wideband)
    item["has_speech"] = torch.tensor(waves.has_speech)
    return item


class MixtureBatches(IterableDataset):
    """Endless batches. Every draw is used `reuse` times, each time in another noise."""

    def __init__(
        self, store: Path, layout: Layout, recipe: Recipe, size: int, seed: int, reuse: int = 2, split: str = "train"
    ) -> None:
        self.store, self.layout, self.recipe = store, layout, recipe
        self.size, self.seed, self.reuse, self.split = size, seed, reuse, split

    def __iter__(self) -> Iterator[dict[str, Tensor]]:
        worker = torch.utils.data.get_worker_info()
        seed = self.seed * 1000 + (worker.id if worker else 0)
        torch.set_num_threads(1)
        maker = MixtureMaker(self.store, seed, self.recipe, self.split)
        rng = np.random.default_rng(seed + 1)
        while True:
            drawn = [maker.draw() for _ in range(self.size // self.reuse)]
            items = [make_item(m, self.layout, rng) for m in drawn]
            sources = [m for m in drawn if m.noisy]
            while len(items) < self.size:
                base = drawn[len(items) % len(drawn)]
                if base.noisy and base.has_speech:
                    other = sources[rng.integers(len(sources))]
                    base = base.remixed(other, rng.uniform(*self.recipe.snr_db))
                items.append(make_item(base, self.layout, rng))
            yield {name: torch.stack([item[name] for item in items]) for name in items[0]}

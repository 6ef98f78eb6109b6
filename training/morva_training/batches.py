"""Training batches: mixtures from the data process, and what network and losses need of them.

The data process only draws and mixes; spectra, features and sums are taken on the device that trains.
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
from .spectra import FULL_32K, Layout, analyse, frame_energies, level_gains, log_features, power_of

SILENCE = 1e-10  # power that every bin has at least
QUIET = 1e-3  # of a piece's mean power; nobody speaks in a part that is below


@dataclass
class Batch:
    """Tensors [B, T, bins] unless said otherwise. Spectra are scaled so that speech has unit level."""

    features: Tensor  # [B, T, K] log band powers, not standardised
    noisy_power: Tensor  # |X|^2
    speech_power: Tensor  # |S|^2
    product: Tensor  # Re(X S*)
    wideband: Tensor  # [B] bool
    has_speech: Tensor  # [B] bool
    lead: int = 0  # frames of features before the first of the others

    @staticmethod
    @torch.no_grad()
    def of(waves: dict[str, Tensor], layout: Layout, device: torch.device) -> Batch:
        """From samples at 32 kHz (see `MixtureBatches`)."""
        waves = {name: value.to(device) for name, value in waves.items()}
        speech, noisy = (lower_part(analyse(waves[name], FULL_32K), layout) for name in ("speech", "heard"))
        noisy_power, speech_power = power_of(noisy), power_of(speech)
        energies = frame_energies(noisy_power, layout.frame)
        gains = level_gains(energies, layout.active_frames, waves["history"] * energies.mean(1))
        reference = torch.where(waves["has_speech"][:, None, None], speech_power, noisy_power)
        scale = (reference.mean((1, 2)).sqrt() + 1e-3)[:, None, None] ** -2
        return Batch(
            features=log_features(noisy_power, gains, layout),
            noisy_power=noisy_power * scale + SILENCE,
            speech_power=speech_power * scale + SILENCE,
            product=(noisy.real * speech.real + noisy.imag * speech.imag) * scale,
            wideband=waves["wideband"],
            has_speech=waves["has_speech"],
        )

    def parts(self, count: int, lead: int) -> Iterator[Batch]:
        """Consecutive parts of one length; all but the first have `lead` frames of features from before."""
        frames = self.noisy_power.shape[1] // count
        loud = self.speech_power.sum(-1)
        for start in range(0, count * frames, frames):
            cut, before = slice(start, start + frames), lead if start else 0
            spoken = loud[:, cut].mean(1) > QUIET * loud.mean(1)
            yield Batch(
                self.features[:, start - before : start + frames],
                self.noisy_power[:, cut],
                self.speech_power[:, cut],
                self.product[:, cut],
                self.wideband,
                self.has_speech & spoken,
                before,
            )


def lower_part(spectra: Tensor, layout: Layout) -> Tensor:
    """Spectra of the band-limited signal at the layout's rate, from spectra at 32 kHz."""
    return spectra[..., : layout.bins] * (layout.rate / FULL_32K.rate)


def make_item(waves: Waves, rng: np.random.Generator) -> dict[str, Tensor]:
    """One row of a batch."""
    return {
        "speech": torch.from_numpy(waves.speech.astype(np.float32)),
        "heard": torch.from_numpy(waves.heard().astype(np.float32)),
        "history": torch.tensor(10 ** rng.uniform(-0.6, 0.6) if rng.random() < 0.5 else np.nan, dtype=torch.float32),
        "wideband": torch.tensor(waves.wideband),
        "has_speech": torch.tensor(waves.has_speech),
    }


class MixtureBatches(IterableDataset):
    """Endless batches: `speech` and `heard` [B, n] at 32 kHz on the 16-bit scale, `wideband` and `has_speech` [B], and
    `history` [B], the energy of the call before the piece relative to the piece's (NaN: the call has just started).

    Every draw is used `reuse` times, each time in another noise.
    """

    def __init__(self, store: Path, recipe: Recipe, size: int, seed: int, reuse: int = 2, split: str = "train") -> None:
        self.store, self.recipe, self.size = store, recipe, size
        self.seed, self.reuse, self.split = seed, reuse, split

    def __iter__(self) -> Iterator[dict[str, Tensor]]:
        worker = torch.utils.data.get_worker_info()
        seed = self.seed * 1000 + (worker.id if worker else 0)
        torch.set_num_threads(1)
        maker = MixtureMaker(self.store, seed, self.recipe, self.split)
        rng = np.random.default_rng(seed + 1)
        while True:
            items = [make_item(waves, rng) for waves in maker.draws(self.size, self.reuse)]
            yield {name: torch.stack([item[name] for item in items]) for name in items[0]}

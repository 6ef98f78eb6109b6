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

from .corpus import BASE_RATE
from .measures import block_labels
from .mixing import MixtureMaker, Recipe, Waves
from .spectra import Layout, analyse, earlier_frames, features_of, frame_energies, level_gains, power_of

SILENCE = 1e-10  # power that every bin has at least
QUIET = 1e-3  # of a piece's mean power; nobody speaks in a part that is below


@dataclass
class Batch:
    """Tensors [B, T, bins] unless said otherwise. Spectra are scaled so that speech has unit level."""

    features: Tensor  # [B, T, F], not standardised
    noisy_power: Tensor  # |X|^2
    speech_power: Tensor  # |S|^2
    product: Tensor  # Re(X S*)
    wideband: Tensor  # [B] bool
    has_speech: Tensor  # [B] bool
    goes_on: bool = False  # where the part before ended; features then begin with what the context sees of that
    voice: Tensor | None = None  # [B, T] whether somebody speaks in the newer half of a frame
    voice_weight: Tensor | None = None  # [B, T] how sure that is
    heard: Tensor | None = None  # [B, T, taps, filtered], complex: what a filter adds up
    speech: Tensor | None = None  # [B, T, filtered], complex
    ahead: int = 0  # which of the taps is the frame itself

    @staticmethod
    @torch.no_grad()
    def of(waves: dict[str, Tensor], layout: Layout, device: torch.device) -> Batch:
        """From samples at the rate that the layout is mixed at (see `MixtureBatches`)."""
        waves = {name: value.to(device) for name, value in waves.items()}
        mixed = Layout(rate=layout.mixed_at, frame=layout.mixed_at // 50)
        speech, noisy = (lower_part(analyse(waves[name], mixed), layout) for name in ("speech", "heard"))
        noisy_power, speech_power = power_of(noisy), power_of(speech)
        energies = frame_energies(noisy_power, layout.frame)
        gains = level_gains(energies, layout.active_frames, waves["history"] * energies.mean(1))
        reference = torch.where(waves["has_speech"][:, None, None], speech_power, noisy_power)
        scale = (reference.mean((1, 2)).sqrt() + 1e-3)[:, None, None] ** -2
        cut = slice(0, noisy.shape[1] - layout.ahead)
        labels = {key: waves[key][:, cut] for key in ("voice", "voice_weight") if key in waves}
        if layout.taps:
            low = slice(0, layout.filtered)
            labels["heard"] = earlier_frames(noisy[..., low] * scale.sqrt(), layout.taps)[:, layout.ahead :]
            labels["speech"] = (speech[..., low] * scale.sqrt())[:, cut]
        return Batch(
            features=features_of(noisy, gains, layout)[:, layout.ahead :],
            noisy_power=(noisy_power * scale + SILENCE)[:, cut],
            speech_power=(speech_power * scale + SILENCE)[:, cut],
            product=((noisy.real * speech.real + noisy.imag * speech.imag) * scale)[:, cut],
            wideband=waves["wideband"],
            has_speech=waves["has_speech"],
            ahead=layout.ahead,
            **labels,
        )

    def parts(self, count: int, lead: int) -> Iterator[Batch]:
        """Consecutive parts of one length; all but the first have `lead` frames of features from before."""
        frames = self.noisy_power.shape[1] // count
        loud = self.speech_power.sum(-1)
        for start in range(0, count * frames, frames):
            cut, before = slice(start, start + frames), lead if start else 0
            spoken = loud[:, cut].mean(1) > QUIET * loud.mean(1)
            others = (self.voice, self.voice_weight, self.heard, self.speech)
            others = [None if each is None else each[:, cut] for each in others]
            yield Batch(
                self.features[:, start - before : start + frames],
                self.noisy_power[:, cut],
                self.speech_power[:, cut],
                self.product[:, cut],
                self.wideband,
                self.has_speech & spoken,
                start > 0,
                *others,
                self.ahead,
            )


def lower_part(spectra: Tensor, layout: Layout) -> Tensor:
    """Spectra of the band-limited signal at the layout's rate, from those of its mixtures."""
    return spectra[..., : layout.bins] * (layout.rate / layout.mixed_at)


def labels_of(waves: Waves) -> dict[str, Tensor]:
    """Voice per 10 ms, and how sure that is."""
    voice, weight = block_labels(waves.speech, waves.rate // 100)
    if not waves.has_speech:
        voice, weight = np.zeros_like(voice), np.ones_like(weight)
    return {"voice": torch.from_numpy(voice.astype(np.float32)), "voice_weight": torch.from_numpy(weight)}


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
    """Endless batches: `speech` and `heard` [B, n] at `rate` on the 16-bit scale, `wideband` and `has_speech` [B], and
    `history` [B], the energy of the call before the piece relative to the piece's (NaN: the call has just started).
    With `voice` also `voice` and `voice_weight` [B, T].

    Every draw is used `reuse` times, each time in another noise.
    """

    def __init__(
        self,
        store: Path,
        recipe: Recipe,
        size: int,
        seed: int,
        reuse: int = 2,
        split: str = "train",
        voice: bool = False,
        rate: int = BASE_RATE,
    ) -> None:
        self.store, self.recipe, self.size, self.rate = store, recipe, size, rate
        self.seed, self.reuse, self.split, self.voice = seed, reuse, split, voice

    def __iter__(self) -> Iterator[dict[str, Tensor]]:
        worker = torch.utils.data.get_worker_info()
        seed = self.seed * 1000 + (worker.id if worker else 0)
        torch.set_num_threads(1)
        maker = MixtureMaker(self.store, seed, self.recipe, self.split, self.rate)
        rng = np.random.default_rng(seed + 1)
        while True:
            pieces = maker.draws(self.size, self.reuse)
            items = [make_item(waves, rng) for waves in pieces]
            if self.voice:
                speech = {id(waves.speech): waves for waves in pieces}  # several may share one
                labels = {key: labels_of(waves) for key, waves in speech.items()}
                items = [item | labels[id(waves.speech)] for item, waves in zip(items, pieces)]
            yield {name: torch.stack([item[name] for item in items]) for name in items[0]}

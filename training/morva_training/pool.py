"""Everything that mixtures are drawn from, on the device that trains: uploaded or made once, then only read.

Recordings stay what they are in the store, 16-bit samples one after the other. What costs a CPU much to make (machines,
textures, crowds, rooms) is rendered by several processes when a run starts, many times what a piece holds, and drawn
from like recordings: at other speeds, through other microphones and rooms it is never the same again.
"""

from __future__ import annotations

import multiprocessing
from collections.abc import Iterator
from concurrent.futures import ProcessPoolExecutor
from dataclasses import dataclass, replace
from pathlib import Path

import numpy as np
import torch
from torch import Tensor

from .corpus import BASE_RATE, Clip, to_int16
from .measures import active_level
from .mixing import MixtureMaker, Recipe, odds_of
from .rooms import LONGEST, parted, simulated_room

SHORT = 2 * BASE_RATE  # samples; shorter noises are single sounds
AT_A_TIME = 40  # noises that one process renders before it hands them over
ROOMS_PER_NOISE = 0.25


@dataclass(frozen=True)
class Clips:
    """Clips [n] of one kind of sound, those of a group (a speaker, a category) side by side."""

    samples: Tensor  # int16
    start: Tensor
    length: Tensor
    gain: Tensor
    first: Tensor  # of each group
    count: Tensor
    odds: Tensor

    @staticmethod
    def of(samples: Tensor, groups: dict[str, list[Clip]], odds: np.ndarray, gains: dict[str, float]) -> Clips:
        clips = [clip for group in groups.values() for clip in group]
        counts = np.array([len(group) for group in groups.values()])

        def tensor(values, kind: torch.dtype) -> Tensor:
            return torch.as_tensor(np.asarray(values), dtype=kind, device=samples.device)

        return Clips(
            samples,
            tensor([clip.start for clip in clips], torch.int64),
            tensor([clip.length for clip in clips], torch.int64),
            tensor([gains.get(clip.path, 1.0) for clip in clips], torch.float32),
            tensor(np.cumsum(counts) - counts, torch.int64),
            tensor(counts, torch.int64),
            tensor(odds, torch.float32),
        )


@dataclass(frozen=True)
class Pool:
    voices: dict[str, Clips]  # by band
    noises: Clips
    room_tone: Clips | None
    made: Tensor | None  # [n, samples] int16: noise that no recording holds
    rooms: Tensor  # [n, 2, samples]: early and late; simulated ones and, behind them, recorded ones
    simulated: int  # how many

    @staticmethod
    def of(
        store: Path, recipe: Recipe, seed: int, made_hours: float, processes: int, device: torch.device, split="train"
    ) -> Pool:
        """Pieces of the recipe find room in what is made even when they run at the highest speed."""
        maker = MixtureMaker(store, seed, recipe, split)
        seconds = recipe.seconds * recipe.noise_speed[1] + 0.5
        count = max(AT_A_TIME, round(made_hours * 3600 / seconds))
        jobs = [
            (store, replace(recipe, seconds=seconds), seed * 9973 + n, split) for n in range(-(-count // AT_A_TIME))
        ]
        made, rooms = zip(*_all_rendered(jobs, processes))
        speech, noise = (_mapped(maker.corpus.file_of(kind)).to(device) for kind in ("speech", "noise"))
        long = [c for group in maker.categories.values() for c in group if c.length >= SHORT]
        # What one is louder than the next is the recordists' choice.
        gains = {c.path: 1000.0 / (active_level(maker.corpus.read(c), BASE_RATE) + 1.0) for c in long}
        tone = {name: clips for name, clips in maker.categories.items() if name == "room_tone"}
        simulated = [room for some in rooms for room in some]
        recorded = [_room_parts(room) for room in maker.rooms]
        return Pool(
            {b: Clips.of(speech, v, maker.voice_odds[b], {}) for b, v in maker.voices.items() if v},
            Clips.of(noise, maker.categories, maker.category_odds, gains),
            Clips.of(noise, tone, odds_of(tone), gains) if tone else None,
            torch.from_numpy(np.concatenate(made)).to(device) if len(made[0]) else None,
            torch.from_numpy(np.stack(simulated + recorded)).to(device),
            len(simulated),
        )


def _mapped(file: Path) -> Tensor:
    """The samples of a file, read when they are needed."""
    return torch.from_file(str(file), shared=False, size=file.stat().st_size // 2, dtype=torch.int16)


def _room_parts(room: np.ndarray) -> np.ndarray:
    """[2, LONGEST]: early and late."""
    out = np.zeros((2, int(LONGEST * BASE_RATE)), np.float32)
    for row, part in zip(out, parted(room[: out.shape[1]], BASE_RATE)):
        row[: len(part)] = part
    return out


def _all_rendered(jobs: list[tuple], processes: int) -> Iterator[tuple[np.ndarray, list[np.ndarray]]]:
    if processes < 2:
        yield from map(rendered, jobs)
        return
    with ProcessPoolExecutor(processes, multiprocessing.get_context("spawn")) as workers:
        yield from workers.map(rendered, jobs)


def rendered(job: tuple[Path, Recipe, int, str]) -> tuple[np.ndarray, list[np.ndarray]]:
    """Noises [n, samples] that are no recordings, in the recipe's proportions, and rooms."""
    store, recipe, seed, split = job
    maker = MixtureMaker(store, seed, recipe, split)
    shares = unrecorded(recipe)
    noises = np.zeros((AT_A_TIME if shares else 0, maker.count), np.int16)
    if shares:
        maker.recipe = replace(recipe, **{name: share / sum(shares.values()) for name, share in shares.items()})
    for row in noises:
        noise = maker.one_noise()
        row[:] = to_int16(0.9 * noise / (np.abs(noise).max() + 1e-9))
    rooms = [_room_parts(simulated_room(maker.rng, BASE_RATE)) for _ in range(int(AT_A_TIME * ROOMS_PER_NOISE))]
    return noises, rooms


def unrecorded(recipe: Recipe) -> dict[str, float]:
    """The shares of noise that is no recording."""
    names = ("synthetic_share", "babble_share", "made_share", "texture_share")
    return {name: share for name in names if (share := getattr(recipe, name))}

"""The training program: what all kinds of models share, from the command line to the weight file.

Runs on a CPU or a GPU. A run that was stopped goes on from its last checkpoint when it is started again
with the same folder; with `--steps 0` it only writes the weight file of what is there, also while it runs.
"""

from __future__ import annotations

import argparse
import ctypes
from abc import ABC, abstractmethod
from collections.abc import Iterator
from itertools import chain
from pathlib import Path

import numpy as np
import torch
from torch import Tensor, nn
from torch.utils.data import DataLoader, IterableDataset

from . import mvw, together
from .convert import half_precision
from .loop import Run, Schedule, steps_done
from .mvw import Weight
from .networks import Network, network_input
from .spectra import Layout

STATISTICS_BATCHES = 4


class Task(ABC):
    """What one kind of model brings. Mean and spread of the features are those of its weight file."""

    context: int  # frames of features that the network sees
    skipped: int  # frames at the start of a piece, while the memory fills
    layout: Layout | None = None  # of the noise models
    state: Tensor | None = None  # of the network after the last part

    def __init__(self, args: argparse.Namespace) -> None:
        self.args = args
        self.device = torch.device("cuda" if torch.cuda.is_available() else "cpu")

    @abstractmethod
    def batches(self, seed: int) -> Iterator[dict[str, Tensor]]: ...

    def loaded(self, dataset: IterableDataset) -> Iterator[dict[str, Tensor]]:
        """Batches of other processes."""
        return iter(DataLoader(dataset, batch_size=None, num_workers=self.args.workers))

    def prepared(self, batch: dict[str, Tensor]) -> Iterator[dict[str, Tensor]]:
        """What was drawn as network and loss take it, on the device: one or several parts, in their order.

        A part that `goes_on` begins with the last context - 1 frames of the features of the part before, whose
        state goes on.
        """
        yield batch

    @abstractmethod
    def statistics(self, features: Tensor) -> tuple[Tensor, Tensor]:
        """Mean and spread of features [n, F]."""

    def start_statistics(self, start: Weight, fresh: tuple[Tensor, Tensor]) -> tuple[Tensor, Tensor]:
        """Mean and spread for a network that starts from a weight file; `fresh` are those of the features."""
        return torch.from_numpy(start["MU"]), torch.from_numpy(start["SD"])

    @abstractmethod
    def network(self, start: Weight | None) -> Network:
        """The network to train, fresh or from a weight file."""

    @abstractmethod
    def loss(self, model: nn.Module, batch: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]: ...

    @abstractmethod
    def validate(self, model: nn.Module) -> dict[str, float]:
        """Figures of the validation part, `loss` among them: where it is lowest are the weights that are kept."""

    @abstractmethod
    def weight(self, model: nn.Module, mean: np.ndarray, spread: np.ndarray) -> Weight: ...

    def scale(self, spread: Tensor) -> Tensor:
        return spread

    def outputs(self, model: nn.Module, batch: dict[str, Tensor]) -> Tensor:
        """Logits [B, T, K] of the whole pieces."""
        x = self.inputs(batch)
        goes_on = batch.get("goes_on", False) and self.state is not None  # a run may begin in the middle of a piece
        y, state = model(x, self.state if goes_on else model.initial_state(len(x)))
        self.state = state.detach().nan_to_num()
        return y

    def inputs(self, batch: dict[str, Tensor]) -> Tensor:
        goes_on = bool(batch.get("goes_on", False))
        return network_input(batch["features"].to(self.device), self.mean, self.input_scale, self.context, goes_on)

    def standardise(self, mean: list[float], spread: list[float]) -> None:
        self.mean = torch.tensor(mean, device=self.device)
        self.input_scale = self.scale(torch.tensor(spread, device=self.device))


def add_options(parser: argparse.ArgumentParser, *, steps: int, batch: int, rate: float, seed: int) -> None:
    parser.add_argument("--store", type=Path, required=True, help="decoded audio (see corpus)")
    parser.add_argument("--run", type=Path, required=True, help="folder of checkpoints and log")
    parser.add_argument("--out", type=Path, help="weight file to write at the end")
    parser.add_argument("--start", type=Path, help="weight file to start from, grown to the shape asked for")
    parser.add_argument("--steps", type=int, default=steps)
    parser.add_argument("--core-minutes", type=float, help="end by processor time instead; with --workers 0 all of it")
    parser.add_argument("--batch", type=int, default=batch)
    parser.add_argument("--rate", type=float, default=rate)
    parser.add_argument("--seed", type=int, default=seed)
    parser.add_argument("--workers", type=int, default=1)


def keep_freed_memory() -> None:
    """Large tensors come and go at every step: what is freed stays with the process, or a fifth of it is page faults."""
    libc = ctypes.CDLL(None)
    if hasattr(libc, "mallopt"):
        m_mmap_max, m_trim_threshold = -4, -1
        libc.mallopt(m_mmap_max, 0)
        libc.mallopt(m_trim_threshold, 2**31 - 1)


def train(task: Task) -> None:
    torch.manual_seed(task.args.seed)
    if task.device.type == "cpu":
        torch.set_num_threads(1)
        keep_freed_memory()
    with together.together() as rank:
        run = train_as(task, rank)
    if task.args.out and rank == 0:
        weight = task.weight(run.best, np.array(run.extra["mean"]), np.array(run.extra["spread"]))
        mvw.write(task.args.out, half_precision(weight))


def train_as(task: Task, rank: int) -> Run:
    """The run of one process of those that train this network."""
    args = task.args
    # A resumed run must not hear the same mixtures again, nor two processes the same.
    seed = args.seed + 7919 * steps_done(args.run) + 104729 * rank
    batches = chain.from_iterable(map(task.prepared, task.batches(seed)))
    start = mvw.read(args.start) if args.start else None
    some = torch.cat([next(batches)["features"].flatten(0, 1) for _ in range(STATISTICS_BATCHES)])
    mean, spread = (together.from_the_first(v) for v in task.statistics(some))
    if start:
        mean, spread = task.start_statistics(start, (mean, spread))
    extra = {"mean": mean.tolist(), "spread": spread.tolist(), "layout": task.layout}
    task.standardise(**{key: extra[key] for key in ("mean", "spread")})
    run = Run(task.network(start).to(task.device), args.run, Schedule(args.steps, args.rate, args.core_minutes), extra)
    task.standardise(run.extra["mean"], run.extra["spread"])
    run.train(batches, task.loss, task.validate)
    return run

"""The training loop shared by all models: schedule, averaged weights, checkpoints, log.

The learning rate warms up, stays, and falls to nothing over the last part of the run; a run that
is resumed with another number of steps simply continues on the new schedule. The weights that are
exported are an exponential moving average of the trained ones, as it was when it did best on validation.
"""

from __future__ import annotations

import copy
import json
import math
import time
from dataclasses import asdict, dataclass
from pathlib import Path
from typing import Callable, Iterator

import torch
from torch import Tensor, nn
from tqdm import tqdm

from . import together
from .optimisers import make_optimiser

RUNAWAY = 3.0


@dataclass
class Schedule:
    steps: int
    peak: float = 1e-3
    core_minutes: float | None = None  # of processor time, instead of the steps
    warm_up: int = 50
    decay_share: float = 0.35
    average: float = 0.99  # of the moving average of the weights
    checkpoint_every: int = 50
    validate_every: int = 100

    def done(self, step: int, core_seconds: float) -> float:
        """The share of the run that is over."""
        if self.core_minutes:
            return core_seconds / (60.0 * self.core_minutes)
        return step / self.steps if step < self.steps else 1.0

    def rate(self, step: int, done: float) -> float:
        if step < self.warm_up:
            return self.peak * (step + 1) / self.warm_up
        left = (1.0 - done) / self.decay_share
        return self.peak * (0.5 - 0.5 * math.cos(math.pi * min(1.0, max(0.0, left))))


def steps_done(folder: Path) -> int:
    """How far the run in a folder has come."""
    checkpoint = folder / "checkpoint.pt"
    return torch.load(checkpoint, map_location="cpu", weights_only=False)["step"] if checkpoint.exists() else 0


class Run:
    """State of one training run in a folder: `checkpoint.pt`, `log.jsonl`, and `best.pt`, the network to use."""

    def __init__(self, network: nn.Module, folder: Path, schedule: Schedule, extra: dict | None = None) -> None:
        self.network = network
        self.folder = folder
        self.schedule = schedule
        self.extra = extra or {}
        self.step = 0
        self.seconds = 0.0
        self.core_seconds = 0.0
        folder.mkdir(parents=True, exist_ok=True)
        self.optimiser = make_optimiser(network, schedule.peak)
        self.averaged = copy.deepcopy(network)
        self.best = copy.deepcopy(network)
        self.best_loss = math.inf
        if self.checkpoint.exists():
            self._resume()

    @property
    def checkpoint(self) -> Path:
        return self.folder / "checkpoint.pt"

    def _resume(self) -> None:
        state = torch.load(self.checkpoint, map_location="cpu", weights_only=False)
        self.network.load_state_dict(state["network"])
        self.averaged.load_state_dict(state["averaged"])
        self.optimiser.load_state_dict(state["optimiser"])
        self.best.load_state_dict(state["best"])
        self.best_loss = state["best_loss"]
        self.step, self.seconds, self.core_seconds = state["step"], state["seconds"], state["core_seconds"]
        self.extra.update(state["extra"])

    def save(self) -> None:
        if together.rank() != 0:
            return
        state = {
            "network": self.network.state_dict(),
            "averaged": self.averaged.state_dict(),
            "optimiser": self.optimiser.state_dict(),
            "best": self.best.state_dict(),
            "best_loss": self.best_loss,
            "step": self.step,
            "seconds": self.seconds,
            "core_seconds": self.core_seconds,
            "extra": self.extra,
            "schedule": asdict(self.schedule),
        }
        for file, content in ((self.checkpoint, state), (self.folder / "best.pt", (self.best, self.extra))):
            partial = file.with_suffix(".partial")
            torch.save(content, partial)
            partial.rename(file)

    def log(self, entry: dict) -> None:
        if together.rank() != 0:
            return
        with (self.folder / "log.jsonl").open("a") as handle:
            handle.write(json.dumps({"step": self.step, "seconds": round(self.seconds), **entry}) + "\n")

    def _update_average(self) -> None:
        decay = min(self.schedule.average, (self.step + 1) / (self.step + 10))
        with torch.no_grad():
            for slow, fast in zip(self.averaged.parameters(), self.network.parameters()):
                slow.lerp_(fast, 1.0 - decay)

    def _back_to_average(self) -> None:
        self.network.load_state_dict(self.averaged.state_dict())
        self.optimiser.stop()

    def train(
        self,
        batches: Iterator[dict[str, Tensor]],
        loss_of: Callable[[nn.Module, dict[str, Tensor]], tuple[Tensor, dict[str, float]]],
        validate: Callable[[nn.Module], dict[str, float]] | None = None,
    ) -> None:
        """Runs until the schedule's last step.

        A loss that is not finite, or far above the usual, is counted and changes nothing, but that
        the network goes back to its averaged weights: a gated layer without normalisation can run
        away, and no step taken from there leads back.
        """
        parts_seen: dict[str, list[float]] = {}
        schedule = self.schedule
        ran_away = 0
        usual: float | None = None
        started, core_started = time.monotonic() - self.seconds, time.process_time() - self.core_seconds
        bar = tqdm(
            total=schedule.steps,
            initial=self.step,
            mininterval=10.0,
            desc=self.folder.name,
            disable=together.rank() != 0,
        )
        self._judge_again(validate)
        while (done := schedule.done(self.step, self.core_seconds)) < 1.0:
            for group in self.optimiser.param_groups:
                group["lr"] = schedule.rate(self.step, done)
            loss, parts = loss_of(self.network, next(batches))
            self.optimiser.zero_grad(set_to_none=True)
            value = loss.item()
            sound = math.isfinite(value) and (usual is None or value < usual + RUNAWAY * max(0.3, abs(usual)))
            if not together.any_of_us(not sound):
                usual = value if usual is None else 0.9 * usual + 0.1 * value
                loss.backward()
                together.average_gradients(self.network.parameters())
                norm = nn.utils.clip_grad_norm_(self.network.parameters(), 1.0)
                if torch.isfinite(norm):
                    self.optimiser.step()
                    self._update_average()
            else:
                parts = {}
                ran_away += 1
                self._back_to_average()
            self.step += 1
            self.seconds, self.core_seconds = time.monotonic() - started, time.process_time() - core_started
            last = schedule.done(self.step, self.core_seconds) >= 1.0
            for name, value in parts.items():
                parts_seen.setdefault(name, []).append(value)
            bar.update()
            if self.step % schedule.validate_every == 0 or last:
                self._validate(validate)
            if self.step % schedule.checkpoint_every == 0 or last:
                means = {name: round(sum(values) / len(values), 4) for name, values in parts_seen.items()}
                self.log({**means, **({"ran_away": ran_away} if ran_away else {})})
                parts_seen, ran_away = {}, 0
                self.save()
        bar.close()

    def _judge_again(self, validate: Callable[[nn.Module], dict[str, float]] | None) -> None:
        """What was kept may have been best by another loss."""
        if validate and together.rank() == 0:
            self.best_loss = validate(self.best)["loss"] if self.step else math.inf
            self._validate(validate)

    def _validate(self, validate: Callable[[nn.Module], dict[str, float]] | None) -> None:
        if together.rank() != 0:
            return
        figures = validate(self.averaged) if validate else {"loss": -math.inf}
        if validate:
            self.log({f"dev_{name}": round(value, 4) for name, value in figures.items()})
        if figures["loss"] <= self.best_loss:
            self.best_loss = figures["loss"]
            self.best.load_state_dict(self.averaged.state_dict())

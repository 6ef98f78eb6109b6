"""Trains a noise model (version 0.0.6, or 0.0.5 with --plain) and writes its weight file."""

from __future__ import annotations

import argparse
import functools
from collections.abc import Iterator
from dataclasses import replace

import numpy as np
import torch
from torch import Tensor, nn

from . import trainer
from .batches import Batch, MixtureBatches
from .convert import network_of, noise_weight
from .losses import LEVEL_WEIGHTS, LevelLoss, LossWeights, MaskLoss
from .mixing import RECIPES
from .mvw import Weight
from .networks import BandSharedNetwork, LayerNormGatedNetwork, Network, PlainGatedNetwork
from .pool import Pool
from .reshape import widened
from .scenes import SceneMaker
from .spectra import FULL_32K, SMALL_8K, SMALL_16K

LAYOUTS = {"32k": FULL_32K, "16k": SMALL_16K, "8k": SMALL_8K}
HIDDEN = {"32k": 304, "16k": 208, "8k": 160}
LEVEL_CHANGES = {
    "snr_db": (-8.0, 40.0),
    "hard_share": None,
    "noise_only_share": 0.15,
    "synthetic_share": 0.25,
    "early_only": False,
}
TERMS = tuple(vars(LossWeights()))


class NoiseTask(trainer.Task):
    skipped = 20

    def __init__(self, args: argparse.Namespace) -> None:
        super().__init__(args)
        layout = LAYOUTS[args.model]
        self.layout = replace(layout, compress=0) if args.band_shared else layout
        self.context = self.layout.preview
        self.recipe = replace(RECIPES[args.recipe], seconds=args.seconds, **(LEVEL_CHANGES if args.level else {}))
        asked = {term: getattr(args, term) for term in TERMS if getattr(args, term) is not None}
        weights = replace(LEVEL_WEIGHTS if args.level else LossWeights(), **asked)
        self.band_of_bin = torch.from_numpy(self.layout.band_of_bin()).to(self.device)
        self.criterion = (LevelLoss if args.level else MaskLoss)(self.layout, weights, self.device)

    def batches(self, seed: int) -> Iterator[dict[str, Tensor]]:
        args, recipe = self.args, replace(self.recipe, seconds=self.recipe.seconds * self.args.carry)
        if not args.on_device:
            return self.loaded(MixtureBatches(args.store, recipe, args.batch, seed, args.reuse))
        pool = Pool.of(args.store, recipe, seed, args.made_hours, args.workers, self.device)
        return SceneMaker(pool, recipe, seed, self.device).batches(args.batch)

    def prepared(self, batch: dict[str, Tensor]) -> Iterator[dict[str, Tensor]]:
        whole = Batch.of(batch, self.layout, self.device)
        yield from map(vars, whole.parts(self.args.carry, self.context - 1))

    def statistics(self, features: Tensor) -> tuple[Tensor, Tensor]:
        return features.mean(0), features.std(0).clamp_min(0.1)

    def network(self, start: Weight | None) -> Network:
        if start:
            network = network_of(start)
            return widened(network, self.args.hidden or network.hidden)
        if self.args.band_shared:
            return BandSharedNetwork(self.context, self.layout.bins)
        kind = PlainGatedNetwork if self.args.plain else LayerNormGatedNetwork
        features = self.layout.preview * self.layout.bands
        return kind(features, self.args.hidden or HIDDEN[self.args.model], self.layout.bands)

    def loss(self, model: nn.Module, batch: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]:
        gains = 2.0 * nn.functional.logsigmoid(self.outputs(model, batch))  # the engine squares the mask
        skipped = 0 if batch["lead"] else self.skipped
        return self.criterion(gains[..., self.band_of_bin], Batch(**batch), skipped)

    @functools.cached_property
    def dev(self) -> list[dict[str, Tensor]]:
        source = iter(MixtureBatches(self.args.store, self.recipe, 16, seed=77, split="dev"))
        return [vars(Batch.of(next(source), self.layout, self.device)) for _ in range(4)]

    def validate(self, model: nn.Module) -> dict[str, float]:
        state = self.state  # goes on afterwards
        with torch.no_grad():
            results = [self.loss(model, batch) for batch in self.dev]
        self.state = state
        parts = [{"loss": loss.item(), **terms} for loss, terms in results]
        return {name: float(np.mean([p[name] for p in parts])) for name in parts[0]}

    def weight(self, model: nn.Module, mean: np.ndarray, spread: np.ndarray) -> Weight:
        return noise_weight(model, self.layout, mean, spread, self.args.name)


def parse(arguments: list[str] | None = None) -> argparse.Namespace:
    parser = argparse.ArgumentParser(
        description=f"{__doc__}\n{trainer.__doc__}", formatter_class=argparse.RawDescriptionHelpFormatter
    )
    parser.add_argument("model", choices=LAYOUTS)
    trainer.add_options(parser, steps=6000, batch=32, rate=1.5e-3, seed=1)
    parser.add_argument("--name", default="noise", help='"ModelName" of the weight file')
    parser.add_argument("--plain", action="store_true", help="version 0.0.5 network")
    parser.add_argument("--band-shared", action="store_true", help="weights shared over bands; no weight file yet")
    parser.add_argument("--level", action="store_true", help="train for the level of the removed noise")
    parser.add_argument("--recipe", choices=RECIPES, default="plain", help="how mixtures are drawn")
    parser.add_argument("--hidden", type=int, help="units per layer; more than in --start doubles some")
    parser.add_argument("--seconds", type=float, default=3.0, help="length of a piece")
    parser.add_argument("--carry", type=int, default=1, help="consecutive pieces through which the state is carried")
    parser.add_argument("--on-device", action="store_true", help="mix where the network is, from a pool in its memory")
    parser.add_argument("--made-hours", type=float, default=1.0, help="with --on-device, of noise made by --workers")
    parser.add_argument("--reuse", type=int, default=4, help="mixtures made of one draw, unless --on-device")
    for term in TERMS:
        parser.add_argument(f"--{term.replace('_', '-')}", type=float, help="weight of this part of the loss")
    args = parser.parse_args(arguments)
    if args.band_shared and args.out:
        parser.error("no weight version holds a network that shares its weights over the bands")
    return args


def main(arguments: list[str] | None = None) -> None:
    trainer.train(NoiseTask(parse(arguments)))


if __name__ == "__main__":
    main()

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
from .convert import layout_of, network_of, noise_weight
from .losses import LEVEL_WEIGHTS, LevelLoss, LossWeights, MaskLoss, ThreeAnswersLoss
from .corpus import BASE_RATE
from .mixing import RECIPES, Recipe
from .mvw import Weight
from .networks import BandNetwork, LayerNormGatedNetwork, Network, PlainGatedNetwork, Shape, log_gains
from .pool import Pool
from .reshape import grown, widened
from .scenes import SceneMaker
from .spectra import BANDS_16K, BANDS_48K, FULL_32K, SMALL_8K, SMALL_16K, Layout

LAYOUTS = {"32k": FULL_32K, "16k": SMALL_16K, "8k": SMALL_8K}
BAND_LAYOUTS = {"48k": BANDS_48K, "16k": BANDS_16K}
HIDDEN = {"32k": 304, "16k": 208, "8k": 160}
LEVEL_CHANGES = {
    "snr_db": (-8.0, 40.0),
    "hard_share": None,
    "noise_only_share": 0.15,
    "synthetic_share": 0.25,
    "early_only": False,
}
FULL_BAND = {"band_limit_hz": (3400.0, 20000.0), "converter_share": 0.2}
TERMS = tuple(vars(LossWeights()))
SHAPES = ("channels", "across", "depth", "decoded", "kernels")


def band_layout(args: argparse.Namespace) -> Layout:
    """With as many narrow bands as asked for; the others have four times their width."""
    layout = replace(BAND_LAYOUTS[args.model], advance=not args.no_advance, taps=args.taps, ahead=args.ahead)
    if args.narrow is None:
        return layout
    rest = [w for w in layout.widths if w > 4]
    wider = (layout.bins - sum(rest) - args.narrow) // 4
    return replace(layout, widths=(1,) * args.narrow + (4,) * wider + tuple(rest))


class NoiseTask(trainer.Task):
    skipped = 20

    def __init__(self, args: argparse.Namespace) -> None:
        super().__init__(args)
        self.layout = band_layout(args) if args.band_shared else LAYOUTS[args.model]
        self.context = self.layout.preview
        self.recipe = replace(RECIPES[args.recipe], seconds=args.seconds, **(LEVEL_CHANGES if args.level else {}))
        if self.layout.rate > BASE_RATE:
            self.recipe = replace(self.recipe, **FULL_BAND)
        asked = {term: getattr(args, term) for term in TERMS if getattr(args, term) is not None}
        weights = replace(LEVEL_WEIGHTS if args.level else LossWeights(), **asked)
        self.band_of_bin = torch.from_numpy(self.layout.band_of_bin()).to(self.device)
        criterion = LevelLoss if args.level else ThreeAnswersLoss if args.band_shared else MaskLoss
        self.criterion = criterion(self.layout, weights, self.device)

    def batches(self, seed: int) -> Iterator[dict[str, Tensor]]:
        args, recipe = self.args, replace(self.recipe, seconds=self.recipe.seconds * self.args.carry)
        if not args.on_device:
            return self.loaded(self.mixtures(recipe, args.batch, seed, reuse=args.reuse))
        pool = Pool.of(args.store, recipe, seed, args.made_hours, args.workers, self.device)
        return SceneMaker(pool, recipe, seed, self.device).batches(args.batch)

    def mixtures(self, recipe: Recipe, size: int, seed: int, **options: int | str) -> MixtureBatches:
        options = {"voice": self.args.band_shared, "rate": self.layout.mixed_at, **options}
        return MixtureBatches(self.args.store, recipe, size, seed, **options)

    def prepared(self, batch: dict[str, Tensor]) -> Iterator[dict[str, Tensor]]:
        whole = Batch.of(batch, self.layout, self.device)
        yield from map(vars, whole.parts(self.args.carry, self.context - 1))

    def statistics(self, features: Tensor) -> tuple[Tensor, Tensor]:
        return features.mean(0), features.std(0).clamp_min(0.1)

    def start_statistics(self, start: Weight, fresh: tuple[Tensor, Tensor]) -> tuple[Tensor, Tensor]:
        known = layout_of(start)
        if known.bands == self.layout.bands:
            return super().start_statistics(start, fresh)
        each = [value.unflatten(0, (-1, self.layout.bands)).clone() for value in fresh]
        for value, key in zip(each, ("MU", "SD")):
            value[:, : known.bands] = torch.from_numpy(start[key]).unflatten(0, (-1, known.bands))
        return each[0].flatten(), each[1].flatten()

    def network(self, start: Weight | None) -> Network:
        if start:
            network = network_of(start)
            if isinstance(network, BandNetwork):
                return grown(network, replace(network.shape, **self.asked(), bands=self.layout.bands))
            return widened(network, self.args.hidden or network.hidden)
        if self.args.band_shared:
            per_band = self.layout.preview * self.layout.features // self.layout.bands
            return BandNetwork(Shape(self.layout.bands, per_band, **self.asked()))
        kind = PlainGatedNetwork if self.args.plain else LayerNormGatedNetwork
        features = self.layout.preview * self.layout.bands
        return kind(features, self.args.hidden or HIDDEN[self.args.model], self.layout.bands)

    def asked(self) -> dict[str, int]:
        """What of a shape is asked for."""
        given = {name: getattr(self.args, name) for name in SHAPES if getattr(self.args, name) is not None}
        return given | {"taps": self.layout.taps, "filtered": self.layout.filtered}

    def loss(self, model: nn.Module, batch: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]:
        logits, skipped = self.outputs(model, batch), 0 if batch["goes_on"] else self.skipped
        if not self.args.band_shared:
            logits = log_gains(model, logits)[..., self.band_of_bin]
        return self.criterion(logits, Batch(**batch), skipped)

    @functools.cached_property
    def dev(self) -> list[dict[str, Tensor]]:
        source = iter(self.mixtures(self.recipe, 16, 77, split="dev"))
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
    parser.add_argument("model", choices=LAYOUTS | BAND_LAYOUTS)
    trainer.add_options(parser, steps=6000, batch=32, rate=1.5e-3, seed=1)
    parser.add_argument("--name", default="noise", help='"ModelName" of the weight file')
    parser.add_argument("--plain", action="store_true", help="version 0.0.5 network")
    parser.add_argument("--band-shared", action="store_true", help="version NC_1.0.0 network")
    for name in SHAPES:
        parser.add_argument(f"--{name}", type=int, help="of such a network")
    parser.add_argument("--narrow", type=int, help="of its bands are single bins")
    parser.add_argument("--taps", type=int, default=0, help="frames that its filter of those bins spans")
    parser.add_argument("--ahead", type=int, default=0, help="frames that it sees beyond the one it answers for")
    parser.add_argument("--no-advance", action="store_true", help="it does not see how phases go on")
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
    if args.model not in (BAND_LAYOUTS if args.band_shared else LAYOUTS):
        parser.error(f"{args.model} is {'no' if args.band_shared else 'only a'} --band-shared model")
    if args.out and (args.taps or args.ahead or args.kernels):
        parser.error("the engine has no filter, look-ahead or mixed kernels: they are there to be compared")
    if args.on_device and RECIPES[args.recipe].far_share:
        parser.error("talkers in the background are mixed by --workers")
    if args.on_device and args.model == "48k":
        parser.error("a pool holds 32 kHz: 48k is mixed by --workers")
    return args


def main(arguments: list[str] | None = None) -> None:
    trainer.train(NoiseTask(parse(arguments)))


if __name__ == "__main__":
    main()

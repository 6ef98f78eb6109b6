"""Prints whether a network tires in long recordings: its loss in each stretch of validation recordings.

Each stretch is judged twice, by the network that has heard everything from the beginning and by one that began a few
seconds before the stretch; what the material does is the same for both.
"""

from __future__ import annotations

import argparse
import functools
from dataclasses import replace
from pathlib import Path

import numpy as np
import torch
from torch import Tensor

from . import mvw
from .batches import Batch, MixtureBatches
from .convert import layout_of, network_of
from .losses import LossWeights, MaskLoss
from .mixing import RECIPES
from .networks import Network, log_gains, network_input
from .spectra import Layout
from .trainer import keep_freed_memory

Losses = dict[str, float]


def judged(gains: Tensor, batch: Batch, layout: Layout, criterion: MaskLoss) -> Losses:
    loss, terms = criterion(gains[..., layout.band_of_bin()], batch)
    return {"loss": loss.item(), **terms}


@torch.no_grad()
def stretches(
    network: Network, layout: Layout, standard: tuple[Tensor, Tensor], batch: Batch, count: int, before: int
) -> list[tuple[Losses, Losses]]:
    """Of each of `count` parts: what the network makes of it that has heard everything, and one that began `before`
    frames before."""
    criterion = MaskLoss(layout, LossWeights(), batch.features.device)
    x = network_input(batch.features, *standard, layout.preview)
    run = functools.partial(_gains, network)
    whole, size, results = run(x), x.shape[1] // count, []
    for number, part in enumerate(batch.parts(count, 0)):
        first, last = number * size, (number + 1) * size
        start = max(0, first - before)
        fresh = run(x[:, start:last])[:, first - start :]
        results.append(tuple(judged(y, part, layout, criterion) for y in (whole[:, first:last], fresh)))
    return results


def _gains(network: Network, x: Tensor) -> Tensor:
    return log_gains(network, network(x, network.initial_state(len(x)))[0])


def network_from(source: Path) -> tuple[Network, Layout, tuple[Tensor, Tensor]]:
    """From a weight file or the folder of a run."""
    if source.is_dir():
        network, extra = torch.load(source / "best.pt", map_location="cpu", weights_only=False)
        return network, extra["layout"], (torch.tensor(extra["mean"]), torch.tensor(extra["spread"]))
    weight = mvw.read(source)
    return network_of(weight), layout_of(weight), tuple(torch.from_numpy(weight[key]) for key in ("MU", "SD"))


def main(arguments: list[str] | None = None) -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("network", type=Path, help="weight file, or folder of a run")
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--recipe", choices=RECIPES, default="plain")
    parser.add_argument("--seconds", type=float, default=60.0)
    parser.add_argument("--stretch", type=float, default=5.0)
    parser.add_argument("--before", type=float, default=3.0)
    parser.add_argument("--pieces", type=int, default=32)
    args = parser.parse_args(arguments)
    torch.set_num_threads(1)
    keep_freed_memory()
    network, layout, standard = network_from(args.network)
    count, hop = round(args.seconds / args.stretch), layout.hop / layout.rate
    recipe = replace(RECIPES[args.recipe], seconds=args.seconds)
    source = iter(MixtureBatches(args.store, recipe, 4, 1, 1, "dev", rate=layout.mixed_at))
    batches = (Batch.of(next(source), layout, torch.device("cpu")) for _ in range(-(-args.pieces // 4)))
    found = [stretches(network, layout, standard, b, count, round(args.before / hop)) for b in batches]
    print("seconds   whole: loss quality pause_db   fresh: loss quality pause_db")
    for number, stretch in enumerate(zip(*found)):
        columns = [
            [np.mean([pair[way][term] for pair in stretch]) for term in ("loss", "quality", "pause_db")]
            for way in (0, 1)
        ]
        print(f"{number * args.stretch:4.0f} to {(number + 1) * args.stretch:3.0f}", end="")
        for loss, quality, pause in columns:
            print(f"   {loss:9.3f} {quality:7.3f} {pause:8.2f}", end="")
        print()


if __name__ == "__main__":
    main()

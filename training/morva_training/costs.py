"""Prints what drawing the material costs: milliseconds of processor time per piece, by kind."""

from __future__ import annotations

import argparse
import time
from collections.abc import Callable
from dataclasses import replace
from pathlib import Path

from .corpus import BASE_RATE
from .mixing import RECIPES, MixtureMaker
from .synthesis import KINDS


def milliseconds(draw: Callable[[], object], times: int) -> float:
    draw()
    start = time.process_time()
    for _ in range(times):
        draw()
    return 1000 * (time.process_time() - start) / times


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--seconds", type=float, default=3.0, help="length of a piece")
    parser.add_argument("--times", type=int, default=40)
    args = parser.parse_args()
    makers = {
        name: MixtureMaker(args.store, 1, replace(recipe, seconds=args.seconds)) for name, recipe in RECIPES.items()
    }
    maker = makers["widened"]
    draws: dict[str, Callable[[], object]] = {
        kind.__name__: lambda kind=kind: kind(maker.rng, maker.count, BASE_RATE) for kind in KINDS
    }
    draws |= {"texture": maker.textured, "crowd": maker.babble, "recording": maker.recorded, "room": maker.one_room}
    for name, each in makers.items():
        draws |= {f"{name}: a noise": each.one_noise, f"{name}: a mixture": each.draw}
    for name, draw in draws.items():
        print(f"{name:20} {milliseconds(draw, args.times):6.2f} ms")


if __name__ == "__main__":
    main()

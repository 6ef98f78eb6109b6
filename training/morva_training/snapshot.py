"""Writes a weight file from the last checkpoint of a noise model's run, while it goes on."""

from __future__ import annotations

import argparse
from pathlib import Path

import numpy as np
import torch

from . import mvw
from .convert import half_precision, noise_weight
from .networks import LayerNormGatedNetwork, PlainGatedNetwork
from .train_noise import LAYOUTS


def network_of(state: dict[str, torch.Tensor]) -> LayerNormGatedNetwork | PlainGatedNetwork:
    """A network of the shape that a checkpoint's values have."""
    hidden, outputs = state["output"].shape
    features = state["update"].shape[0] - hidden
    layers = 1 + sum(name.startswith("linear.") for name in state)
    kind = LayerNormGatedNetwork if "reset" in state else PlainGatedNetwork
    network = kind(features, hidden, outputs, layers)
    network.load_state_dict(state)
    return network


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("model", choices=LAYOUTS)
    parser.add_argument("--run", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--name", default="noise")
    parser.add_argument("--raw", action="store_true", help="the trained weights instead of their average")
    args = parser.parse_args()
    state = torch.load(args.run / "checkpoint.pt", map_location="cpu")
    network = network_of(state["network" if args.raw else "averaged"])
    extra = state["extra"]
    mean, deviation = np.array(extra["mean"]), np.array(extra["deviation"])
    mvw.write(args.out, half_precision(noise_weight(network, LAYOUTS[args.model], mean, deviation, args.name)))
    print(f"step {state['step']} -> {args.out}")


if __name__ == "__main__":
    main()

"""Trains a noise model (version 0.0.6, or 0.0.5 with --plain) and writes its weight file.

Runs on a CPU or a GPU. A run that was stopped goes on from its last checkpoint when it is started
again with the same folder.
"""

from __future__ import annotations

import argparse
from dataclasses import replace
from pathlib import Path

import numpy as np
import torch
from torch import Tensor, nn
from torch.utils.data import DataLoader

from . import mvw
from .batches import Batch, MixtureBatches
from .convert import gated_network, half_precision, noise_weight, plain_network
from .loop import Run, Schedule, steps_done
from .losses import LevelLoss, LossWeights, MaskLoss
from .mixing import Recipe
from .networks import LayerNormGatedNetwork, PlainGatedNetwork
from .reshape import widened
from .spectra import FULL_32K, SMALL_16K, SMALL_8K, Layout

LAYOUTS = {"32k": FULL_32K, "16k": SMALL_16K, "8k": SMALL_8K}
HIDDEN = {"32k": 304, "16k": 208, "8k": 160}
LEVEL_RECIPE = Recipe(snr_db=(-8.0, 40.0), noise_only_share=0.15, synthetic_share=0.25)
SKIPPED_FRAMES = 20  # at the start of a piece, while the memory fills


def network_input(features: Tensor, mean: Tensor, deviation: Tensor, preview: int) -> Tensor:
    """Standardised features with their context, oldest first; before the start the engine has zeros."""
    padded = nn.functional.pad(features, (0, 0, preview - 1, 0))
    standard = (padded - mean) / deviation
    count = features.shape[1]
    return torch.cat([standard[:, i : i + count] for i in range(preview)], dim=-1)


def feature_statistics(batches, count: int) -> tuple[np.ndarray, np.ndarray]:
    """Mean and standard deviation per band over some batches."""
    features = torch.cat([next(batches)["features"].flatten(0, 1) for _ in range(count)])
    return features.mean(0).numpy(), features.std(0).clamp_min(0.1).numpy()


def fixed_batches(store: Path, layout: Layout, recipe: Recipe, count: int) -> list[Batch]:
    source = iter(MixtureBatches(store, layout, recipe, 16, seed=77, split="dev"))
    return [Batch(**next(source)) for _ in range(count)]


def start(args: argparse.Namespace, layout: Layout, batches) -> tuple[nn.Module, np.ndarray, np.ndarray]:
    """A network and its feature statistics: from a weight file, or fresh."""
    if args.start:
        weight = mvw.read(args.start)
        network = plain_network(weight) if args.plain else gated_network(weight)
        return widened(network, args.hidden or network.hidden), weight["MU"], weight["SD"]
    mean, deviation = feature_statistics(batches, 3)
    kind = PlainGatedNetwork if args.plain else LayerNormGatedNetwork
    hidden = args.hidden or HIDDEN[args.model]
    return kind(layout.preview * layout.bands, hidden, layout.bands), mean, deviation


def parse() -> argparse.Namespace:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("model", choices=LAYOUTS)
    parser.add_argument("--store", type=Path, required=True, help="decoded audio (see corpus)")
    parser.add_argument("--run", type=Path, required=True, help="folder of checkpoints and log")
    parser.add_argument("--out", type=Path, help="weight file to write at the end")
    parser.add_argument("--name", default="noise", help='"ModelName" of the weight file')
    parser.add_argument("--start", type=Path, help="weight file to start from")
    parser.add_argument("--plain", action="store_true", help="version 0.0.5 network")
    parser.add_argument("--level", action="store_true", help="train for the level of the removed noise")
    parser.add_argument("--hidden", type=int, help="units per layer; more than in --start doubles some")
    parser.add_argument("--steps", type=int, default=6000)
    parser.add_argument("--batch", type=int, default=32)
    parser.add_argument("--seconds", type=float, default=3.0, help="length of a piece")
    parser.add_argument("--reuse", type=int, default=4, help="mixtures made of one draw of speech and noise")
    parser.add_argument("--rate", type=float, default=1.5e-3)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--ratio", type=float, default=LossWeights.ratio)
    parser.add_argument("--loudness", type=float, default=LossWeights.loudness)
    parser.add_argument("--pause", type=float, default=LossWeights.pause)
    parser.add_argument("--lost-speech", type=float, default=LossWeights.lost_speech)
    parser.add_argument("--workers", type=int, default=1)
    return parser.parse_args()


def main() -> None:
    args = parse()
    layout = LAYOUTS[args.model]
    device = torch.device("cuda" if torch.cuda.is_available() else "cpu")
    torch.manual_seed(args.seed)
    if device.type == "cpu":
        torch.set_num_threads(1)
    recipe = replace(LEVEL_RECIPE if args.level else Recipe(), seconds=args.seconds)
    # A resumed run must not hear the same mixtures again: the seed moves with the step.
    done = steps_done(args.run)
    source = MixtureBatches(args.store, layout, recipe, args.batch, args.seed + 7919 * done, args.reuse)
    loader = iter(DataLoader(source, batch_size=None, num_workers=args.workers))
    network, mean, deviation = start(args, layout, loader)
    schedule = Schedule(args.steps, args.rate)
    run = Run(network.to(device), args.run, schedule, {"mean": mean.tolist(), "deviation": deviation.tolist()})
    mean_, deviation_ = (torch.tensor(run.extra[k], device=device) for k in ("mean", "deviation"))
    weights = LossWeights(ratio=args.ratio, loudness=args.loudness, pause=args.pause, lost_speech=args.lost_speech)
    loss = LevelLoss(layout, device) if args.level else MaskLoss(layout, weights, device)

    def loss_of(model: nn.Module, raw: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]:
        batch = Batch(**raw).to(device)
        x = network_input(batch.features, mean_, deviation_, layout.preview)
        logits, _ = model(x, model.initial_state(x.shape[0]))
        return loss(logits, batch, SKIPPED_FRAMES)

    dev = fixed_batches(args.store, layout, recipe, 4)

    def validate(model: nn.Module) -> dict[str, float]:
        with torch.no_grad():
            parts = [loss_of(model, vars(batch))[1] for batch in dev]
        return {name: float(np.mean([p[name] for p in parts])) for name in parts[0]}

    run.log({f"dev_{k}": round(v, 4) for k, v in validate(run.averaged).items()})
    run.train(loader, loss_of, validate)
    if args.out:
        weight = noise_weight(
            run.averaged, layout, np.array(run.extra["mean"]), np.array(run.extra["deviation"]), args.name
        )
        mvw.write(args.out, half_precision(weight))


if __name__ == "__main__":
    main()

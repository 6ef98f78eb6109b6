"""Trains and calibrates the voice-activity model (8 kHz) and writes its weight file.

The calibration uses the validation share of the training speakers, and noise alone for nearly half
of the time, as in a call where the others talk: the middle is the lowest logit with about the best
F1, low and high are the 10th and 90th percentile. Further out nothing is in doubt, and the scores of
what is keep their distance from one half.

While it learns, the network also says what share of each feature is speech: who finds the speech
under the noise knows where it is. The weight file keeps the voice's column only.
"""

from __future__ import annotations

import argparse
from dataclasses import replace
from pathlib import Path

import numpy as np
import torch
from torch import Tensor, nn
from torch.utils.data import DataLoader

from . import mvw, together
from .convert import half_precision, plain_network, plain_values, timestamp
from .loop import Run, Schedule, steps_done
from .mixing import Recipe
from .mvw import Weight
from .networks import PlainGatedNetwork
from .reshape import deepened, widened, with_outputs
from .scoring import best_f1, quick_threshold, roc_auc
from .voice import CONTEXT, DEV_RECIPE, FEATURES, FRAME, RATE, VOICE_RECIPE, VoiceBatches, network_input

SKIPPED_FRAMES = 5
F1_SLACK = 0.003
QUIET_SHARE = 0.45  # of the calibration's pieces, noise only
SPEECH_SHARE = 0.15  # of the loss, for the speech in each feature


def voice_weight(network: PlainGatedNetwork, mean: np.ndarray, variance: np.ndarray, points: list[float]) -> Weight:
    """A whole voice model; `points` are the logits for scores 0, one half and 1."""
    low, middle, high = (np.array([p], np.float32) for p in points)
    weight: Weight = {
        "Version": b"VAD_0.0.1",
        "ModelName": b"vad8",
        "TimeStamp": timestamp(),
        "SampleRate": RATE,
        "FrameLength": FRAME,
        "MU": mean.astype(np.float32),
        "SD": variance.astype(np.float32),
        "Test_MINMAX": np.concatenate([low, high]),
        "Test_BestF1": middle,
    }
    weight.update(plain_values(network))
    return weight


def parse() -> argparse.Namespace:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--run", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--start", type=Path, help="weight file to start from, grown to the shape asked for")
    parser.add_argument("--hidden", type=int, default=288)
    parser.add_argument("--layers", type=int, default=4, help="matrices, the output's included")
    parser.add_argument("--steps", type=int, default=2500)
    parser.add_argument("--batch", type=int, default=48)
    parser.add_argument("--rate", type=float, default=1.5e-3)
    parser.add_argument("--seed", type=int, default=3)
    parser.add_argument("--bfloat16", action="store_true", help="half as exact, twice as fast where the CPU can")
    parser.add_argument("--workers", type=int, default=1)
    return parser.parse_args()


def main() -> None:
    args = parse()
    device = torch.device("cuda" if torch.cuda.is_available() else "cpu")
    torch.manual_seed(args.seed)
    if device.type == "cpu":
        torch.set_num_threads(1)
    done = steps_done(args.run)
    source = VoiceBatches(args.store, args.batch, args.seed + 7919 * done + 104729 * together.join())
    loader = iter(DataLoader(source, batch_size=None, num_workers=args.workers))
    if args.start:
        weight = mvw.read(args.start)
        network, mean, variance = plain_network(weight), weight["MU"], weight["SD"]
        network = deepened(widened(network, args.hidden), args.layers)
    else:
        some = torch.cat([next(loader)["features"].flatten(0, 1) for _ in range(4)])
        mean = together.from_the_first(some.mean(0)).numpy()
        variance = together.from_the_first(some.var(0).clamp_min(1e-2)).numpy()
        network = PlainGatedNetwork(CONTEXT * FEATURES, args.hidden, 1, args.layers, linear_output=True)
    network = with_outputs(network, 1 + FEATURES)
    if args.bfloat16:
        network.products = torch.bfloat16
    schedule = Schedule(args.steps, args.rate)
    run = Run(network.to(device), args.run, schedule, {"mean": mean.tolist(), "variance": variance.tolist()})
    mean_, variance_ = (torch.tensor(run.extra[k], device=device) for k in ("mean", "variance"))

    def outputs_of(model: nn.Module, features: Tensor) -> Tensor:
        x = network_input(features.to(device), mean_, variance_)
        return model(x, model.initial_state(len(x)))[0][:, SKIPPED_FRAMES:]

    def loss_of(model: nn.Module, batch: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]:
        y = outputs_of(model, batch["features"])
        voice, weight, speech = (batch[k].to(device)[:, SKIPPED_FRAMES:] for k in ("voice", "weight", "speech"))
        loss = nn.functional.binary_cross_entropy_with_logits(y[..., 0], voice, weight)
        error = nn.functional.binary_cross_entropy_with_logits(y[..., 1:], speech)
        return loss + SPEECH_SHARE * error, {"loss": loss.item(), "speech": error.item()}

    def held_out(seed: int, recipe: Recipe) -> list[dict[str, Tensor]]:
        source = iter(VoiceBatches(args.store, 48, seed, split="dev", recipe=recipe, blocks=1))
        return [next(source) for _ in range(3)]

    def scored(model: nn.Module, batches: list[dict[str, Tensor]]) -> tuple[np.ndarray, np.ndarray]:
        with torch.no_grad():
            scores = torch.cat([outputs_of(model, b["features"])[..., 0].flatten().cpu() for b in batches])
        sure = torch.cat([b["weight"][:, SKIPPED_FRAMES:].flatten() for b in batches]) >= 1.0
        voice = torch.cat([b["voice"][:, SKIPPED_FRAMES:].flatten() for b in batches]) > 0.5
        return scores[sure].numpy(), voice[sure].numpy()

    dev = held_out(5, DEV_RECIPE)

    def validate(model: nn.Module) -> dict[str, float]:
        scores, voice = scored(model, dev)
        return {"auc": roc_auc(scores, voice), "f1": best_f1(scores, voice)[0]}

    run.train(loader, loss_of, validate)
    if together.rank() != 0:
        return
    run.averaged.products = torch.float32
    scores, voice = scored(run.averaged, held_out(6, replace(VOICE_RECIPE, noise_only_share=QUIET_SHARE)))
    low, high = np.percentile(scores, [10, 90])
    points = [float(low), quick_threshold(scores, voice, F1_SLACK), float(high)]
    mean, variance = np.array(run.extra["mean"]), np.array(run.extra["variance"])
    weight = voice_weight(with_outputs(run.averaged, 1), mean, variance, points)
    mvw.write(args.out, half_precision(weight))
    print("calibration", points, validate(run.averaged))


if __name__ == "__main__":
    main()

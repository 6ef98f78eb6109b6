"""Trains and calibrates the voice-activity model (8 kHz) and writes its weight file.

The calibration uses the validation share of the training speakers, and noise alone for nearly half
of the time, as in a call where the others talk: the middle is the lowest logit with about the best
F1 that no more than a tenth of the frames without voice pass, low and high are the 10th and 90th percentile. Further out nothing is in doubt, and the scores of
what is keep their distance from one half.

While it learns, the network also says what share of each feature is speech: who finds the speech
under the noise knows where it is. The weight file keeps the voice's column only. With `--teacher` the scores of a
larger network count as much as the labels.
"""

from __future__ import annotations

import argparse
import functools
from collections.abc import Callable, Iterator
from dataclasses import replace
from pathlib import Path

import numpy as np
import torch
from torch import Tensor, nn
from torch.nn.functional import binary_cross_entropy_with_logits

from . import mvw, trainer
from .convert import network_of, voice_weight
from .measures import best_f1, quick_threshold, roc_auc
from .mixing import Recipe
from .mvw import Weight
from .networks import Network, PlainGatedNetwork, network_input
from .reshape import deepened, narrowed, widened, with_outputs
from .voice import CONTEXT, DEV_RECIPE, FEATURES, VOICE_RECIPE, VoiceBatches

F1_SLACK = 0.003
QUIET_SHARE = 0.45  # of the calibration's pieces, noise only
MOST_FALSE = 0.1  # of the frames without voice
SPEECH_SHARE = 0.15  # of the loss, for the speech in each feature


class VoiceTask(trainer.Task):
    context, skipped = CONTEXT, 5

    @functools.cached_property
    def teacher(self) -> Callable[[Tensor], Tensor] | None:
        """Logits of features, from a weight file with its own statistics."""
        if not self.args.teacher:
            return None
        weight = mvw.read(self.args.teacher)
        network = network_of(weight).to(self.device)
        mean, spread = (torch.from_numpy(weight[key]).to(self.device) for key in ("MU", "SD"))

        def logits(features: Tensor) -> Tensor:
            x = network_input(features.to(self.device), mean, self.scale(spread), self.context)
            return network(x, network.initial_state(len(x)))[0][..., 0]

        return logits

    def batches(self, seed: int) -> Iterator[dict[str, Tensor]]:
        return self.loaded(VoiceBatches(self.args.store, self.args.batch, seed, reuse=self.args.reuse))

    def statistics(self, features: Tensor) -> tuple[Tensor, Tensor]:
        return features.mean(0), features.var(0).clamp_min(1e-2)

    def scale(self, spread: Tensor) -> Tensor:
        return torch.sqrt(spread + 1e-7)  # as the engine does it

    def network(self, start: Weight | None) -> Network:
        args = self.args
        if start:
            network = network_of(start)
            if args.hidden < network.hidden:
                network = narrowed(network, args.hidden, self.inputs(next(iter(self.batches(args.seed)))))
            network = deepened(widened(network, args.hidden), args.layers)
        else:
            network = PlainGatedNetwork(CONTEXT * FEATURES, args.hidden, 1, args.layers, linear_output=True)
        network = with_outputs(network, 1 + FEATURES)
        if args.bfloat16:
            network.products = torch.bfloat16
        return network

    def loss(self, model: nn.Module, batch: dict[str, Tensor]) -> tuple[Tensor, dict[str, float]]:
        y = self.outputs(model, batch)[:, self.skipped :]
        voice, weight, speech = (batch[k].to(self.device)[:, self.skipped :] for k in ("voice", "weight", "speech"))
        if self.teacher:
            with torch.no_grad():
                teaching = torch.sigmoid(self.teacher(batch["features"])[:, self.skipped :])
            voice = 0.5 * (voice + teaching)
        loss = binary_cross_entropy_with_logits(y[..., 0], voice, weight)
        error = binary_cross_entropy_with_logits(y[..., 1:], speech)
        return loss + SPEECH_SHARE * error, {"loss": loss.item(), "speech": error.item()}

    def kept_back(self, seed: int, recipe: Recipe) -> list[dict[str, Tensor]]:
        source = iter(VoiceBatches(self.args.store, 48, seed, split="dev", recipe=recipe, blocks=1))
        return [next(source) for _ in range(3)]

    def scored(self, model: nn.Module, batches: list[dict[str, Tensor]]) -> tuple[np.ndarray, np.ndarray]:
        def joined(key: str) -> Tensor:
            return torch.cat([b[key][:, self.skipped :].flatten() for b in batches])

        with torch.no_grad():
            logits = [self.outputs(model, b)[:, self.skipped :, 0].flatten().cpu() for b in batches]
        sure = joined("weight") >= 1.0
        return torch.cat(logits)[sure].numpy(), (joined("voice") > 0.5)[sure].numpy()

    @functools.cached_property
    def dev(self) -> list[dict[str, Tensor]]:
        return self.kept_back(5, DEV_RECIPE)

    def validate(self, model: nn.Module) -> dict[str, float]:
        scores, voice = self.scored(model, self.dev)
        area = roc_auc(scores, voice)
        return {"loss": 1.0 - area, "auc": area, "f1": best_f1(scores, voice)[0]}

    def weight(self, model: nn.Module, mean: np.ndarray, spread: np.ndarray) -> Weight:
        model.products = torch.float32
        calibration = self.kept_back(6, replace(VOICE_RECIPE, noise_only_share=QUIET_SHARE))
        scores, voice = self.scored(model, calibration)
        low, high = np.percentile(scores, [10, 90])
        middle = max(quick_threshold(scores, voice, F1_SLACK), np.quantile(scores[~voice], 1.0 - MOST_FALSE))
        points = [float(low), float(middle), float(high)]
        print("calibration", points, self.validate(model))
        return voice_weight(with_outputs(model, 1), mean, spread, points)


def parse(arguments: list[str] | None = None) -> argparse.Namespace:
    parser = argparse.ArgumentParser(
        description=f"{__doc__}\n{trainer.__doc__}", formatter_class=argparse.RawDescriptionHelpFormatter
    )
    trainer.add_options(parser, steps=2500, batch=48, rate=1.5e-3, seed=3)
    parser.add_argument("--hidden", type=int, default=288)
    parser.add_argument("--layers", type=int, default=4, help="matrices, the output's included")
    parser.add_argument("--teacher", type=Path, help="weight file of a larger network")
    parser.add_argument("--reuse", type=int, default=3, help="mixtures made of one draw of speech and noise")
    parser.add_argument(
        "--bfloat16", action="store_true", help="less exact and quicker where the CPU has such products"
    )
    return parser.parse_args(arguments)


def main(arguments: list[str] | None = None) -> None:
    trainer.train(VoiceTask(parse(arguments)))


if __name__ == "__main__":
    main()

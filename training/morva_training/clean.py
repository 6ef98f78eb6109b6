"""Cleans a recording with the network of a run, also of one that no weight file can hold yet.

    python -m morva_training.clean RUN IN OUT

RUN is the folder of a noise model's run. The result stands in the place of the input.
"""

from __future__ import annotations

import argparse
from pathlib import Path

import numpy as np
import soundfile
import torch
from torch import Tensor

from .corpus import read_audio
from .networks import Network, network_input
from .spectra import Layout, analyse, frames_of, level_gains, log_features, power_of, vorbis_window


@torch.no_grad()
def cleaned(samples: np.ndarray, network: Network, layout: Layout, mean: Tensor, spread: Tensor) -> np.ndarray:
    """What the engine would deliver, but for its delay; samples on the 16-bit scale, at the layout's rate."""
    heard = torch.from_numpy(np.pad(samples, (0, 2 * layout.hop)).astype(np.float32))
    spectra = analyse(heard, layout)
    gains = level_gains(frames_of(heard, layout.hop).square().mean(-1)[None], layout.active_frames)[0]
    features = log_features(power_of(spectra), gains, layout)
    x = network_input(features[None], mean, spread, layout.preview)
    mask = torch.sigmoid(network(x, network.initial_state(1))[0][0])
    spectra[:, : layout.bins] *= mask[:, layout.band_of_bin()].square()
    spectra[:, layout.bins] = 0
    frames = torch.fft.irfft(spectra) * vorbis_window(layout.frame)
    return (frames[:-1, layout.hop :] + frames[1:, : layout.hop]).flatten()[: len(samples)].numpy()


def main(arguments: list[str] | None = None) -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("run", type=Path)
    parser.add_argument("input", type=Path)
    parser.add_argument("output", type=Path)
    args = parser.parse_args(arguments)
    torch.set_num_threads(1)
    network, extra = torch.load(args.run / "best.pt", map_location="cpu", weights_only=False)
    layout: Layout = extra["layout"]
    samples = read_audio(args.input, layout.rate) * 32768.0
    result = cleaned(samples, network, layout, *(torch.tensor(extra[key]) for key in ("mean", "spread")))
    soundfile.write(args.output, result / 32768.0, layout.rate, "FLOAT")


if __name__ == "__main__":
    main()

"""Cleans recordings with the network of a run.

    python -m morva_training.clean RUN IN OUT

RUN is the folder of a noise model's run; IN and OUT are files or folders of them. The result stands in the place of
the input.
"""

from __future__ import annotations

import argparse
from pathlib import Path

import numpy as np
import soundfile
import torch
from torch import Tensor

from .corpus import read_audio
from .networks import Network, log_gains, network_input
from .spectra import Layout, analyse, features_of, frames_of, level_gains, vorbis_window


@torch.no_grad()
def cleaned(samples: np.ndarray, network: Network, layout: Layout, mean: Tensor, spread: Tensor) -> np.ndarray:
    """What the engine would deliver, but for its delay; samples on the 16-bit scale, at the layout's rate."""
    heard = torch.from_numpy(np.pad(samples, (0, 2 * layout.hop)).astype(np.float32))
    spectra = analyse(heard, layout)
    gains = level_gains(frames_of(heard, layout.hop).square().mean(-1)[None], layout.active_frames)[0]
    features = features_of(spectra, gains, layout)
    x = network_input(features[None], mean, spread, layout.preview)
    gains = log_gains(network, network(x, network.initial_state(1))[0])[0].exp()
    spectra[:, : layout.bins] *= gains[:, layout.band_of_bin()]
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
    files = sorted(args.input.iterdir()) if args.input.is_dir() else [args.input]
    if args.input.is_dir():
        args.output.mkdir(parents=True, exist_ok=True)
    for file in files:
        samples = read_audio(file, layout.rate) * 32768.0
        result = cleaned(samples, network, layout, *(torch.tensor(extra[key]) for key in ("mean", "spread")))
        target = args.output / file.name if args.input.is_dir() else args.output
        soundfile.write(target, result / 32768.0, layout.rate, "FLOAT")


if __name__ == "__main__":
    main()

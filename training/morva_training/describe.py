"""Prints what a model card says about weight files: shape, size and cost.

python -m morva_training.describe models/*.mvw
"""

from __future__ import annotations

import argparse
from pathlib import Path

import numpy as np

from . import mvw
from .convert import BAND_VERSION


def described(weight: mvw.Weight) -> dict[str, object]:
    if bytes(weight["Version"]) == BAND_VERSION:
        return described_bands(weight)
    voice = b"VAD" in bytes(weight["Version"])
    last = weight["WeightNonLinear"][-1]
    matrices = [m for key, value in weight.items() if key.startswith("Weight") for m in _matrices(value)]
    cost = sum(m.size for m in matrices) - (last.size if voice else 0)  # the voice model carries its last one twice
    frames = 100 if voice else weight["SampleRate"] / weight["Step"]  # a second; of a voice model: at 10 ms
    return {
        "version": bytes(weight["Version"]).decode(),
        "rate": weight["SampleRate"],
        "frame": weight["FrameLength"],
        "units": last.shape[0],
        "layers": len(weight["WeightNonLinear"]),
        "outputs": last.shape[1],
        "multiply-adds per frame": cost,
        "millions per second": round(cost * frames / 1e6, 1),
    }


def described_bands(weight: mvw.Weight) -> dict[str, object]:
    """All groups of bands run through the same matrices, but for those of the voice score."""
    groups, channels = weight["WeightPlace"].shape
    shared = [k for k in weight if k.startswith("Weight") and k not in ("WeightPlace", "WeightScore")]
    sizes = {key: sum(m.size for m in _matrices(weight[key])) for key in (*shared, "WeightScore")}
    cost = groups * sum(sizes[key] for key in shared) + sizes["WeightScore"]
    return {
        "version": BAND_VERSION.decode(),
        "rate": weight["SampleRate"],
        "frame": weight["FrameLength"],
        "bands": len(weight["BandWidths"]),
        "groups": groups,
        "channels": channels,
        "blocks": len(weight["WeightTimeIn"]),
        "multiply-adds per frame": cost,
        "millions per second": round(cost * weight["SampleRate"] / weight["Step"] / 1e6, 1),
    }


def _matrices(value: mvw.Value) -> list[np.ndarray]:
    return value if isinstance(value, list) else [value]


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("weights", type=Path, nargs="+")
    for path in parser.parse_args().weights:
        facts = {**described(mvw.read(path)), "megabytes": round(path.stat().st_size / 1e6, 1)}
        print(f"{path.name}: " + ", ".join(f"{name} {value}" for name, value in facts.items()))


if __name__ == "__main__":
    main()

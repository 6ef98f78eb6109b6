"""Between PyTorch networks and weight files.

A weight file holds matrices inputs-down like the modules do, so values are only named and copied.
The key spellings ("Baes...") belong to the file format.
"""

from __future__ import annotations

import datetime

import numpy as np
import torch
from torch import nn

from .mvw import Value, Weight
from .networks import LayerNormGatedNetwork, Network, PlainGatedNetwork
from .spectra import Layout

SINGLE = {
    "WeightGRU": "update",
    "BaesGRU": "update_bias",
    "WeightGRU_reset": "reset",
    "BiasGRU_reset": "reset_bias",
}
LISTS = {
    "WeightLinear": "linear",
    "BaesLinear": "linear_bias",
    "WeightNonLinear": "rectified",
    "BaesNonLinear": "rectified_bias",
    "GainLinearNorm": "linear_gain",
    "BiasLinearNorm": "linear_offset",
    "GainNonLinearNorm": "rectified_gain",
    "BiasNonLinearNorm": "rectified_offset",
}
# The output matrix stands last in the rectified branch; in a voice model, which ends in the linear one, in
# both, as the engine takes the state's width from the rectified branch.
OUTPUT = {"WeightNonLinear": "output", "BaesNonLinear": "output_bias"}
LINEAR_OUTPUT = {"WeightLinear": "output", "BaesLinear": "output_bias"}


def timestamp() -> bytes:
    """Ten digits, year to minute, as weight files carry it."""
    return datetime.datetime.now(datetime.timezone.utc).strftime("%y%m%d%H%M").encode()


def _named_values(network: Network) -> dict[str, nn.Parameter | list[nn.Parameter]]:
    """The network's values under the file's keys."""
    named: dict[str, nn.Parameter | list[nn.Parameter]] = {
        key: getattr(network, name) for key, name in SINGLE.items() if hasattr(network, name)
    }
    outputs = {**OUTPUT, **(LINEAR_OUTPUT if getattr(network, "linear_output", False) else {})}
    for key, name in LISTS.items():
        if hasattr(network, name):
            named[key] = [*getattr(network, name), *([getattr(network, outputs[key])] if key in outputs else [])]
    return named


def network_values(network: Network) -> Weight:
    def array(value: nn.Parameter) -> np.ndarray:
        return value.detach().cpu().numpy().astype(np.float32)

    return {k: [array(v) for v in x] if isinstance(x, list) else array(x) for k, x in _named_values(network).items()}


def network_of(weight: Weight) -> Network:
    """A module with the values of a weight of version 0.0.6 or 0.0.5, or of a voice model's."""
    version = bytes(weight["Version"])
    hidden, outputs = weight["WeightNonLinear"][-1].shape
    features, layers = weight["WeightGRU"].shape[0] - hidden, len(weight["WeightNonLinear"])
    if version == b"0.0.6":
        network: Network = LayerNormGatedNetwork(features, hidden, outputs, layers)
    else:
        network = PlainGatedNetwork(features, hidden, outputs, layers, linear_output=b"VAD" in version)
    with torch.no_grad():
        for key, target in _named_values(network).items():
            targets, values = (target, weight[key]) if isinstance(target, list) else ([target], [weight[key]])
            for one, value in zip(targets, values):
                one.copy_(torch.from_numpy(np.ascontiguousarray(value)))
    return network


def layout_of(weight: Weight) -> Layout:
    suffix = "_v" + bytes(weight["Version"]).decode().replace(".", "_")
    return Layout(
        rate=int(weight["SampleRate"]),
        frame=int(weight["FrameLength"]),
        compress=int(weight.get(f"CONTROL_MORVA_COMPRESS_RATE{suffix}", 2)),
        preview=int(weight["PreviewFrames"]),
        first_bin=int(weight["FiltrBegin"]),
    )


def noise_weight(network: Network, layout: Layout, mean: np.ndarray, deviation: np.ndarray, name: str) -> Weight:
    """A whole noise model, ready to be written."""
    version = "0.0.6" if isinstance(network, LayerNormGatedNetwork) else "0.0.5"
    return {
        "Version": version.encode(),
        "ModelName": name.encode(),
        "TimeStamp": timestamp(),
        "SampleRate": layout.rate,
        "Step": layout.hop,
        "FiltrBegin": layout.first_bin,
        "FiltrEnd": layout.first_bin + layout.bins,
        "FrameLength": layout.frame,
        "PreviewFrames": layout.preview,
        "CoefficientNumber": layout.frame // 2 + 1,
        "CONTROL_MORVA_COMPRESS_RATE_v" + version.replace(".", "_"): layout.compress,
        "MU": mean.astype(np.float32),
        "SD": deviation.astype(np.float32),
        **network_values(network),
    }


def voice_weight(network: PlainGatedNetwork, mean: np.ndarray, variance: np.ndarray, points: list[float]) -> Weight:
    """A whole voice model; `points` are the logits for scores 0, one half and 1."""
    low, middle, high = points
    return {
        "Version": b"VAD_0.0.1",
        "ModelName": b"vad8",
        "TimeStamp": timestamp(),
        "SampleRate": 8000,
        "FrameLength": 240,
        "MU": mean.astype(np.float32),
        "SD": variance.astype(np.float32),
        "Test_MINMAX": np.array([low, high], np.float32),
        "Test_BestF1": np.array([middle], np.float32),
        **network_values(network),
    }


def half_precision(weight: Weight) -> Weight:
    """The model with every matrix rounded to values that half precision holds: the engine stores half the bytes."""

    def rounded(value: Value) -> Value:
        if isinstance(value, list):
            return [rounded(v) for v in value]
        return value.astype(np.float16).astype(np.float32)

    return {key: rounded(value) if key.startswith("Weight") else value for key, value in weight.items()}

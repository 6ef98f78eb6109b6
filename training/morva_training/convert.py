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
from .networks import BandNetwork, LayerNormGatedNetwork, Network, PlainGatedNetwork, Shape
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

BAND_VERSION = b"NC_1.0.0"


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


def _band_values(network: BandNetwork) -> dict[str, list[tuple[nn.Parameter, bool]]]:
    """Its values under the file's keys, and whether the file turns them; keys in plural hold lists."""
    named: dict[str, list[tuple[nn.Parameter, bool]]] = {"WeightPlace": [(network.place, False)]}

    def linear(name: str, *layers: nn.Linear) -> None:
        named[f"Weight{name}"] = [(layer.weight, True) for layer in layers]
        named[f"Bias{name}"] = [(layer.bias, False) for layer in layers]

    def norm(name: str, *layers: nn.LayerNorm) -> None:
        named[f"Gain{name}Norm"] = [(layer.weight, False) for layer in layers]
        named[f"Bias{name}Norm"] = [(layer.bias, False) for layer in layers]

    def recurrent(name: str, *layers: nn.GRU) -> None:
        ways = [(layer, end) for layer in layers for end in ("", "_reverse")[: 1 + layer.bidirectional]]
        for side, kind in (("In", "ih"), ("State", "hh")):
            named[f"Weight{name}{side}"] = [(getattr(layer, f"weight_{kind}_l0{end}"), True) for layer, end in ways]
            named[f"Bias{name}{side}"] = [(getattr(layer, f"bias_{kind}_l0{end}"), False) for layer, end in ways]

    linear("Gather", network.gather)
    linear("Spread", network.spread)
    linear("Output", network.output)
    linear("Score", *network.score)
    norm("", network.norm)
    norm("Time", *(block.norm_time for block in network.blocks))
    recurrent("Time", *(block.time for block in network.blocks))
    if network.shape.across:
        norm("Groups", *(block.norm_groups for block in network.blocks))
        recurrent("Groups", *(block.groups for block in network.blocks))
        linear("GroupsOut", *(block.mixed for block in network.blocks))
    return named


BAND_LISTS = ("Time", "Groups", "Score")


def band_network_of(weight: Weight) -> BandNetwork:
    bands, channels = len(weight["BandWidths"]), weight["WeightGather"].shape[1]
    across = weight["WeightGroupsState"][0].shape[0] if "WeightGroupsState" in weight else 0
    shape = Shape(
        bands=bands,
        features=len(weight["MU"]) // bands,
        group=int(weight["GroupBands"]),
        reach=int(weight["GroupReach"]),
        channels=channels,
        across=across,
        depth=len(weight["WeightTimeState"]),
        decoded=weight["WeightSpread"].shape[1],
        scored=weight["WeightScore"][0].shape[1],
    )
    network = BandNetwork(shape)
    with torch.no_grad():
        for key, targets in _band_values(network).items():
            values = weight[key] if isinstance(weight[key], list) else [weight[key]]
            for (target, turned), value in zip(targets, values):
                target.copy_(torch.from_numpy(np.ascontiguousarray(value.T if turned else value)))
    return network


def band_weight(network: BandNetwork, layout: Layout, mean: np.ndarray, deviation: np.ndarray, name: str) -> Weight:
    """A whole model of version NC_1.0.0, ready to be written."""

    def array(value: nn.Parameter, turned: bool) -> np.ndarray:
        values = value.detach().cpu().numpy().astype(np.float32)
        return np.ascontiguousarray(values.T if turned else values)

    values: Weight = {}
    for key, entries in _band_values(network).items():
        arrays = [array(*entry) for entry in entries]
        values[key] = arrays if any(part in key for part in BAND_LISTS) else arrays[0]
    return {
        "Version": BAND_VERSION,
        "ModelName": name.encode(),
        "TimeStamp": timestamp(),
        "SampleRate": layout.rate,
        "Step": layout.hop,
        "FrameLength": layout.frame,
        "BandWidths": layout.band_widths().astype(np.float32),
        "GroupBands": network.shape.group,
        "GroupReach": network.shape.reach,
        "MU": mean.astype(np.float32),
        "SD": deviation.astype(np.float32),
        **values,
    }


def network_of(weight: Weight) -> Network:
    """A module with the values of a weight of version NC_1.0.0, 0.0.6 or 0.0.5, or of a voice model's."""
    version = bytes(weight["Version"])
    if version == BAND_VERSION:
        return band_network_of(weight)
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
    if bytes(weight["Version"]) == BAND_VERSION:
        return Layout(
            rate=int(weight["SampleRate"]),
            frame=int(weight["FrameLength"]),
            preview=1,
            widths=tuple(int(w) for w in weight["BandWidths"]),
            advance=len(weight["MU"]) > len(weight["BandWidths"]),
        )
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
    if isinstance(network, BandNetwork):
        return band_weight(network, layout, mean, deviation, name)
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

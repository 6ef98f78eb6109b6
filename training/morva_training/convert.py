"""Between PyTorch networks and weight files.

A weight file holds matrices inputs-down like the modules do, so values are only named and copied.
The key spellings ("Baes...") belong to the file format.
"""

from __future__ import annotations

import datetime

import numpy as np
import torch
from torch import Tensor, nn

from .mvw import Value, Weight
from .networks import LayerNormGatedNetwork, PlainGatedNetwork
from .spectra import Layout


def _array(value: Tensor) -> np.ndarray:
    return value.detach().cpu().numpy().astype(np.float32)


def _arrays(values) -> list[np.ndarray]:
    return [_array(v) for v in values]


def timestamp() -> bytes:
    """Ten digits, year to minute, as weight files carry it."""
    return datetime.datetime.now(datetime.timezone.utc).strftime("%y%m%d%H%M").encode()


def noise_header(version: str, name: str, layout: Layout, controls: dict[str, Value]) -> Weight:
    suffix = "_v" + version.replace(".", "_")
    header: Weight = {
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
    }
    for key, value in {"COMPRESS_RATE": layout.compress, **controls}.items():
        header[f"CONTROL_MORVA_{key}{suffix}"] = value
    return header


def layout_of(weight: Weight) -> Layout:
    suffix = "_v" + bytes(weight["Version"]).decode().replace(".", "_")
    return Layout(
        rate=int(weight["SampleRate"]),
        frame=int(weight["FrameLength"]),
        compress=int(weight.get(f"CONTROL_MORVA_COMPRESS_RATE{suffix}", 2)),
        preview=int(weight["PreviewFrames"]),
        first_bin=int(weight["FiltrBegin"]),
    )


def gated_values(network: LayerNormGatedNetwork) -> Weight:
    return {
        "WeightGRU": _array(network.update),
        "BaesGRU": _array(network.update_bias),
        "WeightGRU_reset": _array(network.reset),
        "BiasGRU_reset": _array(network.reset_bias),
        "WeightLinear": _arrays(network.linear),
        "BaesLinear": _arrays(network.linear_bias),
        "WeightNonLinear": _arrays(network.rectified) + [_array(network.output)],
        "BaesNonLinear": _arrays(network.rectified_bias) + [_array(network.output_bias)],
        "GainLinearNorm": _arrays(network.linear_gain),
        "BiasLinearNorm": _arrays(network.linear_offset),
        "GainNonLinearNorm": _arrays(network.rectified_gain),
        "BiasNonLinearNorm": _arrays(network.rectified_offset),
    }


def plain_values(network: PlainGatedNetwork) -> Weight:
    """The voice-activity network ends in its linear branch, the noise network in its rectified one.

    The engine takes the state's width from the last "WeightNonLinear" matrix, so the voice model
    carries its output matrix there, too.
    """
    linear, linear_bias = _arrays(network.linear), _arrays(network.linear_bias)
    if network.linear_output:
        linear.append(_array(network.output))
        linear_bias.append(_array(network.output_bias))
    return {
        "WeightGRU": _array(network.update),
        "BaesGRU": _array(network.update_bias),
        "WeightLinear": linear,
        "BaesLinear": linear_bias,
        "WeightNonLinear": _arrays(network.rectified) + [_array(network.output)],
        "BaesNonLinear": _arrays(network.rectified_bias) + [_array(network.output_bias)],
    }


def _assign(target: nn.Parameter, value: np.ndarray) -> None:
    with torch.no_grad():
        target.copy_(torch.from_numpy(np.ascontiguousarray(value)))


def _assign_all(targets, values) -> None:
    for target, value in zip(targets, values):
        _assign(target, value)


def gated_network(weight: Weight) -> LayerNormGatedNetwork:
    """A module with the values of a version 0.0.6 weight."""
    last = weight["WeightNonLinear"][-1]
    features = weight["WeightGRU"].shape[0] - last.shape[0]
    network = LayerNormGatedNetwork(features, last.shape[0], last.shape[1], len(weight["WeightNonLinear"]))
    _assign(network.update, weight["WeightGRU"])
    _assign(network.update_bias, weight["BaesGRU"])
    _assign(network.reset, weight["WeightGRU_reset"])
    _assign(network.reset_bias, weight["BiasGRU_reset"])
    _assign_all(network.linear, weight["WeightLinear"])
    _assign_all(network.linear_bias, weight["BaesLinear"])
    _assign_all(network.rectified, weight["WeightNonLinear"][:-1])
    _assign_all(network.rectified_bias, weight["BaesNonLinear"][:-1])
    _assign_all(network.linear_gain, weight["GainLinearNorm"])
    _assign_all(network.linear_offset, weight["BiasLinearNorm"])
    _assign_all(network.rectified_gain, weight["GainNonLinearNorm"])
    _assign_all(network.rectified_offset, weight["BiasNonLinearNorm"])
    _assign(network.output, last)
    _assign(network.output_bias, weight["BaesNonLinear"][-1])
    return network


def plain_network(weight: Weight) -> PlainGatedNetwork:
    """A module with the values of a version 0.0.5 or voice-activity weight."""
    voice = b"VAD" in bytes(weight["Version"])
    matrices = weight["WeightLinear"] if voice else weight["WeightNonLinear"]
    biases = weight["BaesLinear"] if voice else weight["BaesNonLinear"]
    last = matrices[-1]
    features = weight["WeightGRU"].shape[0] - last.shape[0]
    network = PlainGatedNetwork(features, last.shape[0], last.shape[1], len(matrices), linear_output=voice)
    _assign(network.update, weight["WeightGRU"])
    _assign(network.update_bias, weight["BaesGRU"])
    _assign_all(network.linear, weight["WeightLinear"])
    _assign_all(network.linear_bias, weight["BaesLinear"])
    _assign_all(network.rectified, weight["WeightNonLinear"])
    _assign_all(network.rectified_bias, weight["BaesNonLinear"])
    _assign(network.output, last)
    _assign(network.output_bias, biases[-1])
    return network


def noise_weight(
    network: LayerNormGatedNetwork | PlainGatedNetwork,
    layout: Layout,
    mean: np.ndarray,
    deviation: np.ndarray,
    name: str,
    controls: dict[str, Value] | None = None,
) -> Weight:
    """A whole noise model, ready to be written."""
    gated = isinstance(network, LayerNormGatedNetwork)
    weight = noise_header("0.0.6" if gated else "0.0.5", name, layout, controls or {})
    weight["MU"] = mean.astype(np.float32)
    weight["SD"] = deviation.astype(np.float32)
    weight.update(gated_values(network) if gated else plain_values(network))
    return weight


def half_precision(weight: Weight) -> Weight:
    """The model with every matrix rounded to values that half precision holds.

    The engine then stores and reads half the bytes; the result differs by about -90 dB.
    """

    def rounded(value: Value) -> Value:
        if isinstance(value, list):
            return [rounded(v) for v in value]
        return value.astype(np.float16).astype(np.float32)

    return {key: rounded(value) if key.startswith("Weight") else value for key, value in weight.items()}

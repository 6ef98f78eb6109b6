"""Small weight files for the tests: networks whose answer is known without running them."""

import struct

import numpy as np


def _vector(values):
    return struct.pack("<I", len(values)) + np.asarray(values, "<f4").tobytes()


def _matrix(values):
    return struct.pack("<Ii", *values.shape) + np.ascontiguousarray(values, "<f4").tobytes()


def encode(values: dict) -> bytes:
    """A run of records; ints, floats, strings, 1-D and 2-D arrays, and lists of arrays ([] holds vectors)."""
    data = b""
    for name, value in values.items():
        many = isinstance(value, list)
        if isinstance(value, str):
            code, body = 2, struct.pack("<I", len(value.encode())) + value.encode()
        elif isinstance(value, int):
            code, body = 1, struct.pack("<i", value)
        elif isinstance(value, float):
            code, body = 0, struct.pack("<f", value)
        elif many and any(item.ndim == 2 for item in value):
            code, body = 6, struct.pack("<I", len(value)) + b"".join(map(_matrix, value))
        elif many:
            code, body = 5, struct.pack("<I", len(value)) + b"".join(map(_vector, value))
        else:
            code, body = (3, _vector(value)) if value.ndim == 1 else (4, _matrix(value))
        data += struct.pack("<I", len(name)) + name.encode() + struct.pack("<i", code) + body
    return data


def constant_mask(rate: int, frame_ms: int = 20, mask: float = 1.0, version: str = "0.0.6") -> dict:
    """A noise-cancellation model whose mask is `mask` (0 or 1) in every bin, whatever it hears."""
    length = rate * frame_ms // 1000
    bins, hidden = length // 2 + 1, 2
    key = "v" + version.replace(".", "_")
    values = {
        "Version": version,
        "SampleRate": rate,
        "FrameLength": length,
        "Step": length // 2,
        "ModelName": f"constant {mask:g}",
        "TimeStamp": f"{rate}-{frame_ms}-{mask:g}",
        "FiltrBegin": 0,
        "FiltrEnd": bins,
        "PreviewFrames": 1,
        "CoefficientNumber": bins,
        f"CONTROL_MORVA_COMPRESS_RATE_{key}": 0,
        "MU": np.zeros(bins),
        "SD": np.ones(bins),
        "WeightGRU": np.zeros((hidden + bins, hidden)),
        "BaesGRU": np.zeros(hidden),
        "WeightLinear": [np.zeros((hidden + bins, hidden))],
        "BaesLinear": [np.zeros(hidden)],
        "WeightNonLinear": [np.zeros((hidden + bins, hidden)), np.zeros((hidden, bins))],
        "BaesNonLinear": [np.zeros(hidden), np.full(bins, 100.0 if mask else -100.0)],
    }
    if version == "0.0.6":
        values |= {
            "WeightGRU_reset": np.zeros((hidden + bins, hidden)),
            "BiasGRU_reset": np.zeros(hidden),
            "GainLinearNorm": [np.ones(hidden)],
            "BiasLinearNorm": [np.zeros(hidden)],
            "GainNonLinearNorm": [np.ones(hidden)],
            "BiasNonLinearNorm": [np.zeros(hidden)],
        }
    return values


def loudness_voice() -> dict:
    """A voice-activity model that scores how loud the newest frame is against silence."""
    features, context, hidden = 61, 5, 1
    weights = np.zeros((hidden + context * features, 1))
    weights[-features:, 0] = 1 / features  # mean log energy of the newest frame's bands
    return {
        "Version": "VAD_0.0.1",
        "SampleRate": 8000,
        "FrameLength": 240,
        "ModelName": "loudness",
        "TimeStamp": "1",
        "MU": np.zeros(features),
        "SD": np.ones(features),
        "WeightGRU": np.zeros((hidden + context * features, hidden)),
        "BaesGRU": np.zeros(hidden),
        "WeightLinear": [weights],
        "BaesLinear": [np.zeros(1)],
        "WeightNonLinear": [np.zeros((hidden, 1))],
        "BaesNonLinear": [np.zeros(1)],
        "Test_MINMAX": np.array([0.0, 12.0]),
        "Test_BestF1": np.array([6.0]),
    }

"""Small models for the tests: networks whose answer is known without running them."""

import numpy as np


def constant_mask(rate: int = 16000, frame_ms: int = 20, mask: float = 1.0, version: str = "0.0.6") -> dict:
    """A noise-cancellation model whose mask is `mask` (0 or 1) in every bin, whatever it hears."""
    length = rate * frame_ms // 1000
    bins, hidden = length // 2 + 1, 2
    values = {
        "Version": version.encode(),
        "SampleRate": rate,
        "FrameLength": length,
        "Step": length // 2,
        "ModelName": b"constant",
        "TimeStamp": b"%d-%d-%d" % (rate, frame_ms, mask),
        "FiltrBegin": 0,
        "FiltrEnd": bins,
        "PreviewFrames": 1,
        "CoefficientNumber": bins,
        f"CONTROL_MORVA_COMPRESS_RATE_v{version.replace('.', '_')}": 0,
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
        values |= {"WeightGRU_reset": np.zeros((hidden + bins, hidden)), "BiasGRU_reset": np.zeros(hidden)}
        for layer in ("Linear", "NonLinear"):
            values |= {f"Gain{layer}Norm": [np.ones(hidden)], f"Bias{layer}Norm": [np.zeros(hidden)]}
    return values


def noise_level(mask: float = 0.0, frame_ms: int = 20) -> dict:
    """A noise-level model that takes all it hears for noise, or nothing."""
    return constant_mask(16000, frame_ms, mask, "0.0.5")


def loudness_voice(calibrated: bool = True) -> dict:
    """A voice-activity model that scores how loud the newest frame is against silence."""
    features, context, hidden = 61, 5, 1
    weights = np.zeros((hidden + context * features, 1))
    weights[-features:, 0] = 1 / features  # mean log energy of the newest frame's bands
    values = {
        "Version": b"VAD_0.0.1",
        "SampleRate": 8000,
        "FrameLength": 240,
        "ModelName": b"loudness",
        "TimeStamp": b"1",
        "MU": np.zeros(features),
        "SD": np.ones(features),
        "WeightGRU": np.zeros((hidden + context * features, hidden)),
        "BaesGRU": np.zeros(hidden),
        "WeightLinear": [weights],
        "BaesLinear": [np.zeros(1)],
        "WeightNonLinear": [np.zeros((hidden, 1))],
        "BaesNonLinear": [np.zeros(1)],
    }
    calibration = {"Test_MINMAX": np.array([0.0, 12.0]), "Test_BestF1": np.array([6.0])}
    return values | calibration if calibrated else values

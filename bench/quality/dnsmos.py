"""Ratings by a network, without a reference."""

from __future__ import annotations

from pathlib import Path

import numpy as np
from metrics import at_rate

RATE = 16000


class Dnsmos:
    """The three ratings of ITU-T P.835 (signal, background, overall) as Microsoft's DNSMOS network gives them.

    Reddy, Gopal, Cutler, "DNSMOS P.835", ICASSP 2022. The network (sig_bak_ovr.onnx) is not part of this project:
    its file is named by the caller. It hears 9.01 s at 16 kHz; shorter recordings are repeated, longer ones are heard
    in pieces one second apart.
    """

    SECONDS = 9.01
    # From the network's values to ratings: polynomials published with it, highest power first.
    CURVES = (
        (-0.08397278, 1.22083953, 0.0052439),
        (-0.13166888, 1.60915514, -0.39604546),
        (-0.06766283, 1.11546468, 0.04602535),
    )

    def __init__(self, network: Path) -> None:
        import onnxruntime

        options = onnxruntime.SessionOptions()
        options.intra_op_num_threads = options.inter_op_num_threads = 1
        self.session = onnxruntime.InferenceSession(str(network), options, providers=["CPUExecutionProvider"])
        self.input = self.session.get_inputs()[0].name

    def __call__(self, samples: np.ndarray, rate: int) -> tuple[float, float, float]:
        heard = at_rate(samples, rate, RATE).astype(np.float32)
        length = int(self.SECONDS * RATE)
        heard = np.tile(heard, -(-length // max(1, len(heard)))) if len(heard) < length else heard
        ratings = []
        for start in range(0, len(heard) - length + 1, RATE):
            raw = self.session.run(None, {self.input: heard[None, start : start + length]})[0][0]
            ratings.append([np.polyval(curve, value) for curve, value in zip(self.CURVES, raw)])
        signal, background, overall = np.mean(ratings, axis=0)
        return float(signal), float(background), float(overall)

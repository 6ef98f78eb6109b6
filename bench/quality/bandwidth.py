"""Which model the rates go through, and where the sound ends that comes out: noise through the engine at no attenuation.

    python bench/quality/bandwidth.py

Prints the table of docs/quality.md.
"""

from __future__ import annotations

import json

import numpy as np
import tree
from scipy.signal import welch

import morva

DEPTHS_DB = (3, 20, 60)


def edges(rate: int) -> list[float]:
    """The highest frequencies, in Hz, that are lowered by less than each of DEPTHS_DB."""
    noise = (0.05 * np.random.default_rng(1).standard_normal(6 * rate)).astype(np.float32)
    through = morva.denoise(noise, rate, attenuation_limit_db=0)
    pitches, before = welch(noise[rate:], rate, nperseg=4096)
    _, after = welch(through[rate:], rate, nperseg=4096)
    lowered = 10 * np.log10(before / (after + 1e-20))
    return [pitches[lowered < depth].max() for depth in DEPTHS_DB]


def main() -> None:
    shipped = [m for m in json.loads((tree.ROOT / "models/shipped.json").read_text()) if m["kind"] == "NC"]
    print("| rate | model | " + " | ".join(f"-{depth} dB" for depth in DEPTHS_DB) + " |\n|---|---|---|---|---|")
    for rate in (8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000):
        model = next(m["file"] for m in shipped if rate <= m["maxSampleRate"])
        print(f"| {rate} Hz | {model} | " + " | ".join(f"{edge / 1000:.1f} kHz" for edge in edges(rate)) + " |")


if __name__ == "__main__":
    main()

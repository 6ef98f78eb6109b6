"""Spectrograms of several sounds above each other, for demo and documents."""

from __future__ import annotations

import io
from pathlib import Path

import matplotlib
import numpy as np
from scipy.signal import spectrogram

matplotlib.use("Agg")
import matplotlib.pyplot as plt  # noqa: E402
from PIL import Image  # noqa: E402

LOWEST_DB, HIGHEST_DB = -100, -30  # re a full-scale sine
TICKS_HZ = (250, 500, 1000, 2000, 4000, 8000, 16000)


def mel(hertz: np.ndarray) -> np.ndarray:
    return 2595 * np.log10(1 + np.maximum(hertz, 0) / 700)


def hertz(mels: np.ndarray) -> np.ndarray:
    return 700 * (10 ** (mels / 2595) - 1)


def draw(path: Path, sounds: dict[str, np.ndarray], rate: int, size: tuple[float, float], title: str = "") -> None:
    """One panel a sound, on one scale of time, frequency (mel) and level; `size` in inches, 100 dots each."""
    figure, axes = plt.subplots(len(sounds), 1, figsize=size, sharex=True, layout="constrained")
    for axis, (name, sound) in zip(axes, sounds.items(), strict=True):
        pitches, times, power = spectrogram(sound, rate, "hann", 1024, 768, scaling="spectrum", mode="psd")
        levels = 10 * np.log10(2 * power + 1e-12)  # a sine's power is half its square
        image = axis.pcolormesh(
            times, pitches, levels, cmap="inferno", vmin=LOWEST_DB, vmax=HIGHEST_DB, rasterized=True, shading="nearest"
        )
        axis.set_yscale("function", functions=(mel, hertz))
        shown = [tick for tick in TICKS_HZ if tick <= rate / 2]
        axis.set_yticks(shown, [f"{tick / 1000:g}" for tick in shown], minor=False)
        axis.set(ylabel="kHz", ylim=(0, rate / 2))
        axis.set_title(name, loc="left")
    if title:
        figure.suptitle(title, fontsize=9)
    axes[-1].set_xlabel("seconds")
    figure.colorbar(image, ax=axes, label="dB re full scale", shrink=0.8)
    buffer = io.BytesIO()
    figure.savefig(buffer, dpi=100)
    plt.close(figure)
    Image.open(buffer).convert("RGB").quantize(64).save(path, optimize=True)

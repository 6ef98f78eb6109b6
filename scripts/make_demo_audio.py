#!/usr/bin/python3
"""Makes the bundled recording: examples/audio/clean.flac and noisy.flac (48000 Hz, 10 s).

Two of flite's voices speak (Debian: flite, python3-numpy, python3-scipy, python3-soundfile); everything
else is synthesised here from a fixed seed: a fan with its motor hum, a car passing outside, typing.

    scripts/make_demo_audio.py [FOLDER]
"""

import pathlib
import subprocess
import sys
import tempfile

import numpy as np
import soundfile
from scipy import signal

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[1] / "training"))

from morva_training.measures import active_level  # noqa: E402

RATE = 48000
SECONDS = 10
SNR_DB = 7.6  # active level of the speech over that of the noise
LINES = [  # start in seconds, voice, text
    (0.9, "slt", "The train leaves from platform four, at half past nine."),
    (5.4, "rms", "Thank you. Please keep a seat free for me, next to the window."),
]


def speech() -> np.ndarray:
    track = np.zeros(RATE * SECONDS)
    with tempfile.TemporaryDirectory() as folder:
        for start, voice, text in LINES:
            wav = pathlib.Path(folder) / "line.wav"
            subprocess.run(["flite", "-voice", voice, "-t", text, "-o", str(wav)], check=True)
            line, rate = soundfile.read(wav)
            line = signal.resample_poly(line, RATE, rate)
            line *= 0.45 / np.abs(line).max()
            at = int(start * RATE)
            track[at : at + len(line)] += line[: len(track) - at]
    return track


def band(rng: np.random.Generator, low: float, high: float) -> np.ndarray:
    """Noise of unit power between two frequencies."""
    sos = signal.butter(2, [low, high], "bandpass", fs=RATE, output="sos")
    noise = signal.sosfilt(sos, rng.standard_normal(RATE * SECONDS))
    return noise / noise.std()


def fan(rng: np.random.Generator) -> np.ndarray:
    time = np.arange(RATE * SECONDS) / RATE
    hum = sum(np.sin(2 * np.pi * 118 * k * time + rng.uniform(0, 6.28)) / k for k in range(1, 9))
    air = band(rng, 100, 1500) + 0.6 * band(rng, 900, 6000) + 0.15 * band(rng, 5000, 20000)
    return 0.2 * hum + air * (1 + 0.1 * np.sin(2 * np.pi * 0.7 * time))


def car(rng: np.random.Generator) -> np.ndarray:
    time = np.arange(RATE * SECONDS) / RATE
    near = np.exp(-(((time - 4.8) / 1.1) ** 2))
    return near * (1.0 * band(rng, 60, 400) + 0.8 * band(rng, 300, 3000))


def typing(rng: np.random.Generator) -> np.ndarray:
    track = np.zeros(RATE * SECONDS)
    for start, end in [(0.2, 1.6), (4.4, 5.3), (8.6, 9.8)]:
        at = start
        while at < end:
            length = int(RATE * rng.uniform(0.012, 0.03))
            click = rng.standard_normal(length) * np.exp(-np.arange(length) / (RATE * 0.004))
            low, high = rng.uniform(900, 1800), rng.uniform(5000, 9000)
            click = signal.sosfilt(signal.butter(1, [low, high], "bandpass", fs=RATE, output="sos"), click)
            first = int(at * RATE)
            track[first : first + length] += 5 * rng.uniform(0.5, 1) * click[: len(track) - first]
            at += rng.uniform(0.09, 0.22)
    return track


def main() -> None:
    folder = pathlib.Path(sys.argv[1] if len(sys.argv) > 1 else pathlib.Path(__file__).parents[1] / "examples/audio")
    folder.mkdir(parents=True, exist_ok=True)
    rng = np.random.default_rng(20260101)
    clean = speech()
    noise = fan(rng) + car(rng) + typing(rng)
    noise *= active_level(clean, RATE) / active_level(noise, RATE) * 10 ** (-SNR_DB / 20)
    for name, sound in [("clean", clean), ("noisy", clean + noise)]:
        assert np.abs(sound).max() < 1, "the mixture would clip"
        soundfile.write(folder / f"{name}.flac", sound, RATE, subtype="PCM_16")
        print(folder / f"{name}.flac")


if __name__ == "__main__":
    main()

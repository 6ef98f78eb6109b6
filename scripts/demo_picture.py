#!/usr/bin/python3
"""Says how much noise a cleaned recording lost and draws it before and after.

    scripts/demo_picture.py NOISY CLEAN CLEANED SCORES PICTURE

CLEAN is the speech in NOISY without its noise; the three files are mono, of one rate and length. SCORES is what
`morva vad NOISY --format csv` says; the pauses are taken from it, as everywhere where no clean speech is known.
"""

import sys
from pathlib import Path

import matplotlib

matplotlib.use("Agg")
import matplotlib.pyplot as plt
import numpy as np
import soundfile
from PIL import Image

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "training"))

from morva_training.measures import noise_in_pauses, pauses_of_scores, si_sdr  # noqa: E402


def draw(sounds: dict[str, np.ndarray], rate: int, path: str) -> None:
    figure, axes = plt.subplots(len(sounds), 1, figsize=(10, 6), sharex=True, layout="constrained")
    floor = 1e-8 * np.random.default_rng(1).standard_normal(max(map(len, sounds.values())))  # no log of 0
    for axis, (title, sound) in zip(axes, sounds.items(), strict=True):
        _, _, _, image = axis.specgram(
            sound + floor[: len(sound)], NFFT=1024, noverlap=768, Fs=rate, cmap="inferno", vmin=-130, vmax=-45
        )
        axis.set(title=title, ylabel="kHz", ylim=(0, 12000))
        axis.yaxis.set_major_formatter(lambda hz, _: f"{hz / 1000:g}")
    axes[-1].set_xlabel("seconds")
    figure.colorbar(image, ax=axes, label="dB per hertz re full scale", shrink=0.8)
    figure.savefig(path, dpi=100)
    Image.open(path).quantize(128).save(path, optimize=True)  # a third of the size


def main() -> None:
    noisy_path, clean_path, cleaned_path, scores, picture = sys.argv[1:]
    noisy, rate = soundfile.read(noisy_path)
    clean, _ = soundfile.read(clean_path)
    cleaned, _ = soundfile.read(cleaned_path)
    pauses = pauses_of_scores(np.loadtxt(scores, delimiter=",", skiprows=1, usecols=1))
    before, after = noise_in_pauses(noisy, cleaned, pauses, rate)
    print(f"noise in pauses   {before:6.1f} dBFS -> {after:6.1f} dBFS   ({before - after:.0f} dB quieter)")
    before, after = si_sdr(clean, noisy), si_sdr(clean, cleaned)
    print(f"SI-SDR            {before:6.1f} dB   -> {after:6.1f} dB     ({after - before:+.1f} dB)")
    draw({"Before": noisy, "After": cleaned, "The speech without noise, for comparison": clean}, rate, picture)


if __name__ == "__main__":
    main()

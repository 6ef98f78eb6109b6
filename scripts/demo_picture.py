#!/usr/bin/python3
"""Says how much noise a cleaned recording lost and draws it before and after.

    scripts/demo_picture.py NOISY CLEAN CLEANED SCORES PICTURE

CLEAN is the speech in NOISY without its noise; the three files are mono, of one rate and length. SCORES is what
`morva vad NOISY --format csv` says; the pauses are taken from it, as everywhere where no clean speech is known.
"""

import sys
from pathlib import Path

import numpy as np
import soundfile

ROOT = Path(__file__).resolve().parents[1]
sys.path[:0] = [str(ROOT / "training"), str(ROOT / "bench/quality")]

import pictures  # noqa: E402
from morva_training.measures import noise_in_pauses, pauses_of_scores, si_sdr  # noqa: E402


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
    sounds = {"Before": noisy, "After": cleaned, "The speech without noise, for comparison": clean}
    pictures.draw(Path(picture), sounds, rate, (10, 7))


if __name__ == "__main__":
    main()

"""Error in dB of the noise-level model for steady noises, alone and under speech.

    python bench/quality/noise_level.py --store STORE models/noise_level_16k.mvw

Steady noises are white, pink and brown noise and the held-out recordings whose level (in blocks of
100 ms) deviates by less than 1 dB and spans less than 6 dB; each is scaled to several true levels.
The value compared is the median of the reported levels after two seconds (16-bit scale, dB).
"""

from __future__ import annotations

import argparse
from collections import Counter
from pathlib import Path

import numpy as np

import tree  # noqa: F401
from morva_training.corpus import Clip, Corpus
from morva_training.measures import active_level

import morva

RATE = 16000
SECONDS = 6
LEVELS_DB = (20.0, 35.0, 50.0, 62.0)  # mean power on the 16-bit scale
SPEECH_DB = 62.0


def coloured(rng: np.random.Generator, slope: float) -> np.ndarray:
    spectrum = np.fft.rfft(rng.standard_normal(SECONDS * RATE))
    frequency = np.maximum(np.fft.rfftfreq(SECONDS * RATE, 1 / RATE), 50.0)
    return np.fft.irfft(spectrum * (frequency / 1000.0) ** slope)


def steady_noises(corpus: Corpus, split: str) -> dict[str, np.ndarray]:
    rng = np.random.default_rng(1)
    noises = {"white": coloured(rng, 0.0), "pink": coloured(rng, -0.5), "brown": coloured(rng, -1.0)}
    for clip in corpus.clips("noise", split):
        samples = corpus.read(clip)
        if len(samples) < 3 * RATE:
            continue
        blocks = samples[: len(samples) // 1600 * 1600].reshape(-1, 1600)
        levels = 10 * np.log10(np.square(blocks).mean(1) + 1e-3)
        if levels.min() > 10 and levels.std() < 1.0 and np.ptp(levels) < 6:
            noises[Path(clip.path).stem] = np.tile(samples, 1 + SECONDS * RATE // len(samples))[: SECONDS * RATE]
    return noises


def reported(weight: Path, samples: np.ndarray) -> float:
    levels = morva.noise_level(samples / 32768, RATE, model=str(weight.resolve()))
    return float(np.median(levels[200:]))


def talkers(corpus: Corpus, split: str, count: int) -> list[np.ndarray]:
    """Six seconds each of the speakers with the most to say."""
    lengths = Counter()
    for clip in corpus.clips("speech", split):
        lengths[clip.group] += clip.length
    chosen = [group for group, _ in lengths.most_common(count)]
    speech = {group: [c for c in corpus.clips("speech", split) if c.group == group] for group in chosen}
    return [six_seconds(corpus, clips) for clips in speech.values()]


def six_seconds(corpus: Corpus, clips: list[Clip]) -> np.ndarray:
    speech = np.concatenate([corpus.read(c) for c in sorted(clips, key=lambda clip: -clip.length)[:20]])
    speech = np.tile(speech, 1 + SECONDS * RATE // len(speech))[: SECONDS * RATE]
    return speech * (10 ** (SPEECH_DB / 20) / active_level(speech, RATE))


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("weight", type=Path)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--split", default="heldout")
    parser.add_argument("--talkers", type=int, default=6)
    args = parser.parse_args()
    corpus = Corpus(args.store, RATE)
    voices = talkers(corpus, args.split, args.talkers)
    errors: dict[str, list[float]] = {}
    print("| noise | error alone, dB | error under speech (SNR 27, 12, 0 dB), dB |\n|---|---|---|")
    for name, noise in steady_noises(corpus, args.split).items():
        unit = noise / np.sqrt(np.mean(np.square(noise)))
        row: dict[str, list[float]] = {"alone": [], "spoken": []}
        for db in LEVELS_DB:
            alone = unit * 10 ** (db / 20)
            row["alone"].append(reported(args.weight, np.clip(alone, -32768, 32767)) - db)
            if db >= 35:
                heard = [np.clip(alone + voice, -32768, 32767) for voice in voices]
                spoken = [reported(args.weight, each) - db for each in heard]
                row["spoken"].append(float(np.mean(spoken)))
                errors.setdefault(f"under speech, SNR {SPEECH_DB - db:.0f} dB", []).extend(spoken)
        errors.setdefault("alone", []).extend(row["alone"])
        print(f"| {name} | " + " | ".join(", ".join(f"{e:+.1f}" for e in part) for part in row.values()) + " |")
    print("\n| | mean absolute error | within 2 dB |\n|---|---|---|")
    for title, values in sorted(errors.items()):
        absolute = np.abs(values)
        print(f"| {title} | {absolute.mean():.2f} dB | {np.mean(absolute <= 2):.0%} |")


if __name__ == "__main__":
    main()

"""Makes the held-out test material: pairs of noisy and clean recordings with what is in them.

Speakers and noise recordings are those of the manifest's held-out split; the draw is seeded and
does not depend on any model. Every pair is a 32 kHz, 16-bit WAV of about eight seconds with one
second of noise before the first word and pauses between the sentences, so that pauses can be
scored. `clean-*` pairs hold speech only (noisy = clean).

    python bench/quality/mixtures.py --store STORE --out FOLDER
"""

from __future__ import annotations

import argparse
import json
from pathlib import Path

import numpy as np
import soundfile

import tree  # noqa: F401
from morva_training.corpus import BASE_RATE, Clip, Corpus
from morva_training.measures import active_level

SNRS_DB = (-5, 0, 5, 10, 15)
SECONDS = 8.0
BABBLERS = 6


def talkers(corpus: Corpus, split: str) -> dict[str, list[Clip]]:
    """Speakers with more than two seconds of speech."""
    voices = corpus.groups("speech", split)
    return {name: clips for name, clips in voices.items() if sum(c.length for c in clips) > 2 * BASE_RATE}


def scaled(samples: np.ndarray, level: float) -> np.ndarray:
    return samples * level / (active_level(samples, BASE_RATE) + 1e-3)


def sentences(rng: np.random.Generator, corpus: Corpus, clips: list[Clip]) -> np.ndarray:
    """One speaker's recordings with pauses; the recordings' own edges are kept."""
    out = np.zeros(int(SECONDS * BASE_RATE), np.float32)
    position = BASE_RATE
    while position < len(out) - BASE_RATE:
        clip = clips[rng.integers(len(clips))]
        longest = min(len(out) - position, 4 * BASE_RATE)
        piece = corpus.read(clip, 0, longest)
        fade = min(len(piece), BASE_RATE // 50)
        piece[-fade:] *= np.linspace(1, 0, fade, dtype=np.float32)
        out[position : position + len(piece)] = piece
        position += len(piece) + int(rng.uniform(0.6, 1.2) * BASE_RATE)
    return out


def noise_of(rng: np.random.Generator, corpus: Corpus, clips: list[Clip]) -> np.ndarray:
    """One recording, repeated to the full length."""
    clip = clips[rng.integers(len(clips))]
    samples = corpus.read(clip)
    count = int(SECONDS * BASE_RATE)
    return np.tile(samples, -(-count // len(samples)))[:count]


def babble_of(rng: np.random.Generator, corpus: Corpus, voices: dict[str, list[Clip]]) -> np.ndarray:
    total = np.zeros(int(SECONDS * BASE_RATE), np.float32)
    for name in rng.choice(sorted(voices), BABBLERS, replace=False):
        samples = np.concatenate([corpus.read(c) for c in voices[name]])
        samples = np.tile(samples, -(-len(total) // len(samples)))[: len(total)]
        total += scaled(samples, 1.0)
    return total


def make(store: Path, out: Path, count: int, clean_count: int, seed: int, split: str) -> None:
    rng = np.random.default_rng(seed)
    corpus = Corpus(store)
    voices, noises = talkers(corpus, split), corpus.groups("noise", split)
    names, kinds = sorted(voices), sorted(noises) + ["babble"]
    listing = []
    for folder in ("noisy", "clean"):
        (out / folder).mkdir(parents=True, exist_ok=True)
    for number in range(count + clean_count):
        clean_only = number >= count
        speaker = names[number * 7 % len(names)] if number < len(names) else str(rng.choice(names))
        voice = sentences(rng, corpus, voices[speaker])
        kind = "" if clean_only else kinds[number % len(kinds)]
        snr = None if clean_only else SNRS_DB[(number // len(kinds) + number) % len(SNRS_DB)]
        level = 32768 * 10 ** (rng.uniform(-30, -18) / 20)
        voice = scaled(voice, level)
        mixed = voice.copy()
        if not clean_only:
            disturbance = (
                babble_of(rng, corpus, {k: v for k, v in voices.items() if k != speaker})
                if kind == "babble"
                else noise_of(rng, corpus, noises[kind])
            )
            mixed += scaled(disturbance, level * 10 ** (-snr / 20))
        peak = np.abs(mixed).max()
        scale = min(1.0, 32000.0 / peak)
        stem = f"clean-{number - count:03d}" if clean_only else f"{kind}-{number:03d}"
        for folder, samples in (("noisy", mixed), ("clean", voice)):
            data = np.rint(samples * scale).astype(np.int16)
            soundfile.write(out / folder / f"{stem}.wav", data, BASE_RATE, "PCM_16")
        listing.append({"name": stem, "noise": kind, "snr_db": snr, "speaker": speaker, "clean_only": clean_only})
    (out / "pairs.json").write_text(json.dumps(listing, indent=1))


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--count", type=int, default=250)
    parser.add_argument("--clean", type=int, default=30)
    parser.add_argument("--seed", type=int, default=2026)
    parser.add_argument("--split", default="heldout", choices=("heldout", "dev"))
    args = parser.parse_args()
    make(args.store, args.out, args.count, args.clean, args.seed, args.split)


if __name__ == "__main__":
    main()

"""Makes test material: pairs of noisy and clean recordings with what is in them.

    python bench/quality/mixtures.py --store STORE --out FOLDER --split unseen

The split is "unseen" (whole collections that nothing is trained on, in a store of their own), "heldout" (speakers and
noise recordings that are held out of the training material) or "dev" (what training choices may look at). The draw is
seeded and does not depend on any model. Every pair is two 16-bit WAVs at the store's rate, with one second of noise
before the first word and pauses between the sentences, so that pauses can be scored.

A share of the talkers stands in rooms, and so does the noise, elsewhere in such a room. The clean recording then keeps
the direct sound and the reflections of the first 50 ms, which make a voice louder and fuller; what comes later is no
part of it, so that a system may lower it. `clean-*` pairs hold speech only (noisy = clean), `faint-*` pairs speech with
the noise of a quiet room 50 dB below it. `pairs.json` says of each pair what it holds.
"""

from __future__ import annotations

import argparse
import json
from dataclasses import asdict, dataclass
from pathlib import Path

import numpy as np
import soundfile
from scipy.signal import fftconvolve

import tree  # noqa: F401
from morva_training.corpus import UNSEEN, Clip, Corpus
from morva_training.measures import active_level
from morva_training.rooms import EARLY_SECONDS

SNRS_DB = (-5, 0, 5, 10, 15, 20)
FAINT_DB = 50
LEVELS_DB = (-36.0, -16.0)  # of the talker, below full scale
BABBLERS = 6
WORD = 1.5  # recordings shorter than so many seconds are words, and follow each other closely


@dataclass(frozen=True)
class Pair:
    """What a pair of recordings holds."""

    name: str
    speaker: str
    band: str
    noise: str = ""  # category; "" for none
    snr_db: float | None = None
    place: str = "dry"  # or "room"
    faint: bool = False


def talkers(corpus: Corpus, split: str) -> dict[str, list[Clip]]:
    """Speakers with more than two seconds of speech."""
    voices = corpus.groups("speech", split)
    return {name: clips for name, clips in voices.items() if sum(c.length for c in clips) > 2 * corpus.rate}


def scaled(samples: np.ndarray, level: float, rate: int) -> np.ndarray:
    return samples * level / (active_level(samples, rate) + 1e-3)


class Draw:
    """Voices, noises and rooms of one split, drawn at random."""

    def __init__(self, corpus: Corpus, split: str, seconds: float, seed: int) -> None:
        self.rng = np.random.default_rng(seed)
        self.corpus, self.rate, self.count = corpus, corpus.rate, int(seconds * corpus.rate)
        self.voices, self.noises = talkers(corpus, split), corpus.groups("noise", split)
        self.rooms = corpus.rooms(split)

    def sentences(self, clips: list[Clip]) -> np.ndarray:
        """One speaker's recordings with pauses; the recordings' own edges are kept."""
        out = np.zeros(self.count, np.float32)
        position = self.rate
        while position < len(out) - self.rate:
            clip = clips[self.rng.integers(len(clips))]
            longest = min(len(out) - position, 4 * self.rate)
            piece = self.corpus.read(clip, 0, longest)
            fade = min(len(piece), self.rate // 50)
            piece[-fade:] *= np.linspace(1, 0, fade, dtype=np.float32)
            out[position : position + len(piece)] = piece
            word = len(piece) < WORD * self.rate and self.rng.random() < 0.7
            position += len(piece) + int(self.rng.uniform(*((0.02, 0.2) if word else (0.6, 1.2))) * self.rate)
        return out

    def noise(self, kind: str, speaker: str) -> np.ndarray:
        if kind == "babble":
            return self.babble({name: clips for name, clips in self.voices.items() if name != speaker})
        clips = self.noises[kind]
        clip = clips[self.rng.integers(len(clips))]
        offset = int(self.rng.integers(max(1, clip.length - self.count)))
        return self.repeated(self.corpus.read(clip, offset, self.count))

    def babble(self, voices: dict[str, list[Clip]]) -> np.ndarray:
        total = np.zeros(self.count, np.float32)
        for name in self.rng.choice(sorted(voices), BABBLERS, replace=False):
            samples = np.concatenate([self.corpus.read(c) for c in voices[name]])
            total += scaled(self.repeated(samples), 1.0, self.rate)
        return total

    def repeated(self, samples: np.ndarray) -> np.ndarray:
        return np.tile(samples, -(-self.count // len(samples)))[: self.count]

    def in_room(self, samples: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
        """With the whole room, and with its early reflections only."""
        room = self.rooms[self.rng.integers(len(self.rooms))]
        early = room[: np.argmax(np.abs(room)) + int(EARLY_SECONDS * self.rate)]
        return tuple(fftconvolve(samples, r)[: self.count].astype(np.float32) for r in (room, early))

    def hiss(self) -> np.ndarray:
        """A quiet room: pink noise."""
        spectrum = np.fft.rfft(self.rng.standard_normal(self.count))
        hertz = np.maximum(np.fft.rfftfreq(self.count, 1 / self.rate), 50.0)
        return np.fft.irfft(spectrum / np.sqrt(hertz), self.count).astype(np.float32)

    def pair(self, pair: Pair) -> tuple[np.ndarray, np.ndarray]:
        """Noisy and clean samples."""
        voice = self.sentences(self.voices[pair.speaker])
        heard = voice
        disturbance = self.noise(pair.noise, pair.speaker) if pair.noise else self.hiss()
        if pair.place == "room":
            heard, voice = self.in_room(voice)
            disturbance = self.in_room(disturbance)[0]
        level = 32768 * 10 ** (self.rng.uniform(*LEVELS_DB) / 20)
        gain = level / (active_level(voice, self.rate) + 1e-3)
        noisy, clean = heard * gain, voice * gain
        if pair.snr_db is not None:
            noisy = noisy + scaled(disturbance, level * 10 ** (-pair.snr_db / 20), self.rate)
        scale = min(1.0, 32000.0 / np.abs(noisy).max())
        return noisy * scale, clean * scale


def in_turn(draw: Draw) -> list[str]:
    """Speakers, as many of each collection (a folder of recordings), however few it has."""
    collections: dict[str, list[str]] = {}
    for index in draw.rng.permutation(len(draw.voices)):
        name = sorted(draw.voices)[index]
        collections.setdefault(Path(draw.voices[name][0].path).parent.name, []).append(name)
    most = max(map(len, collections.values()))
    rounds = zip(*(names * -(-most // len(names)) for names in collections.values()))
    return [name for some in rounds for name in some]


def pairs_of(draw: Draw, count: int, clean_count: int, room_share: float) -> list[Pair]:
    """Collections of speech, kinds of noise, ratios and places in turn, so that a small draw holds as many as a large one can."""
    kinds = sorted(draw.noises) + ["babble"] * (len(draw.voices) > BABBLERS)
    bands = {name: clips[0].band for name, clips in draw.voices.items()}
    every = [kinds[i] for i in draw.rng.permutation(len(kinds))]
    people = in_turn(draw)
    pairs = []
    for number in range(count):
        speaker, kind = people[number % len(people)], every[number % len(every)]
        snr = SNRS_DB[(number + number // len(SNRS_DB)) % len(SNRS_DB)]
        inside = draw.rooms and (number // 2 * room_share) % 1 + room_share >= 1  # by twos: SNRs come one by one
        pairs.append(Pair(f"{kind}-{number:03d}", speaker, bands[speaker], kind, snr, "room" if inside else "dry"))
    for number in range(clean_count):
        speaker = people[-1 - number % len(people)]
        pairs.append(Pair(f"clean-{number:03d}", speaker, bands[speaker]))
        pairs.append(Pair(f"faint-{number:03d}", speaker, bands[speaker], snr_db=FAINT_DB, faint=True))
    return pairs


def make(
    store: Path,
    out: Path,
    count: int,
    clean_count: int,
    seed: int,
    split: str,
    seconds: float = 8.0,
    room_share: float = 0.5,
) -> None:
    draw = Draw(Corpus(store), split, seconds, seed)
    pairs = pairs_of(draw, count, clean_count, room_share)
    for folder in ("noisy", "clean"):
        (out / folder).mkdir(parents=True, exist_ok=True)
    for pair in pairs:
        for folder, samples in zip(("noisy", "clean"), draw.pair(pair)):
            soundfile.write(out / folder / f"{pair.name}.wav", np.rint(samples).astype(np.int16), draw.rate, "PCM_16")
    (out / "pairs.json").write_text(json.dumps([asdict(pair) for pair in pairs], indent=1))


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--split", default="heldout", choices=(UNSEEN, "heldout", "dev"))
    parser.add_argument("--count", type=int, default=240)
    parser.add_argument("--clean", type=int, default=30, help="pairs without noise, and as many with a faint one")
    parser.add_argument("--seconds", type=float, default=8.0)
    parser.add_argument("--rooms", type=float, default=0.5, help="share of the talkers that stand in a room")
    parser.add_argument("--seed", type=int, default=2026)
    args = parser.parse_args()
    make(args.store, args.out, args.count, args.clean, args.seed, args.split, args.seconds, args.rooms)


if __name__ == "__main__":
    main()

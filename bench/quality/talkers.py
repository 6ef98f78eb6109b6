"""Scores systems on a far talker behind a near one, on a near one who speaks low or whispers, and on a far one alone.

    python bench/quality/talkers.py --store STORE none full=models/c6.xs.f.ca03f4.mvw "peer=some-program --flag"

Near talkers are dry or have the early reflections of a room; far ones are heard through whole measured rooms in which
the direct sound has less energy than the rest (DIRECT_DB), and talk all the time, 10, 15 or 20 dB below. Everything has
the noise of a quiet room. Systems get the store's rate (`--rate` for another one); what they make is measured below
8 kHz, so that no system is told by its rate. IDEAL is no system: the far talker himself comes in 12 dB lower.

First table, by distance in level: how far the far talker goes down where only he speaks (the energy of those blocks
before and after, in pauses after the near one's first word; median), the share of cases with 10 dB or more, and the
near one's PESQ without and with him: what he costs (means). Second table: changes of level, in dB. A near talker speaks
aloud, then the same words 20 dB lower or whispers them as low: change of the low part, median and worst of the cases,
and of its half seconds the worst (median of the cases). Then a far talker alone, whom nobody nearer shows to be far.
"""

from __future__ import annotations

import argparse
import json
from collections.abc import Iterator
from dataclasses import dataclass, replace
from pathlib import Path

import numpy as np
import soundfile
from tqdm import tqdm

import metrics
import systems
import tree  # noqa: F401
from mixtures import Draw, in_turn, scaled
from morva_training.corpus import UNSEEN, Corpus
from morva_training.measures import FEWEST_PAUSES, active_level, block_powers, pauses_of
from morva_training.rooms import convolved, parted
from morva_training.voices import whispered

BELOW_DB = (10, 15, 20)  # the far talker
NEAR_DB, LOW_DB, TONE_DB = -25.0, -45.0, -75.0  # levels below full scale: aloud, low or whispered, the quiet room
DIRECT_DB = 0.0  # a room with less direct sound to the rest of the response is a far talker's
DIRECT_SECONDS = 0.0025  # on both sides of the peak
MEASURED_RATE = 16000
IDEAL, IDEAL_DB = "far 12 dB lower", 12.0
BLOCK, PIECE = MEASURED_RATE // 100, 50  # of 10 ms; blocks in half a second

Parts = dict[str, np.ndarray]


def direct_ratio_db(room: np.ndarray, rate: int) -> float:
    energy, peak, margin = np.square(room, dtype=np.float64), int(np.argmax(np.abs(room))), int(DIRECT_SECONDS * rate)
    direct = energy[max(0, peak - margin) : peak + margin].sum()
    return float(10 * np.log10(direct / (energy.sum() - direct + 1e-12)))


def trimmed(words: np.ndarray, rate: int) -> np.ndarray:
    """Without the silence before and after them."""
    block = rate // 100
    loud = np.flatnonzero(block_powers(words, block) > active_level(words, rate) ** 2 / 1000)
    return words[loud[0] * block : (loud[-1] + 1) * block] if len(loud) else words[:0]


@dataclass(frozen=True)
class Case:
    """A near talker, a far one and a quiet room, each as loud as it is heard: -1..1."""

    name: str
    below_db: int
    near: np.ndarray
    far: np.ndarray
    whisper: np.ndarray
    tone: np.ndarray

    def recordings(self) -> Parts:
        low = 10 ** ((LOW_DB - NEAR_DB) / 20)
        long_tone = np.tile(self.tone, 2)
        heard = {
            "mixture": self.near + self.far + self.tone,
            "near": self.near + self.tone,
            "far": self.far + self.tone,
            "quiet": np.concatenate([self.near, self.near * low]) + long_tone,
            "whisper": np.concatenate([self.near, self.whisper]) + long_tone,
        }
        return {kind: np.clip(np.rint(32768 * x), -32768, 32767) / 32768 for kind, x in heard.items()}


class Talkers(Draw):
    """Pairs of a near and a far talker."""

    def __init__(self, corpus: Corpus, split: str, seconds: float, seed: int) -> None:
        super().__init__(corpus, split, seconds, seed)
        self.seed = seed
        far = [direct_ratio_db(room, self.rate) < DIRECT_DB for room in self.rooms]
        self.far_rooms = [room for room, is_far in zip(self.rooms, far) if is_far]
        self.near_rooms = [room for room, is_far in zip(self.rooms, far) if not is_far]
        if not self.far_rooms or len(self.voices) < 2:
            raise SystemExit(f"the split {split} has no room for far talkers, or fewer than two talkers")

    def near(self, name: str, in_room: bool) -> np.ndarray:
        """Of three draws the one with most pauses."""
        drawn = [self.sentences(self.voices[name]) for _ in range(3)]
        voice = max(drawn, key=lambda words: pauses_of(words, self.rate).sum())
        return self.through(voice, [parted(r, self.rate)[0] for r in self.near_rooms]) if in_room else voice

    def far(self, near: str) -> np.ndarray:
        """Another one, talking all the time."""
        name = self.rng.choice(sorted(set(self.voices) - {near}))
        clips = self.voices[name]
        words = [self.corpus.read(clips[i]) for i in self.rng.permutation(len(clips))]
        return self.through(self.repeated(np.concatenate([trimmed(w, self.rate) for w in words])), self.far_rooms)

    def through(self, voice: np.ndarray, rooms: list[np.ndarray]) -> np.ndarray:
        return convolved(voice, [rooms[self.rng.integers(len(rooms))]])[0]

    def at_level(self, samples: np.ndarray, db: float) -> np.ndarray:
        return scaled(samples, 10 ** (db / 20), self.rate)

    def cases(self, count: int) -> Iterator[Case]:
        people = in_turn(self)
        for number in range(count):
            name, below = people[number % len(people)], BELOW_DB[number % len(BELOW_DB)]
            inside = bool(self.near_rooms) and number // len(BELOW_DB) % 2 == 1
            self.rng = np.random.default_rng((self.seed, number))  # noise draws last: the same talkers at every rate
            near, far = self.near(name, inside), self.at_level(self.far(name), NEAR_DB - below)
            tone = self.at_level(self.hiss(), TONE_DB)
            whisper = self.at_level(whispered(self.rng, near, self.rate), LOW_DB)
            yield Case(f"{name}-{number:03d}", below, self.at_level(near, NEAR_DB), far, whisper, tone)


def change_db(before: np.ndarray, after: np.ndarray, blocks: np.ndarray) -> float:
    """Of the energy in those blocks of 10 ms; NaN where they are too few to say."""
    powers = [block_powers(samples, BLOCK) for samples in (before, after)]
    count = min(len(blocks), *map(len, powers))
    chosen = np.flatnonzero(blocks[:count])
    if len(chosen) < FEWEST_PAUSES:
        return float("nan")
    return float(10 * np.log10((powers[1][chosen].sum() + 1e-9) / (powers[0][chosen].sum() + 1e-9)))


def heard(voice: np.ndarray, within_db: float) -> np.ndarray:
    """The blocks in which a talker speaks and is not more than so far below his level."""
    return block_powers(voice, BLOCK) > (active_level(voice, MEASURED_RATE) * 10 ** (-within_db / 20)) ** 2


def alone(near: np.ndarray, far: np.ndarray) -> np.ndarray:
    """The blocks in which only the far talker speaks and the near one has spoken before."""
    spoken = np.cumsum(heard(near, 20.0)) > 0
    return spoken & pauses_of(near, MEASURED_RATE) & heard(far, 15.0)


def change_of_low_part(voice: np.ndarray, before: np.ndarray, after: np.ndarray) -> tuple[float, float]:
    """Of the speech in the second half of a recording: over all, and of the half second that loses most."""
    start = len(before) // 2
    before, after, blocks = before[start:], after[start:], heard(voice, 20.0)
    pieces = [np.isin(np.arange(len(blocks)) // PIECE, piece) & blocks for piece in range(len(blocks) // PIECE)]
    lowest = np.nanmin([change_db(before, after, piece) for piece in pieces] + [np.inf])
    return change_db(before, after, blocks), float(lowest)


def figures(case: Case, rate: int, process: systems.Process) -> dict[str, float]:
    def measured(samples: np.ndarray) -> np.ndarray:
        return metrics.at_rate(samples, rate, MEASURED_RATE)

    near, far, whisper = (measured(samples) for samples in (case.near, case.far, case.whisper))
    before, after = {}, {}
    for kind, samples in case.recordings().items():
        result = process(samples.astype(np.float32), rate, f"{case.name}-{kind}")
        before[kind], after[kind] = metrics.aligned(measured(samples), measured(result), MEASURED_RATE)
    quiet, quiet_lowest = change_of_low_part(near, before["quiet"], after["quiet"])
    low, low_lowest = change_of_low_part(whisper, before["whisper"], after["whisper"])
    pesq, pesq_alone = (metrics.pesq_score(near, after[kind], MEASURED_RATE) for kind in ("mixture", "near"))
    return {
        "down": -change_db(before["mixture"], after["mixture"], alone(near, far)),
        "pesq_alone": pesq_alone,
        "pesq": pesq,
        "lost": pesq_alone - pesq,
        "quiet": quiet,
        "quiet_piece": quiet_lowest,
        "whisper": low,
        "whisper_piece": low_lowest,
        "far": change_db(before["far"], after["far"], heard(far, 15.0)),
    }


def ideal(case: Case) -> systems.Process:
    """What a system would make that lowers the far talker and nothing else."""
    made = replace(case, far=case.far * 10 ** (-IDEAL_DB / 20)).recordings()
    return lambda _samples, _rate, name: made[name.rsplit("-", 1)[1]]


def column(rows: list[dict], name: str) -> np.ndarray:
    return np.array([row[name] for row in rows if np.isfinite(row[name])] or [np.nan])


def table_of_far(results: dict[str, list[dict]]) -> str:
    lines = ["| below | system | far down | 10 dB or more | PESQ alone | PESQ | PESQ lost | cases |", "|---" * 8 + "|"]
    parts = {**{f"{below} dB": (below,) for below in BELOW_DB}, "all": BELOW_DB}
    for part, levels in parts.items():
        for system, every in results.items():
            rows = [row for row in every if row["below_db"] in levels]
            if not rows:
                continue
            down = column(rows, "down")
            pesq = " | ".join(f"{column(rows, name).mean():.2f}" for name in ("pesq_alone", "pesq", "lost"))
            far = f"{np.median(down):.1f} dB | {100 * np.mean(down >= 10):.0f} %"
            lines.append(f"| {part} | {system} | {far} | {pesq} | {np.isfinite(down).sum()} |")
    return "\n".join(lines)


def table_of_low(results: dict[str, list[dict]]) -> str:
    heads = [f"{kind}{part}" for kind in ("quiet", "whispered") for part in ("", ", worst", ", half second")]
    lines = ["| system | " + " | ".join(heads) + " | far alone |", "|---" * (len(heads) + 2) + "|"]
    for system, rows in results.items():
        cells = []
        for kind in ("quiet", "whisper"):
            whole = column(rows, kind)
            cells += [np.median(whole), whole.min(), np.median(column(rows, f"{kind}_piece"))]
        cells.append(np.median(column(rows, "far")))
        lines.append(f"| {system} | " + " | ".join(f"{cell:.1f}" for cell in cells) + " |")
    return "\n".join(lines)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("systems", nargs="*", help="none, NAME=model.mvw, NAME=folder or NAME=command")
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--split", default=UNSEEN, choices=(UNSEEN, "heldout", "dev"))
    parser.add_argument("--rate", type=int, help="of the recordings; the store's own unless given")
    parser.add_argument("--count", type=int, default=24)
    parser.add_argument("--seconds", type=float, default=8.0)
    parser.add_argument("--seed", type=int, default=2026)
    parser.add_argument("--write", type=Path, metavar="FOLDER", help="the recordings, for systems that take folders")
    parser.add_argument("--json", type=Path, help="write every case's figures here")
    args = parser.parse_args()
    draw = Talkers(Corpus(args.store, args.rate), args.split, args.seconds, args.seed)
    chosen = dict(systems.parse(text) for text in args.systems)
    results: dict[str, list[dict]] = {name: [] for name in (*chosen, IDEAL)}
    for case in tqdm(draw.cases(args.count), total=args.count, mininterval=5.0):
        if args.write:
            args.write.mkdir(parents=True, exist_ok=True)
            for kind, samples in case.recordings().items():
                soundfile.write(args.write / f"{case.name}-{kind}.wav", samples, draw.rate, "PCM_16")
        for name, process in {**chosen, IDEAL: ideal(case)}.items():
            known = {"name": case.name, "below_db": case.below_db}
            results[name].append(known | figures(case, draw.rate, process))
    if args.json:
        args.json.write_text(json.dumps(results, indent=1))
    print(f"{table_of_far(results)}\n\n{table_of_low(results)}")


if __name__ == "__main__":
    main()

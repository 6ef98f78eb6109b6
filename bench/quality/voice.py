"""Scores voice-activity models on labelled recordings and on sounds that must not pass for a voice.

    python bench/quality/voice.py FOLDER --store STORE ours=models/VAD_weight.mvw "peer=some-program --flag"

FOLDER holds pairs, `noisy/` and `clean/` (as mixtures.py makes them): labels come from the clean
speech at 8 kHz, after people's way of marking (measures.py); frames that are neither voice nor silence are left out. Or it holds recordings and
labels of your own, `audio/NAME.wav` and `labels/NAME.txt`: a line per stretch of voice, its start
and end in seconds (Audacity's label tracks).

A peer is called as `program in.wav` and prints what `morva vad --format csv` prints: a line with
names, then rows that begin with a frame's start in seconds and its score. One rule for all: what counts at the end of a
block of 10 ms is the last score that a system has given by then, and a frame's score is there when the frame is over,
not earlier. Nobody may look ahead, and long frames pay for being long.

First, for each frame length: the area under the ROC curve over all frames and over those further
than 50 ms from where a voice starts or ends, the best F1, the F1 at score 0.5 (both over all).
Then, for 10 ms and each signal-to-noise ratio: the area under the curve, how many words raise the
score by 0.05 within 30 ms of their start, and how long after it the score passes 0.5 (words after
at least 0.3 s of silence whose score is not above 0.5 beforehand). Last, the share of
frames above 0.5 in recordings without any speech, by category, and in babble.
"""

from __future__ import annotations

import argparse
import hashlib
import json
import shlex
import subprocess
import tempfile
from dataclasses import dataclass
from pathlib import Path
from typing import Callable

import numpy as np
import soundfile

import metrics
import mixtures
import tree  # noqa: F401
from morva_training.corpus import UNSEEN, Corpus
from morva_training.measures import best_f1, block_labels, frame_labels, roc_auc
from systems import weight_file

import morva

FOOLING = (
    "music", "keyboard", "mouse_click", "human_nonspeech", "snoring", "baby_cry", "animal", "cat", "dog_bark",
    "vacuum", "rain", "birds",
)  # fmt: skip
LABEL_RATE = 8000
BABBLE_RMS = 1000.0  # of each talker
RISE = 0.05
COLLAR_BLOCKS = 5  # of 10 ms, on both sides of a start or end

Scorer = Callable[[np.ndarray, int, int], np.ndarray]  # samples, rate, blocks per frame -> score per frame


def remembered(scorer: Scorer) -> Scorer:
    """Every table asks for the same recordings; they are scored once."""
    known: dict[tuple[bytes, int], np.ndarray] = {}

    def scores(samples: np.ndarray, rate: int, blocks: int) -> np.ndarray:
        key = hashlib.sha256(samples.tobytes()).digest(), blocks
        if key not in known:
            known[key] = scorer(samples, rate, blocks)
        return known[key]

    return scores


def from_weight(path: Path) -> Scorer:
    model = weight_file(path)

    def scores(samples: np.ndarray, rate: int, blocks: int) -> np.ndarray:
        heard = metrics.at_rate(samples, rate, LABEL_RATE)  # its own rate, as peers get theirs
        return morva.voice(heard, LABEL_RATE, frame_ms=10 * blocks, model=model)

    return remembered(scores)


def at_block_ends(starts: np.ndarray, scores: np.ndarray, blocks: int) -> np.ndarray:
    """The last score that is there at the end of every block: of the last frame that is over, 0 before the first."""
    over = np.append(starts[1:], 2 * starts[-1] - starts[-2] if len(starts) > 1 else np.inf)
    ends = np.arange(1, blocks + 1) * 0.01 + 1e-6
    return np.append(0.0, scores)[np.searchsorted(over, ends, side="right")]


def from_command(command: str) -> Scorer:
    def of_blocks(samples: np.ndarray, rate: int, _blocks: int) -> np.ndarray:
        with tempfile.TemporaryDirectory() as folder:
            source = Path(folder) / "in.wav"
            soundfile.write(source, samples, rate, "PCM_16")
            printed = subprocess.run([*shlex.split(command), source], check=True, capture_output=True, text=True).stdout
        rows = np.array([line.split(",")[:2] for line in printed.splitlines()[1:]], float)
        return at_block_ends(rows[:, 0], rows[:, 1], len(samples) * 100 // rate)

    once = remembered(of_blocks)
    return lambda samples, rate, blocks: frame_labels(once(samples, rate, 1), blocks)


def parse(text: str) -> tuple[str, Scorer]:
    name, _, rest = text.partition("=")
    if not rest:
        raise SystemExit(f"{text!r} is neither NAME=model.mvw nor NAME=command")
    is_weight = rest.endswith(".mvw") and Path(rest).is_file()
    return name, from_weight(Path(rest)) if is_weight else from_command(rest)


@dataclass
class Recording:
    noisy: np.ndarray
    rate: int
    voice: np.ndarray  # per block
    sure: np.ndarray
    snr_db: float | None


def near_an_edge(voice: np.ndarray) -> np.ndarray:
    """Blocks within the collar around the label's changes."""
    near = np.zeros(len(voice), bool)
    for start in np.flatnonzero(np.diff(voice.astype(int))) + 1:
        near[max(0, start - COLLAR_BLOCKS) : start + COLLAR_BLOCKS] = True
    return near


def word_starts(scores: np.ndarray, voice: np.ndarray) -> list[int]:
    """First blocks of words after 0.3 s of silence in whose last block the score is not above 0.5."""
    starts = np.flatnonzero(np.diff(voice.astype(int)) == 1) + 1
    return [s for s in starts if s >= 30 and not voice[s - 30 : s].any() and scores[s - 1] <= 0.5]


def onset_delays(scores: np.ndarray, voice: np.ndarray) -> list[float]:
    """Milliseconds from a word's start to the end of the first frame above 0.5; 500 for later ones."""
    above = [np.flatnonzero(scores[start : start + 50] > 0.5) for start in word_starts(scores, voice)]
    return [10.0 * (found[0] + 1) if len(found) else 500.0 for found in above]


def rises(scores: np.ndarray, voice: np.ndarray) -> list[bool]:
    """Whether the score is RISE above its mean of the 0.2 s before within the word's first 30 ms."""
    starts = word_starts(scores, voice)
    return [scores[start : start + 3].max() > scores[start - 20 : start].mean() + RISE for start in starts]


def read_sound(file: Path) -> tuple[np.ndarray, int]:
    samples, rate = soundfile.read(file, dtype="float32", always_2d=True)
    return samples[:, 0], rate


def labels_of_stretches(file: Path, blocks: int) -> np.ndarray:
    voice = np.zeros(blocks, bool)
    for line in filter(str.strip, file.read_text().splitlines()):
        start, end = (round(float(text) * 100) for text in line.replace(",", " ").split()[:2])
        voice[start:end] = True
    return voice


def read_recordings(folder: Path, limit: int) -> list[Recording]:
    """The labelled recordings of a folder, evenly thinned out to about `limit` if that is not 0."""
    own = (folder / "labels").is_dir()
    listing = folder / "pairs.json"
    snrs = {p["name"]: p["snr_db"] for p in json.loads(listing.read_text())} if listing.exists() else {}
    files = sorted(f for f in (folder / ("audio" if own else "noisy")).iterdir() if f.is_file())
    result = []
    for file in files[:: max(1, len(files) // limit)] if limit else files:
        samples, rate = read_sound(file)
        if own:
            voice = labels_of_stretches(folder / "labels" / (file.stem + ".txt"), len(samples) * 100 // rate)
            sure = np.ones(len(voice), np.float32)
        else:
            clean = metrics.at_rate(*read_sound(folder / "clean" / file.name), LABEL_RATE)
            voice, sure = block_labels(clean, LABEL_RATE // 100)
        result.append(Recording(samples, rate, voice, sure, snrs.get(file.stem)))
    return result


@dataclass
class Judged:
    """The frames of one recording that count."""

    scores: np.ndarray
    voice: np.ndarray
    inner: np.ndarray


def judged(scores: np.ndarray, recording: Recording, blocks: int) -> Judged:
    label, sure, edge = (
        frame_labels(x, blocks)[: len(scores)] for x in (recording.voice, recording.sure, near_an_edge(recording.voice))
    )
    scores = scores[: len(label)]
    clear = (sure >= 1.0) & ((label == 0) | (label == 1))
    return Judged(scores[clear], label[clear] > 0.5, edge[clear] == 0)


def together(parts: list[Judged]) -> Judged:
    return Judged(*(np.concatenate([getattr(p, name) for p in parts]) for name in ("scores", "voice", "inner")))


def frame_table(systems_: dict[str, Scorer], recordings: list[Recording]) -> str:
    lines = ["| system | frame | ROC-AUC | off the edges | best F1 | F1 at 0.5 |", "|---|---|---|---|---|---|"]
    for name, scorer in systems_.items():
        for blocks in (1, 2, 3, 4):
            all_ = together([judged(scorer(r.noisy, r.rate, blocks), r, blocks) for r in recordings])
            above = all_.scores > 0.5
            at_half = 2 * (above & all_.voice).sum() / (above.sum() + all_.voice.sum())
            lines.append(
                f"| {name} | {10 * blocks} ms | {roc_auc(all_.scores, all_.voice):.4f} "
                f"| {roc_auc(all_.scores[all_.inner], all_.voice[all_.inner]):.4f} "
                f"| {best_f1(all_.scores, all_.voice)[0]:.4f} | {at_half:.4f} |"
            )
    return "\n".join(lines)


def snr_table(systems_: dict[str, Scorer], recordings: list[Recording]) -> str:
    lines = ["| system | SNR | ROC-AUC | words | rise within 30 ms | median onset | within 30 ms |"]
    lines.append("|---|---|---|---|---|---|---|")
    snrs = sorted({r.snr_db for r in recordings}, key=lambda snr: np.inf if snr is None else snr)
    for name, scorer in systems_.items():
        for snr in snrs:
            some = [r for r in recordings if r.snr_db == snr]
            scores = [scorer(r.noisy, r.rate, 1) for r in some]
            all_ = together([judged(s, r, 1) for s, r in zip(scores, some)])
            heard = [(s, r.voice[: len(s)]) for s, r in zip(scores, some)]
            delays = np.array([delay for pair in heard for delay in onset_delays(*pair)])
            risen = np.array([rise for pair in heard for rise in rises(*pair)])
            onset = (
                f"{risen.mean():.0%} | {np.median(delays):.0f} ms | {np.mean(delays <= 30):.0%}"
                if len(delays)
                else "||"
            )
            label = "clean" if snr is None else f"{snr:g} dB"
            area = roc_auc(all_.scores, all_.voice)
            lines.append(f"| {name} | {label} | {area:.4f} | {len(delays)} | {onset} |")
    return "\n".join(lines)


def without_speech(store: Path, split: str) -> tuple[dict[str, list[np.ndarray]], int]:
    """Sounds -1..1, by kind, and their rate; babble is six talkers at once."""
    draw = mixtures.Draw(Corpus(store), split, seconds=8.0, seed=1)
    sounds = {name: [draw.corpus.read(c) / 32768 for c in draw.noises.get(name, [])] for name in FOOLING}
    if len(draw.voices) > mixtures.BABBLERS:
        sounds["babble"] = [draw.babble(draw.voices) * BABBLE_RMS / 32768 for _ in range(5)]
    return {name: parts for name, parts in sounds.items() if parts}, draw.rate


def false_alarms(sounds: dict[str, list[np.ndarray]], rate: int, systems_: dict[str, Scorer]) -> str:
    lines = ["| sound without speech | recordings | frames above 0.5: " + " | ".join(systems_) + " |"]
    lines.append("|---|---|" + "---|" * len(systems_))
    for name, parts in sounds.items():
        shares = []
        for scorer in systems_.values():
            scores = np.concatenate([scorer(part, rate, 1) for part in parts])
            shares.append(f"{np.mean(scores > 0.5):.1%}")
        lines.append(f"| {name} | {len(parts)} | " + " | ".join(shares) + " |")
    return "\n".join(lines)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder", type=Path, help="noisy/ and clean/, or audio/ and labels/")
    parser.add_argument("systems", nargs="+", help="NAME=model.mvw or NAME=command")
    parser.add_argument("--store", type=Path, help="decoded audio, for the sounds without speech")
    parser.add_argument("--split", default="heldout", choices=(UNSEEN, "heldout", "dev"))
    parser.add_argument("--limit", type=int, default=0)
    args = parser.parse_args()
    chosen = dict(parse(text) for text in args.systems)
    recordings = read_recordings(args.folder, args.limit)
    print(frame_table(chosen, recordings) + "\n\n" + snr_table(chosen, recordings))
    if args.store:
        print("\n" + false_alarms(*without_speech(args.store, args.split), chosen))


if __name__ == "__main__":
    main()

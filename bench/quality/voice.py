"""Scores voice-activity models on held-out mixtures and on sounds that must not pass for a voice.

    python bench/quality/voice.py --pairs FOLDER --store STORE models/VAD_weight.mvw

The recordings are taken to 8 kHz; labels come from the clean speech,
frames that are neither voice nor silence are left out. Prints, for each frame length: the area
under the ROC curve over all frames and over those further than 50 ms from where a voice starts or
ends, the best F1, the F1 at score 0.5 (both over all). Then for 10 ms: how long after a word's
start the score passes 0.5 (median and share within 30 ms, words that follow at least 0.3 s of
silence), and the share of frames above 0.5 in recordings without any speech, by category.
FOLDER is one that mixtures.py made, or any other with `noisy/` and `clean/`.
"""
from __future__ import annotations

import argparse
import json
from pathlib import Path

import numpy as np
import soundfile

import metrics
import systems  # noqa: F401  (makes the training package importable)
from morva_training import mvw
from morva_training.corpus import Store
from morva_training.engine import VoiceModel
from morva_training.voice import BLOCK, RATE, block_labels, frame_labels

FOOLING = ("music", "keyboard", "mouse_click", "human_nonspeech", "animal", "dog_bark", "vacuum", "rain", "birds")
COLLAR_BLOCKS = 5  # of 10 ms, on both sides of a start or end
CLEAR_DB = 10  # mixtures at or above this SNR count for the onset


def scores_of(weight: mvw.Weight, samples: np.ndarray, frame: int) -> np.ndarray:
    model = VoiceModel(weight)
    return np.array([model.score(samples[at : at + frame]) for at in range(0, len(samples) - frame + 1, frame)])


def read_8k(path: Path) -> np.ndarray:
    samples, rate = soundfile.read(path, dtype="float32", always_2d=True)
    return np.clip(np.rint(metrics.at_rate(samples[:, 0], rate, RATE) * 32768), -32768, 32767).astype(np.float32)


def onset_delays(scores: np.ndarray, voice: np.ndarray) -> list[float]:
    """Milliseconds from a word's start, after 0.3 s of silence, to the end of the first frame above 0.5."""
    delays = []
    for start in np.flatnonzero(np.diff(voice.astype(int)) == 1) + 1:
        if start < 30 or voice[start - 30 : start].any() or scores[start - 1] > 0.5:
            continue
        above = np.flatnonzero(scores[start : start + 50] > 0.5)
        delays.append(10.0 * (above[0] + 1) if len(above) else 500.0)
    return delays


def near_an_edge(voice: np.ndarray) -> np.ndarray:
    """Blocks within the collar around the label's changes."""
    near = np.zeros(len(voice), bool)
    for start in np.flatnonzero(np.diff(voice.astype(int))) + 1:
        near[max(0, start - COLLAR_BLOCKS) : start + COLLAR_BLOCKS] = True
    return near


def score_pairs(folder: Path, weight: mvw.Weight, limit: int) -> str:
    listing = folder / "pairs.json"
    snrs = {p["name"]: p["snr_db"] for p in json.loads(listing.read_text())} if listing.exists() else {}
    files = sorted((folder / "noisy").glob("*.wav"))
    files = files[:: max(1, len(files) // limit)] if limit else files
    material = [(f.stem, read_8k(f), *block_labels(read_8k(folder / "clean" / f.name))) for f in files]
    lines = ["| frame | ROC-AUC | off the edges | best F1 | F1 at 0.5 |", "|---|---|---|---|---|"]
    delays: list[float] = []
    for blocks in (1, 2, 3, 4):
        all_scores, all_voice, all_inner = [], [], []
        for name, noisy, voice, sure in material:
            scores = scores_of(weight, noisy, blocks * BLOCK)
            label = frame_labels(voice, blocks)[: len(scores)]
            clear = (frame_labels(sure, blocks)[: len(scores)] >= 1.0) & ((label == 0) | (label == 1))
            all_scores.append(scores[clear])
            all_voice.append(label[clear] > 0.5)
            all_inner.append(frame_labels(near_an_edge(voice), blocks)[: len(scores)][clear] == 0)
            if blocks == 1 and (snrs.get(name) is None or snrs[name] >= CLEAR_DB):
                delays += onset_delays(scores, voice[: len(scores)])
        scores, voice, inner = map(np.concatenate, (all_scores, all_voice, all_inner))
        hits = ((scores > 0.5) & voice).sum()
        at_half = 2 * hits / ((scores > 0.5).sum() + voice.sum())
        lines.append(
            f"| {10 * blocks} ms | {metrics.roc_auc(scores, voice):.4f} "
            f"| {metrics.roc_auc(scores[inner], voice[inner]):.4f} "
            f"| {metrics.best_f1(scores, voice)[0]:.4f} | {at_half:.4f} |"
        )
    if delays:
        within = np.mean(np.array(delays) <= 30)
        lines.append(f"\nonset: {len(delays)} words, median {np.median(delays):.0f} ms, within 30 ms {within:.0%}")
    return "\n".join(lines)


def false_alarms(store: Path, weight: mvw.Weight, split: str) -> str:
    noise = Store(store, "noise", RATE)
    lines = ["| sound without speech | recordings | frames above 0.5 |", "|---|---|---|"]
    for category in FOOLING:
        clips = [c for c in noise.of_split(split) if c.category == category]
        if not clips:
            continue
        scores = np.concatenate([scores_of(weight, noise.read(c), BLOCK) for c in clips])
        lines.append(f"| {category} | {len(clips)} | {np.mean(scores > 0.5):.1%} |")
    return "\n".join(lines)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("weight", type=Path)
    parser.add_argument("--pairs", type=Path, required=True, help="folder made by mixtures.py, or of the same form")
    parser.add_argument("--store", type=Path, help="decoded audio, for the sounds without speech")
    parser.add_argument("--split", default="heldout")
    parser.add_argument("--limit", type=int, default=0)
    args = parser.parse_args()
    weight = mvw.read(args.weight)
    print(score_pairs(args.pairs, weight, args.limit))
    if args.store:
        print("\n" + false_alarms(args.store, weight, args.split))


if __name__ == "__main__":
    main()

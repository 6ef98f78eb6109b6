"""A data folder from recordings as they were published: trimmed, judged, and with the rooms' own noise.

    python -m morva_training.originals --table originals.tsv --data OLD --out DATA

The table has a row per recording: `kind` (`speech`, `noise` or `rir`), `path`, optionally `start` and `seconds` of
the part that is meant, `replaces` (paths or sources of the old folder's rows that this recording takes the place of,
separated by commas), and the columns of a data folder. Rows of the old folder that nothing replaces stay. Speech
loses the silence at both ends; where its floor is less than `spread` dB (35 unless the column says otherwise) below
it, it is no clean speech. Pauses of the training speakers give the noise category `room_tone`: what rooms and
microphones add, a clip a speaker.
"""

from __future__ import annotations

import argparse
import csv
from collections import defaultdict
from pathlib import Path

import numpy as np
import soundfile
from tqdm import tqdm

from .corpus import KINDS, Row, read_manifest, recording_of, without_excluded
from .measures import block_powers
from .mixing import ROOM_TONE

MARGIN = 0.15  # seconds of silence that stay at both ends
TONE_SHORTEST, TONE_FADE, TONE_LONGEST = 0.4, 0.1, 20.0  # seconds of a pause, of its cross-fade, of a speaker's clip
TONE_DB = (-78.0, -40.0)  # of full scale: digital silence below, not a pause above


def read(row: Row) -> tuple[np.ndarray, int]:
    """Mono samples of the part that is meant, and their rate."""
    with soundfile.SoundFile(row["path"]) as file:
        file.seek(min(file.frames, int(float(row.get("start") or 0) * file.samplerate)))
        count = int(float(row["seconds"]) * file.samplerate) if row.get("seconds") else -1
        return file.read(count, dtype="float32", always_2d=True)[:, 0], file.samplerate


def block_levels(samples: np.ndarray, rate: int) -> np.ndarray:
    """dB of full scale per block of 20 ms."""
    return 10 * np.log10(block_powers(samples, rate // 50) + 1e-10)


def spread_db(levels: np.ndarray) -> float:
    """How far the floor lies below the loud blocks."""
    return float(np.percentile(levels, 95) - np.percentile(levels, 5)) if len(levels) else 0.0


def trimmed(samples: np.ndarray, rate: int, levels: np.ndarray) -> np.ndarray:
    loud = np.flatnonzero(levels > max(np.percentile(levels, 95) - 35.0, np.percentile(levels, 5) + 8.0))
    if not len(loud):
        return samples[:0]
    margin, block = int(MARGIN * rate), rate // 50
    return samples[max(0, loud[0] * block - margin) : (loud[-1] + 1) * block + margin]


def pauses(samples: np.ndarray, rate: int, levels: np.ndarray) -> list[np.ndarray]:
    """Stretches of the floor: neither speech nor its end nor digital silence."""
    block = rate // 50
    floor = np.percentile(levels, 10)
    calm = (levels < floor + 6.0) & (levels < np.percentile(levels, 95) - 20.0)
    calm &= (levels > TONE_DB[0]) & (levels < TONE_DB[1])
    edges = np.flatnonzero(np.diff(np.concatenate([[0], calm.astype(int), [0]])))
    found = []
    for first, last in zip(edges[::2], edges[1::2]):
        piece = samples[(first + 3) * block : (last - 3) * block]
        if len(piece) >= TONE_SHORTEST * rate and np.ptp(block_levels(piece, rate)) < 10.0:
            found.append(piece)
    return found


def joined(pieces: list[np.ndarray], rate: int) -> np.ndarray:
    """One after the other, faded into each other so that their powers add to what they were."""
    fade = int(TONE_FADE * rate)
    rise = np.sin(np.linspace(0.0, np.pi / 2, fade)).astype(np.float32)
    out = pieces[0].copy()
    for piece in pieces[1:]:
        if len(out) > TONE_LONGEST * rate:
            break
        piece = piece.copy()
        out[-fade:] = out[-fade:] * rise[::-1] + piece[:fade] * rise
        out = np.concatenate([out, piece[fade:]])
    return out


class Folder:
    """The data folder that is being made."""

    def __init__(self, out: Path) -> None:
        self.out = out
        self.rows: dict[str, list[Row]] = {"speech": [], "noise": [], "rir": []}
        self.tones: dict[tuple[str, int], list[np.ndarray]] = defaultdict(list)
        self.speakers: dict[str, Row] = {}

    def add(self, row: Row) -> None:
        samples, rate = read(row)
        if row["kind"] == "speech":
            levels = block_levels(samples, rate)
            if row["split"] == "train" and len(levels):
                self.tones[row["speaker"], rate] += pauses(samples, rate, levels)
                self.speakers[row["speaker"]] = row
            if spread_db(levels) < float(row.get("spread") or 35.0):
                return
            samples = trimmed(samples, rate, levels)
        if len(samples) > rate // 10:
            self.write(row, samples, rate)

    def write(self, row: Row, samples: np.ndarray, rate: int) -> None:
        kind = row["kind"]
        path = Path(kind) / (row.get("source") or "unknown") / f"{len(self.rows[kind]):06d}.flac"
        (self.out / path).parent.mkdir(parents=True, exist_ok=True)
        soundfile.write(self.out / path, samples, rate, "PCM_16")
        seconds = f"{len(samples) / rate:.2f}"
        self.rows[kind].append({**row, "path": str(path), "seconds": seconds, "original_rate": str(rate)})

    def add_room_tones(self) -> None:
        for (speaker, rate), pieces in self.tones.items():
            if pieces:
                tone = joined(sorted(pieces, key=len, reverse=True), rate)
                said = self.speakers[speaker]
                row = {"kind": "noise", "category": ROOM_TONE, "recording": f"room of {speaker}", "split": "train"}
                self.write(row | {name: said.get(name) or "" for name in ("source", "licence")}, tone, rate)

    def write_tables(self) -> None:
        for kind, rows in self.rows.items():
            left_out = {"kind", "start", "replaces", "spread"}
            names = list(dict.fromkeys(name for row in rows for name in row if name not in left_out))
            with (self.out / f"{kind}.tsv").open("w", newline="", encoding="utf-8") as file:
                table = csv.DictWriter(file, names, delimiter="\t", extrasaction="ignore", restval="")
                table.writeheader()
                table.writerows(rows)


def kept(old: Path, kind: str, replaced: set[str]) -> list[Row]:
    """Rows of the old folder that nothing takes the place of: paths from the root, recordings as they were."""
    rows = read_manifest(old / f"{kind}.tsv") if (old / f"{kind}.tsv").exists() else []
    stays = [row for row in rows if row["path"] not in replaced and row.get("source") not in replaced]
    known = [{"recording": recording_of(row)} if kind == "noise" else {} for row in stays]
    return [{**row, **more, "path": str((old / row["path"]).resolve())} for row, more in zip(stays, known)]


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--table", type=Path, required=True)
    parser.add_argument("--data", type=Path, required=True, help="the data folder to start from")
    parser.add_argument("--out", type=Path, required=True)
    args = parser.parse_args()
    with args.table.open(newline="", encoding="utf-8") as file:
        table = without_excluded(list(csv.DictReader(file, delimiter="\t")))
    replaced = {name for row in table for name in (row.get("replaces") or "").split(",") if name}
    folder = Folder(args.out)
    for row in tqdm(table, mininterval=5.0):
        try:
            folder.add(row)
        except soundfile.LibsndfileError as error:  # a damaged download
            print(f"{row['path']}: {error}; left out")
    folder.add_room_tones()
    for kind in (*KINDS, "rir"):
        folder.rows[kind] += kept(args.data, kind, replaced)
    folder.write_tables()


if __name__ == "__main__":
    main()

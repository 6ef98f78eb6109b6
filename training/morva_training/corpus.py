"""The decoded audio store: manifests in, one memory-mapped int16 file per kind and rate out.

Decoding compressed speech costs more than training on it, so it is done once. A store is a
folder with `speech-32000.i16`, `noise-32000.i16` (mono samples, all recordings one after the
other) and a `.json` index beside each that keeps the manifest's columns for every recording.
Room responses are short and stay in one `rooms.npz`. Lower rates are made on demand from the
32 kHz file.

Units: samples are int16; rates in hertz; positions and lengths in samples of the store's rate.
"""

from __future__ import annotations

import argparse
import csv
import json
from dataclasses import dataclass
from pathlib import Path

import numpy as np
from scipy.signal import resample_poly
from tqdm import tqdm

BASE_RATE = 32000
EXCLUDED_SPEAKERS = ("p232", "p257")  # the customary test speakers of VCTK: never trained on
AUDIO_SUFFIXES = {".opus", ".wav", ".flac", ".ogg"}


@dataclass(frozen=True)
class Clip:
    """One recording of a store."""

    path: str
    start: int
    length: int
    split: str
    category: str  # speaker of speech, category of noise
    band: str  # "full", or "8k" when the recording holds nothing above 8 kHz


def read_manifest(table: Path) -> list[dict[str, str]]:
    """Rows of a tab-separated manifest with a header line, without the excluded speakers."""
    with table.open(newline="", encoding="utf-8") as handle:
        rows = list(csv.DictReader(handle, delimiter="\t"))
    return without_excluded(rows)


def without_excluded(rows: list[dict[str, str]]) -> list[dict[str, str]]:
    return [row for row in rows if not row.get("speaker", "").endswith(EXCLUDED_SPEAKERS)]


def rows_of_folder(folder: Path, kind: str) -> list[dict[str, str]]:
    """Manifest rows for a bare folder: everything is training material, a folder is a category."""
    files = sorted(p for p in folder.rglob("*") if p.suffix.lower() in AUDIO_SUFFIXES)
    column = "speaker" if kind == "speech" else "category"
    rows = [{"path": str(p.relative_to(folder.parent)), column: p.parent.name, "split": "train"} for p in files]
    return without_excluded(rows)


def read_audio(path: Path, rate: int) -> np.ndarray:
    """Mono float32 in -1..1 at the wanted rate (first channel of a multichannel file)."""
    import soundfile

    samples, file_rate = soundfile.read(path, dtype="float32", always_2d=True)
    mono = samples[:, 0]
    if file_rate == rate:
        return mono
    divisor = int(np.gcd(file_rate, rate))
    return resample_poly(mono, rate // divisor, file_rate // divisor).astype(np.float32)


def to_int16(samples: np.ndarray) -> np.ndarray:
    return np.clip(np.rint(samples * 32768.0), -32768, 32767).astype("<i2")


def build_store(rows: list[dict[str, str]], root: Path, out: Path, kind: str) -> None:
    """Decodes every row's recording below `root` into `out/<kind>-32000.i16` and its index."""
    clips: list[dict[str, object]] = []
    position = 0
    with (out / f"{kind}-{BASE_RATE}.i16").open("wb") as handle:
        for row in tqdm(rows, desc=f"decoding {kind}", mininterval=2.0):
            samples = to_int16(read_audio(root / row["path"], BASE_RATE))
            handle.write(samples.tobytes())
            clips.append(
                {
                    "path": row["path"],
                    "start": position,
                    "length": len(samples),
                    "split": row.get("split", "train"),
                    "category": row.get("speaker") or row.get("category") or "",
                    "band": row.get("band", "full"),
                }
            )
            position += len(samples)
    (out / f"{kind}.json").write_text(json.dumps(clips))


def build_rooms(rows: list[dict[str, str]], root: Path, out: Path) -> None:
    """Room responses, scaled to unit energy of the direct sound and cut at 0.8 s."""
    rooms: dict[str, np.ndarray] = {}
    for number, row in enumerate(rows):
        response = read_audio(root / row["path"], BASE_RATE)[: int(0.8 * BASE_RATE)]
        peak = int(np.argmax(np.abs(response)))
        direct = response[max(0, peak - 80) : peak + 80]
        response = response[max(0, peak - 80) :] / (np.sqrt(np.sum(direct**2)) + 1e-9)
        rooms[f"{row.get('split', 'train')}-{number:04d}"] = response.astype(np.float32)
    np.savez(out / "rooms.npz", **rooms)


class Store:
    """Read access to one kind ("speech" or "noise") of a decoded store at one rate."""

    def __init__(self, folder: Path, kind: str, rate: int = BASE_RATE) -> None:
        if BASE_RATE % rate:
            raise ValueError(f"{rate} Hz does not divide {BASE_RATE} Hz")
        self.rate = rate
        self._ratio = BASE_RATE // rate
        base = folder / f"{kind}-{BASE_RATE}.i16"
        target = folder / f"{kind}-{rate}.i16"
        clips = json.loads((folder / f"{kind}.json").read_text())
        if self._ratio > 1 and not target.exists():
            _decimate(base, target, clips, self._ratio)
        self.samples = np.memmap(target, dtype="<i2", mode="r")
        self.clips = [
            Clip(
                path=c["path"],
                start=_scaled_start(c["start"], self._ratio),
                length=c["length"] // self._ratio,
                split=c["split"],
                category=c["category"],
                band=c["band"],
            )
            for c in clips
        ]

    def of_split(self, split: str) -> list[Clip]:
        return [c for c in self.clips if c.split == split]

    def read(self, clip: Clip, offset: int = 0, length: int | None = None) -> np.ndarray:
        """Float32 on the 16-bit scale."""
        end = clip.length if length is None else min(clip.length, offset + length)
        return self.samples[clip.start + offset : clip.start + end].astype(np.float32)


def _scaled_start(start: int, ratio: int) -> int:
    return -(-start // ratio)


def _decimate(base: Path, target: Path, clips: list[dict[str, object]], ratio: int) -> None:
    """Writes the low-rate copy clip by clip, so that no clip rings into its neighbour."""
    source = np.memmap(base, dtype="<i2", mode="r")
    result = np.zeros(len(source) // ratio + len(clips) + 1, dtype="<i2")
    for clip in clips:
        start, length = int(clip["start"]), int(clip["length"])
        low = resample_poly(source[start : start + length].astype(np.float32), 1, ratio)
        first = _scaled_start(start, ratio)
        result[first : first + length // ratio] = to_int16(low[: length // ratio] / 32768.0)
    partial = target.with_suffix(".partial")
    result.tofile(partial)
    partial.rename(target)


def load_rooms(folder: Path, split: str) -> list[np.ndarray]:
    with np.load(folder / "rooms.npz") as archive:
        return [archive[name] for name in sorted(archive.files) if name.startswith(split)]


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--data", type=Path, required=True, help="folder with speech.tsv, noise.tsv, rir.tsv")
    parser.add_argument("--store", type=Path, required=True, help="folder to write the decoded store to")
    args = parser.parse_args()
    args.store.mkdir(parents=True, exist_ok=True)
    for kind in ("speech", "noise"):
        table = args.data / f"{kind}.tsv"
        rows = read_manifest(table) if table.exists() else rows_of_folder(args.data / kind, kind)
        build_store(rows, args.data, args.store, kind)
    rooms = args.data / "rir.tsv"
    build_rooms(read_manifest(rooms) if rooms.exists() else [], args.data, args.store)


if __name__ == "__main__":
    main()

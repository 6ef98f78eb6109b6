"""The decoded corpus: manifests in, one memory-mapped int16 file per kind and rate out.

Decoding compressed speech costs more than training on it, so it is done once. A store is a folder
with an `index.json`, which lists every recording, and the files that it names: mono samples, all
recordings one after the other, named by kind, rate and content, and the room responses. Lower rates
are made on demand from the file of the store's own rate; their names carry that file's content, so that a
copy of other recordings is never taken for theirs. The index is replaced last: a store is whole or the old one.

`Corpus` reads a store, and is the one place that knows what may be heard where: the split, the share
of the training split that is kept back for validation, what is one recording, and whose speech ends
at 8 kHz. Whole collections that only the bench may hear are of the split "unseen", in a store of their own.

Units: samples are int16; rates in hertz; positions and lengths in samples of the corpus's rate.
"""

from __future__ import annotations

import argparse
import csv
import hashlib
import json
import os
import re
import tempfile
import zlib
from collections import defaultdict
from collections.abc import Callable, Iterable
from contextlib import contextmanager
from dataclasses import dataclass
from pathlib import Path
from typing import Any, BinaryIO, Iterator

import numpy as np
from scipy.signal import resample_poly
from tqdm import tqdm

BASE_RATE = 32000  # of a store, unless it is made for another one
UNSEEN = "unseen"
EXCLUDED_SPEAKERS = ("p232", "p257")  # the customary test speakers of VCTK: never trained on
AUDIO_SUFFIXES = {".opus", ".wav", ".flac", ".ogg"}
KINDS = ("speech", "noise")
DEV_SHARE, DEV_NAMES = 1 / 25, 1 / 10  # of the training split's time, and at most of its speakers or recordings

Row = dict[str, str]


def read_manifest(table: Path) -> list[Row]:
    """Rows of a tab-separated manifest with a header line, without the excluded speakers."""
    with table.open(newline="", encoding="utf-8") as handle:
        rows = list(csv.DictReader(handle, delimiter="\t"))
    return without_excluded(rows)


def without_excluded(rows: list[Row]) -> list[Row]:
    return [row for row in rows if not row.get("speaker", "").endswith(EXCLUDED_SPEAKERS)]


def rows_of_folder(folder: Path, kind: str) -> list[Row]:
    """Manifest rows for a bare folder: everything is training material, a folder is a category."""
    files = sorted(p for p in folder.rglob("*") if p.suffix.lower() in AUDIO_SUFFIXES)
    column = "speaker" if kind == "speech" else "category"
    rows = [{"path": str(p.relative_to(folder.parent)), column: p.parent.name, "split": "train"} for p in files]
    return without_excluded(rows)


def recording_of(row: Row) -> str:
    """What was recorded in one go, as far as a manifest tells: its clips must not part.

    The `recording` column, the number of a sound in its author's link, or the path without the number
    that counts clips: rather too much in one recording than one recording in two.
    """
    sound = re.search(r"(?:/sounds?/|\bfs)(\d+)", row.get("author") or "")
    counted = re.sub(r"[-_]?\d+$", "", str(Path(row["path"]).with_suffix("")))
    return row.get("recording") or (f"sound {sound[1]}" if sound else counted)


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


@contextmanager
def _new_file(folder: Path, name: Callable[[], str]) -> Iterator[BinaryIO]:
    """A file of this process's own that takes its name, unless another was quicker, when it is complete."""
    handle, own = tempfile.mkstemp(dir=folder, suffix=".partial")
    try:
        with os.fdopen(handle, "wb") as file:
            yield file
        Path(own).chmod(0o644)
        Path(own).replace(folder / name())
    except BaseException:
        Path(own).unlink(missing_ok=True)
        raise


def _decoded(rows: list[Row], root: Path, kind: str, rate: int) -> Iterator[tuple[dict[str, Any], np.ndarray]]:
    """What is known of every row's recording below `root`, and its samples."""
    for row in tqdm(rows, desc=f"decoding {kind}", mininterval=2.0):
        known = {
            "path": row["path"],
            "split": row.get("split") or "train",
            "group": row.get("speaker") or row.get("category") or "",
            "band": row.get("band") or "full",
            "recording": recording_of(row),
        }
        yield known, to_int16(read_audio(root / row["path"], rate))


def _write(clips: Iterable[tuple[dict[str, Any], np.ndarray]], out: Path, kind: str, rate: int) -> dict[str, Any]:
    """All clips in one file of `out`; its entry in the index."""
    digest = hashlib.sha256()
    entry: dict[str, Any] = {"clips": []}
    position = 0
    with _new_file(out, lambda: _samples_file(kind, rate, digest.hexdigest()[:12])) as file:
        for known, samples in clips:
            file.write(samples.tobytes())
            digest.update(samples.tobytes())
            entry["clips"].append({**known, "start": position, "length": len(samples)})
            position += len(samples)
    return {"content": digest.hexdigest()[:12], **entry}


def _samples_file(kind: str, rate: int, content: str) -> str:
    return f"{kind}-{rate}-{content}.i16"


def _rooms(rows: list[Row], root: Path, rate: int) -> dict[str, np.ndarray]:
    """Room responses, scaled to unit energy of the direct sound and cut at 0.8 s."""
    rooms: dict[str, np.ndarray] = {}
    for number, row in enumerate(rows):
        response = read_audio(root / row["path"], rate)[: int(0.8 * rate)]
        peak, margin = int(np.argmax(np.abs(response))), rate // 400
        direct = response[max(0, peak - margin) : peak + margin]
        response = response[max(0, peak - margin) :] / (np.sqrt(np.sum(direct**2)) + 1e-9)
        rooms[f"{row.get('split') or 'train'}-{number:04d}"] = response.astype(np.float32)
    return rooms


def write_store(
    clips: dict[str, Iterable[tuple[dict[str, Any], np.ndarray]]], rooms: dict[str, np.ndarray], out: Path, rate: int
) -> None:
    """Writes a store of the clips of each kind, what the index says of them and their samples, and named rooms."""
    out.mkdir(parents=True, exist_ok=True)
    index: dict[str, Any] = {kind: _write(clips[kind], out, kind, rate) for kind in KINDS}
    digest = hashlib.sha256(b"".join(name.encode() + room.tobytes() for name, room in rooms.items()))
    index |= {"rate": rate, "rooms": f"rooms-{digest.hexdigest()[:12]}.npz"}
    with _new_file(out, lambda: index["rooms"]) as file:
        np.savez(file, **rooms)
    with _new_file(out, lambda: "index.json") as file:
        file.write(json.dumps(index).encode())
    contents = {index[kind]["content"] for kind in KINDS}
    for file in [*out.glob("*.i16"), *out.glob("rooms-*.npz")]:
        if file.name != index["rooms"] and file.stem.rsplit("-", 1)[-1] not in contents:
            file.unlink()  # of the store that was here before


def build(tables: dict[str, list[Row]], root: Path, out: Path, rate: int = BASE_RATE) -> None:
    """Writes the store of the recordings below `root` that the tables "speech", "noise" and "rir" name."""
    if len({row.get("split") == UNSEEN for rows in tables.values() for row in rows}) > 1:
        raise ValueError("unseen recordings belong in a store of their own, where no training looks")
    clips = {kind: _decoded(tables[kind], root, kind, rate) for kind in KINDS}
    write_store(clips, _rooms(tables.get("rir", []), root, rate), out, rate)


@dataclass(frozen=True)
class Clip:
    """One recording, or a part of one, of a corpus."""

    kind: str
    path: str
    start: int
    length: int
    group: str  # speaker of speech, category of noise
    band: str  # "full", or "8k" when the recording holds nothing above 8 kHz
    recording: str  # what was recorded in one go


def _kept_back(clips: list[dict[str, Any]], kind: str) -> set[str]:
    """What of the training split validates: whole speakers of both bands, whole recordings of noise.

    In an order that the names give, as long as the shares of the band are not exceeded; but something
    of each band, so that no figure is without it.
    """
    bands: dict[str, dict[str, int]] = defaultdict(lambda: defaultdict(int))
    full = {c["group"] for c in clips if c["band"] == "full"}
    for clip in clips:
        if clip["split"] == "train":
            band = "full" if kind == "noise" or clip["group"] in full else "8k"
            bands[band][_identity(clip, kind)] += clip["length"]
    kept: set[str] = set()
    for lengths in bands.values():
        left = DEV_SHARE * sum(lengths.values())
        chosen = set()
        for name in sorted(lengths, key=lambda name: (zlib.crc32(name.encode()), name)):
            if lengths[name] <= left and len(chosen) < DEV_NAMES * len(lengths):
                left -= lengths[name]
                chosen.add(name)
        if not chosen and len(lengths) > 1:
            chosen = {min(lengths, key=lambda name: (lengths[name], name))}
        kept |= chosen
    return kept


def _identity(clip: dict[str, Any], kind: str) -> str:
    return clip["group"] if kind == "speech" else clip["recording"]


class Corpus:
    """A store at one rate, its own if none is named.

    Splits are "train", "dev" (kept back from it for validation) and "heldout", or "unseen".
    """

    def __init__(self, folder: Path, rate: int | None = None) -> None:
        if not (folder / "index.json").exists():
            raise FileNotFoundError(f"{folder} holds no index.json: make the store with morva_training.corpus")
        self._folder = folder
        self._index = json.loads((folder / "index.json").read_text())
        self._base_rate = self._index.get("rate", BASE_RATE)
        self.rate = rate or self._base_rate
        if self._base_rate % self.rate:
            raise ValueError(f"{rate} Hz does not divide the store's {self._base_rate} Hz")
        self._samples = {kind: self._at_rate(kind) for kind in KINDS}
        self._clips = {kind: self._by_split(kind) for kind in KINDS}

    def _at_rate(self, kind: str) -> np.ndarray:
        entry, ratio, target = self._index[kind], self._base_rate // self.rate, self.file_of(kind)
        if not target.exists():
            base = _mapped(self._folder / _samples_file(kind, self._base_rate, entry["content"]))
            low = _decimated(base, entry["clips"], ratio)
            with _new_file(self._folder, lambda: target.name) as file:
                low.tofile(file)
        return _mapped(target)

    def file_of(self, kind: str) -> Path:
        """All samples of a kind, in which `start` of a clip counts."""
        return self._folder / _samples_file(kind, self.rate, self._index[kind]["content"])

    def _by_split(self, kind: str) -> dict[str, list[Clip]]:
        splits: dict[str, list[Clip]] = {"train": [], "dev": [], "heldout": [], UNSEEN: []}
        ratio, listed = self._base_rate // self.rate, self._index[kind]["clips"]
        known = any(c["split"] == "dev" for c in listed)
        kept = set() if known else _kept_back(listed, kind)
        for c in listed:
            start, length = _scaled_start(c["start"], ratio), c["length"] // ratio
            clip = Clip(kind, c["path"], start, length, c["group"], c["band"], c["recording"])
            dev = c["split"] == "train" and _identity(c, kind) in kept
            splits["dev" if dev else c["split"]].append(clip)
        if not splits["dev"]:  # too few recordings to keep some back
            splits["dev"] = splits["train"]
        return splits

    def clips(self, kind: str, split: str) -> list[Clip]:
        splits = self._clips[kind]
        if splits[UNSEEN] and split != UNSEEN:
            raise ValueError(f"{self._folder} holds unseen collections: for the bench, not for training")
        return splits[split]

    def of_all_splits(self, kind: str) -> list[Clip]:
        return [clip for clips in self._clips[kind].values() for clip in clips]

    def groups(self, kind: str, split: str) -> dict[str, list[Clip]]:
        """Clips by speaker or category."""
        groups: dict[str, list[Clip]] = defaultdict(list)
        for clip in self.clips(kind, split):
            groups[clip.group].append(clip)
        return dict(groups)

    def voices(self, split: str, band: str) -> dict[str, list[Clip]]:
        """Clips of one band by speaker."""
        found = {name: [c for c in clips if c.band == band] for name, clips in self.groups("speech", split).items()}
        return {name: clips for name, clips in found.items() if clips}

    def read(self, clip: Clip, offset: int = 0, length: int | None = None) -> np.ndarray:
        """Float32 on the 16-bit scale."""
        end = clip.length if length is None else min(clip.length, offset + length)
        return self._samples[clip.kind][clip.start + offset : clip.start + end].astype(np.float32)

    def rooms(self, split: str) -> list[np.ndarray]:
        """Room responses; validation hears the training split's."""
        prefix = "train-" if split == "dev" else f"{split}-"
        with np.load(self._folder / self._index["rooms"]) as archive:
            rooms = [archive[name] for name in sorted(archive.files) if name.startswith(prefix)]
        return [resample_poly(room, 1, self._base_rate // self.rate).astype(np.float32) for room in rooms]


def _mapped(file: Path) -> np.ndarray:
    return np.memmap(file, dtype="<i2", mode="r") if file.stat().st_size else np.zeros(0, "<i2")


def _scaled_start(start: int, ratio: int) -> int:
    return -(-start // ratio)


def _decimated(source: np.ndarray, clips: list[dict[str, Any]], ratio: int) -> np.ndarray:
    """The low-rate copy, clip by clip, so that no clip rings into its neighbour."""
    result = np.zeros(len(source) // ratio + len(clips) + 1, dtype="<i2")
    for clip in clips:
        start, length = int(clip["start"]), int(clip["length"])
        low = resample_poly(source[start : start + length].astype(np.float32), 1, ratio)
        first = _scaled_start(start, ratio)
        result[first : first + length // ratio] = to_int16(low[: length // ratio] / 32768.0)
    return result


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--data", type=Path, required=True, help="folder with speech.tsv, noise.tsv, rir.tsv")
    parser.add_argument("--store", type=Path, required=True, help="folder to write the decoded store to")
    parser.add_argument("--rate", type=int, default=BASE_RATE, help="of the samples; 48000 for the bench's full band")
    args = parser.parse_args()
    tables = {}
    for kind in (*KINDS, "rir"):
        table = args.data / f"{kind}.tsv"
        bare = kind in KINDS and not table.exists()
        tables[kind] = (
            rows_of_folder(args.data / kind, kind) if bare else read_manifest(table) if table.exists() else []
        )
    build(tables, args.data, args.store, args.rate)


if __name__ == "__main__":
    main()

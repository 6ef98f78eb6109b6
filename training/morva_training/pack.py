"""A store as a few files that can be carried to another machine: coded speech, noise and rooms.

    python -m morva_training.pack --store STORE --out FOLDER --megabytes 55 --parts 4
    python -m morva_training.unpack FOLDER/*.zip --store STORE

Each part is of use alone and holds something of everybody. Held-out recordings stay at home; what is kept back for
validation stays so. Clips of one kind lie one after the other in reels of a few minutes, coded as Opus: speech without
content above 8 kHz at 24 kHz, everything else at 48 kHz.
"""

from __future__ import annotations

import argparse
import io
import json
import zipfile
from collections.abc import Iterator
from dataclasses import asdict, dataclass
from pathlib import Path

import numpy as np
import soundfile
from scipy.signal import resample_poly

from .corpus import BASE_RATE, Clip, Corpus

GAP = BASE_RATE // 25  # samples of silence between the clips of a reel
REEL_SECONDS = 240
FINE, COARSE = 48000, 24000


@dataclass
class Stream:
    """Clips of one kind and band, in the order in which they are taken: one of everybody, then the next."""

    corpus: Corpus
    rate: int
    clips: list[tuple[Clip, str]]  # and their splits
    taken: int = 0

    @property
    def done(self) -> float:
        return self.taken / len(self.clips) if self.clips else 1.0

    def reel(self) -> tuple[bytes, dict]:
        """The next clips, coded, and what they are."""
        parts, listed, position = [], [], 0
        while self.taken < len(self.clips) and position < REEL_SECONDS * BASE_RATE:
            clip, split = self.clips[self.taken]
            self.taken += 1
            parts += [self.corpus.read(clip), np.zeros(GAP, np.float32)]
            listed.append({**asdict(clip), "start": position, "split": split, "recording": clip.recording})
            position += clip.length + GAP
        samples = resample_poly(np.concatenate(parts) / 32768.0, self.rate // 8000, BASE_RATE // 8000)
        coded = io.BytesIO()
        soundfile.write(coded, np.clip(samples, -1.0, 1.0), self.rate, format="OGG", subtype="OPUS")
        return coded.getvalue(), {"kind": listed[0]["kind"], "clips": listed}


def streams(corpus: Corpus, seed: int) -> list[Stream]:
    rng = np.random.default_rng(seed)
    found: dict[tuple[str, str], list[tuple[float, Clip, str]]] = {}
    for kind in ("speech", "noise"):
        for split in ("train", "dev"):
            for group in corpus.groups(kind, split).values():
                for rank, index in enumerate(rng.permutation(len(group))):
                    clip = group[index]
                    found.setdefault((kind, clip.band), []).append((rank + rng.random(), clip, split))
    return [
        Stream(corpus, COARSE if band == "8k" else FINE, [pair[1:] for pair in sorted(clips, key=lambda c: c[0])])
        for (_, band), clips in found.items()
    ]


def parts(corpus: Corpus, size: int, count: int, seed: int = 1) -> Iterator[tuple[bytes, dict[str, float]]]:
    """Archives of at most `size` bytes and the hours of each kind in them."""
    ready = streams(corpus, seed)
    rooms = io.BytesIO()
    np.savez_compressed(rooms, *(room.astype(np.float16) for room in corpus.rooms("train")))
    first: list[tuple[str, bytes]] = [("rooms.npz", rooms.getvalue())]
    waiting: tuple[bytes, dict] | None = None
    for _ in range(count):
        files, reels, used = list(first), [], sum(len(content) for _, content in first)
        first = []
        while waiting or any(stream.done < 1.0 for stream in ready):
            coded, about = waiting or min(ready, key=lambda stream: stream.done).reel()
            waiting = (coded, about)
            if used + len(coded) + 200 * len(about["clips"]) + 20000 > size:
                break
            waiting, used = None, used + len(coded) + 200 * len(about["clips"])
            files.append((f"{len(reels):03d}.ogg", coded))
            reels.append({**about, "file": files[-1][0]})
        if not reels:
            return
        hours = {
            kind: sum(clip["length"] for reel in reels if reel["kind"] == kind for clip in reel["clips"])
            / (3600 * BASE_RATE)
            for kind in ("speech", "noise")
        }
        yield archive([*files, ("index.json", json.dumps(reels).encode())]), hours


def archive(files: list[tuple[str, bytes]]) -> bytes:
    packed = io.BytesIO()
    with zipfile.ZipFile(packed, "w", zipfile.ZIP_DEFLATED) as zipped:
        for name, content in files:
            zipped.writestr(name, content, None if name.endswith("json") else zipfile.ZIP_STORED)
    return packed.getvalue()


def main(arguments: list[str] | None = None) -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True, help="folder for part-00.zip and so on")
    parser.add_argument("--megabytes", type=float, default=55.0, help="largest size of a part, in units of 10^6 bytes")
    parser.add_argument("--parts", type=int, default=1)
    args = parser.parse_args(arguments)
    args.out.mkdir(parents=True, exist_ok=True)
    for number, (content, hours) in enumerate(parts(Corpus(args.store), int(args.megabytes * 1e6), args.parts)):
        file = args.out / f"part-{number:02d}.zip"
        file.write_bytes(content)
        kinds = ", ".join(f"{value:.2f} h of {kind}" for kind, value in hours.items())
        print(f"{file}: {len(content) / 1e6:.1f} MB, {kinds}", flush=True)


if __name__ == "__main__":
    main()

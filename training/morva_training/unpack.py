"""A store from the parts that `pack` has made, decoded by all cores."""

from __future__ import annotations

import argparse
import io
import json
import multiprocessing
import os
import zipfile
from collections.abc import Iterable, Iterator
from concurrent.futures import ProcessPoolExecutor
from pathlib import Path

import numpy as np
import soundfile
from scipy.signal import resample_poly

from .corpus import BASE_RATE, KINDS, to_int16, write_store

Reel = tuple[Path, dict]


def decoded(reel: Reel) -> list[tuple[dict, np.ndarray]]:
    """The clips of a reel."""
    part, about = reel
    with zipfile.ZipFile(part) as zipped:
        samples, rate = soundfile.read(io.BytesIO(zipped.read(about["file"])), dtype="float32")
    samples = to_int16(resample_poly(samples, BASE_RATE // 8000, rate // 8000))
    return [(clip, samples[clip["start"] : clip["start"] + clip["length"]]) for clip in about["clips"]]


def reels_of(parts: list[Path]) -> tuple[list[Reel], dict[str, np.ndarray]]:
    """What the parts hold, and the rooms."""
    reels: list[Reel] = []
    rooms: dict[str, np.ndarray] = {}
    for part in parts:
        with zipfile.ZipFile(part) as zipped:
            reels += [(part, about) for about in json.loads(zipped.read("index.json"))]
            if "rooms.npz" in zipped.namelist():
                with np.load(io.BytesIO(zipped.read("rooms.npz"))) as responses:
                    found = [responses[name].astype(np.float32) for name in responses.files]
                rooms = {f"train-{number:04d}": room for number, room in enumerate(found)}
    return reels, rooms


def unpack(parts: list[Path], store: Path, processes: int) -> None:
    reels, rooms = reels_of(parts)
    with ProcessPoolExecutor(processes, multiprocessing.get_context("spawn")) as workers:

        def clips(kind: str) -> Iterator[tuple[dict, np.ndarray]]:
            of_kind: Iterable[Reel] = [reel for reel in reels if reel[1]["kind"] == kind]
            for some in workers.map(decoded, of_kind):
                yield from some

        write_store({kind: clips(kind) for kind in KINDS}, rooms, store, BASE_RATE)


def main(arguments: list[str] | None = None) -> None:
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("parts", type=Path, nargs="+")
    parser.add_argument("--store", type=Path, required=True, help="folder to write the store to")
    parser.add_argument("--processes", type=int, default=os.cpu_count())
    args = parser.parse_args(arguments)
    unpack(args.parts, args.store, args.processes)


if __name__ == "__main__":
    main()

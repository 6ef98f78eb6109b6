"""Cleans folders of recordings: python -m morva.batch recordings -o cleaned

Files are cleaned side by side on threads, as the engine works outside the interpreter lock. An output
appears only when it is complete. The journal beside the outputs holds one line per finished file, so
that a run that was stopped goes on where it was; changed sources and failed files are done again.
Files that fail are listed at the end and in the journal, and the status is 1. Interrupted or terminated,
it leaves what is under way and the status is 130 or 143.
"""

from __future__ import annotations

import argparse
import json
import math
import os
import signal
import sys
import threading
from collections.abc import Callable, Iterable, Iterator
from concurrent.futures import ThreadPoolExecutor, as_completed
from dataclasses import dataclass
from pathlib import Path
from typing import Any

from tqdm import tqdm

from ._files import clean_file

JOURNAL = "morva-batch.jsonl"
KEPT = (".wav", ".flac", ".ogg", ".oga")
ENDINGS = (*KEPT, ".opus", ".mp3", ".aiff", ".aif", ".aifc", ".au", ".caf", ".w64", ".rf64")  # become .wav


@dataclass(frozen=True)
class Job:
    """One file; `settings` are keyword arguments of denoise_file."""

    source: Path
    target: Path
    settings: dict[str, Any]

    def fingerprint(self) -> str:
        """Changes with the source's content and the settings."""
        state = self.source.stat()
        return f"{state.st_size} {state.st_mtime_ns} {json.dumps(self.settings, sort_keys=True)}"


def plan(inputs: Iterable[Path], output: Path, settings: dict[str, Any]) -> list[Job]:
    """Every sound file below the inputs, with its place below the output."""
    jobs: dict[Path, Job] = {}
    for given in inputs:
        if not given.exists():
            raise FileNotFoundError(f"{given}: no such file or folder")
        base = given if given.is_dir() else given.parent
        files = sorted(given.rglob("*")) if given.is_dir() else [given]
        for source in files:
            if source.suffix.lower() not in ENDINGS or not source.is_file():
                continue
            target = output / source.relative_to(base)
            if target.suffix.lower() not in KEPT:
                target = target.with_suffix(".wav")
            if target in jobs:
                raise ValueError(f"{source} and {jobs[target].source} would both become {target}")
            if target.resolve() == source.resolve():
                raise ValueError(f"{source} would be overwritten")
            if output.resolve() in source.resolve().parents and given.is_dir():
                continue  # an earlier result inside the input folder
            jobs[target] = Job(source, target, settings)
    return list(jobs.values())


class Journal:
    """What is done, one JSON object per line; a line cut by a crash is ignored."""

    def __init__(self, folder: Path) -> None:
        folder.mkdir(parents=True, exist_ok=True)
        self._path = folder / JOURNAL
        self._lock = threading.Lock()
        self._done: dict[str, str] = {}
        for entry in self._read():
            if entry.get("error") is None:
                self._done[entry["target"]] = entry["fingerprint"]
            else:
                self._done.pop(entry["target"], None)

    def _read(self) -> Iterator[dict[str, Any]]:
        if not self._path.exists():
            return
        for line in self._path.read_text().splitlines():
            try:
                yield json.loads(line)
            except json.JSONDecodeError:
                continue

    def is_done(self, job: Job) -> bool:
        return job.target.exists() and self._done.get(str(job.target)) == job.fingerprint()

    def add(self, job: Job, error: str | None) -> None:
        entry = {
            "source": str(job.source),
            "target": str(job.target),
            "fingerprint": job.fingerprint() if job.source.exists() else "",
            "error": error,
        }
        # The leading newline ends a line that a crash may have cut.
        with self._lock, self._path.open("a") as file:
            file.write("\n" + json.dumps(entry))


class Stopped(BaseException):
    """Raised in the work under way when a signal has come."""


class Stop:
    """While it is open, the first signal that would end the program is noted; a second one ends it at once."""

    number = 0

    def __enter__(self) -> Stop:
        self._before = {number: signal.signal(number, self._note) for number in (signal.SIGINT, signal.SIGTERM)}
        return self

    def __exit__(self, *_: object) -> None:
        for number, handler in self._before.items():
            signal.signal(number, handler)

    def _note(self, number: int, _: object) -> None:
        self.number = number
        signal.signal(number, signal.SIG_DFL)

    def check(self, *_: object) -> None:
        if self.number:
            raise Stopped


def clean(job: Job, advance: Callable[[int, int], object]) -> str | None:
    """The error's text, or nothing when the file is done."""
    try:
        job.target.parent.mkdir(parents=True, exist_ok=True)
        clean_file(job.source, job.target, advance, **job.settings)
    except Exception as error:
        return f"{type(error).__name__}: {error}"
    return None


def run(jobs: list[Job], journal: Journal, workers: int, stop: Stop, *, progress: bool = True) -> dict[str, str]:
    """Cleans what is not done yet; returns the failures by source. Raises Stopped."""
    todo = [job for job in jobs if not journal.is_done(job)]
    if len(todo) < len(jobs):
        print(f"{len(jobs) - len(todo)} of {len(jobs)} files are done already", file=sys.stderr)

    def noted(job: Job) -> str | None:
        stop.check()
        error = clean(job, stop.check)
        journal.add(job, error)
        return error

    failures: dict[str, str] = {}
    pool = ThreadPoolExecutor(workers)
    try:
        futures = {pool.submit(noted, job): job for job in todo}
        for future in tqdm(as_completed(futures), total=len(todo), unit="file", disable=not progress):
            if (error := future.result()) is not None:
                failures[str(futures[future].source)] = error
    finally:
        pool.shutdown(cancel_futures=True)  # when stopped: no others are begun
    return failures


def main(arguments: list[str] | None = None) -> int:
    parser = argparse.ArgumentParser(
        prog="python -m morva.batch", description="Clean folders of recordings, resumably."
    )
    parser.add_argument("inputs", nargs="+", type=Path, help="sound files and folders")
    parser.add_argument("-o", "--output", required=True, type=Path, help="folder of the results")
    parser.add_argument("--workers", type=int, default=os.cpu_count() or 1, help="files at a time")
    parser.add_argument("--model", help="shipped model's file name or path of a weight file")
    parser.add_argument("--frame", type=int, default=10, choices=(10, 20, 30, 40), help="milliseconds")
    parser.add_argument("--attenuation-limit", type=float, default=math.inf, help="decibels")
    parser.add_argument("--quiet", action="store_true", help="no progress bar")
    options = parser.parse_args(arguments)
    settings = {
        "frame_ms": options.frame,
        "model": options.model,
        "attenuation_limit_db": options.attenuation_limit,
    }
    try:
        jobs = plan([i.absolute() for i in options.inputs], options.output.absolute(), settings)
    except (OSError, ValueError) as error:
        print(f"morva.batch: {error}", file=sys.stderr)
        return 2
    with Stop() as stop:
        try:
            failures = run(jobs, Journal(options.output), options.workers, stop, progress=not options.quiet)
        except Stopped:
            print("morva.batch: stopped; the same command goes on from here", file=sys.stderr)
            return 128 + stop.number
    for source, reason in failures.items():
        print(f"{source}: {reason}", file=sys.stderr)
    print(f"{len(jobs) - len(failures)} of {len(jobs)} files cleaned", file=sys.stderr)
    return 1 if failures else 0


if __name__ == "__main__":
    sys.exit(main())

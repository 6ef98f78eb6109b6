"""Scores noise suppressors on folders of noisy/clean pairs and prints tables.

    python bench/quality/score.py FOLDER none ours=models/c6.xs.f.ca03f4.mvw "peer=some-program --flag"

FOLDER holds `noisy/` and `clean/` with files of the same names, as mixtures.py makes them. Means over the pairs:
PESQ (wide band), STOI, SI-SDR and its gain in dB, attenuation of the noise in pauses in dB; where the clean file equals
the noisy one, SI-SDR, PESQ and the change of level count instead; where the noise is faint, PESQ.
A second table holds ratings: the composite ones CSIG, CBAK, COVL, the log-likelihood ratio of the envelopes, and with
`--dnsmos NETWORK` that network's SIG, BAK and OVRL. A third one says what of the speech itself is lost, in medians and
dB: consonants above 4 kHz, the first 30 ms of words, what lies above 8 kHz, and each octave. With `none` among the
systems a fourth one says how many recordings are worse than their input, in per cent. `--by` tells the pairs apart by
what pairs.json says.

A recording without a figure for one system (digital silence has no PESQ) counts for none of them; the last row of a
table counts the recordings. `--json` keeps every figure, and `--with` takes systems from such a file into the tables
instead of scoring them again.
"""

from __future__ import annotations

import argparse
import json
import multiprocessing
from collections.abc import Iterable
from concurrent.futures import ProcessPoolExecutor
from dataclasses import dataclass
from functools import lru_cache
from pathlib import Path
from typing import Any

import numpy as np
import soundfile
from tqdm import tqdm

import composite
import lost_speech
import metrics
import systems
import tree  # noqa: F401
from dnsmos import Dnsmos
from morva_training.measures import level_db, si_sdr

SOUND = {
    "pesq": "PESQ",
    "stoi": "STOI",
    "si_sdr": "SI-SDR",
    "si_sdr_gain": "gain",
    "pause": "pauses",
    "clean_si_sdr": "clean SI-SDR",
    "clean_pesq": "clean PESQ",
    "clean_level": "clean level",
    "faint_pesq": "faint PESQ",
}
RATINGS = {"sig": "SIG", "bak": "BAK", "ovrl": "OVRL", "csig": "CSIG", "cbak": "CBAK", "covl": "COVL", "llr": "LLR"}
LOSSES = {
    "consonants": "consonants",
    "onsets": "onsets",
    "treble": "treble",
    **{f"octave_{low}": f"{low} Hz" for low in lost_speech.OCTAVES_HZ},
}
COMPARED = ("pesq", "stoi", "si_sdr")  # with the input
WORSE = {f"{column}_worse": f"{SOUND[column]} worse" for column in COMPARED}
TABLES = (SOUND, RATINGS, LOSSES, WORSE)
HEADS = {column: head for table in TABLES for column, head in table.items()}
IN_PART = (*COMPARED, "pause", "sig", "ovrl", "covl", "llr", "consonants", "onsets", *WORSE)  # told apart by `--by`

Row = dict[str, Any]  # a recording's "name" and its figures
Results = dict[str, list[Row]]  # by system


@dataclass(frozen=True)
class Task:
    """One system on one recording."""

    system: str  # as on the command line
    noisy: Path
    clean: Path
    rate: int | None
    network: Path | None
    faint: bool


def of_the_speech(reference: np.ndarray, result: np.ndarray, rate: int, pesq: float) -> dict[str, float]:
    lost = lost_speech.losses(reference, result, rate)
    octaves = {f"octave_{low}": loss for low, loss in lost.octaves.items()}
    ratings = composite.composite(reference, result, rate, pesq)._asdict() if rate >= composite.RATE else {}
    return {**ratings, "consonants": lost.consonants, "onsets": lost.onsets, "treble": lost.treble, **octaves}


def score_pair(
    noisy: np.ndarray,
    clean: np.ndarray,
    result: np.ndarray,
    rate: int,
    rater: Dnsmos | None = None,
    faint: bool = False,
) -> dict[str, float]:
    reference, shifted = metrics.aligned(clean, result, rate)
    pesq = metrics.pesq_score(reference, shifted, rate)
    if faint:
        return {"faint_pesq": pesq}
    if np.array_equal(noisy, clean):
        return {
            "clean_si_sdr": si_sdr(reference, shifted),
            "clean_pesq": pesq,
            "clean_level": level_db(shifted) - level_db(reference),
        }
    return {
        "pesq": pesq,
        "stoi": metrics.stoi_score(reference, shifted, rate),
        "si_sdr": si_sdr(reference, shifted),
        "si_sdr_gain": si_sdr(reference, shifted) - si_sdr(clean, noisy),
        "pause": metrics.pause_attenuation(reference, noisy[: len(reference)], shifted, rate),
        **of_the_speech(reference, shifted, rate, pesq),
        **(dict(zip(("sig", "bak", "ovrl"), rater(result, rate))) if rater else {}),
    }


def read(path: Path, rate: int | None) -> tuple[np.ndarray, int]:
    rate = rate or soundfile.info(path).samplerate
    return systems.read(path, rate).astype(np.float32), rate


process_of = lru_cache(systems.parse)
rater_of = lru_cache(Dnsmos)


def row_of(task: Task) -> Row:
    noisy, rate = read(task.noisy, task.rate)
    clean, _ = read(task.clean, task.rate)
    result = process_of(task.system)[1](noisy, rate, task.noisy.stem)
    rater = rater_of(task.network) if task.network else None
    return {"name": task.noisy.stem, **score_pair(noisy, clean, result, rate, rater, task.faint)}


def rows_of(tasks: list[Task], jobs: int, name: str) -> list[Row]:
    progress = {"desc": name, "total": len(tasks), "mininterval": 5.0}
    if jobs == 1:
        return list(tqdm(map(row_of, tasks), **progress))
    with ProcessPoolExecutor(jobs, multiprocessing.get_context("spawn")) as pool:
        return list(tqdm(pool.map(row_of, tasks, chunksize=4), **progress))


def thinned(files: list[Path], limit: int) -> list[Path]:
    return files[:: -(-len(files) // limit)] if limit and limit < len(files) else files


def add_comparison(results: Results) -> None:
    """For each recording, whether a system is below the input as it is (`none`): 100 or 0, so that means are per cent."""
    before = {row["name"]: row for row in results.get("none", [])}
    for row in (row for rows in results.values() for row in rows if row["name"] in before):
        for column in COMPARED:
            pair = row.get(column, np.nan), before[row["name"]].get(column, np.nan)
            if np.isfinite(pair).all():
                row[f"{column}_worse"] = 100.0 * (pair[0] < pair[1])


def counted(results: Results, column: str) -> set[str]:
    """The recordings for which every system has a figure: no system is judged on others than its peers."""
    having = [{r["name"] for r in rows if np.isfinite(r.get(column, np.nan))} for rows in results.values()]
    return set.intersection(*having)


def middles(results: Results) -> dict[str, dict[str, float]]:
    """By system and column the mean, or of losses the median: they have no limit. NaN where no recording counts."""
    names = {column: counted(results, column) for column in HEADS}

    def middle(rows: list[Row], column: str) -> float:
        values = [r[column] for r in rows if r["name"] in names[column]] or [np.nan]
        return float(np.median(values) if column in LOSSES else np.mean(values))

    return {system: {column: middle(rows, column) for column in HEADS} for system, rows in results.items()}


def omissions(results: Results) -> list[str]:
    """A line for each system and column with recordings that have no figure and so count for nobody."""
    lines = []
    for system, rows in results.items():
        for column in (*SOUND, *RATINGS):
            lost = [r["name"] for r in rows if column in r and not np.isfinite(r[column])]
            if lost and column != "pause":  # not every recording has a long one
                lines.append(f"{system} has no {HEADS[column]} on {len(lost)} recordings: {', '.join(lost[:5])}")
    return lines


def cells(values: dict[str, float], columns: Iterable[str]) -> str:
    def cell(column: str) -> str:
        digits = 0 if column in WORSE else 2 if column in RATINGS else 3 if "pesq" in column or column == "stoi" else 1
        return f"{values[column]:.{digits}f}"

    return " | ".join(map(cell, columns))


def table(results: Results, columns: Iterable[str], part: str = "") -> str:
    """`part`, which part of the recordings this is, stands in a first column."""
    shown = [c for c in columns if counted(results, c)]
    first = f"| {part} " if part else ""
    lines = [f"| {'part | ' if part else ''}system | " + " | ".join(HEADS[c] for c in shown) + " |"]
    lines += ["|---" * (len(shown) + 1 + bool(part)) + "|"]
    lines += [f"{first}| {system} | {cells(values, shown)} |" for system, values in middles(results).items()]
    lines += [f"{first}| recordings | " + " | ".join(str(len(counted(results, c))) for c in shown) + " |"]
    return "\n".join(lines)


def tables_by(results: Results, field: str, pairs: list[dict[str, Any]]) -> str:
    """A table for each value that the field has in pairs.json, of the pairs with noise."""
    noisy = {p["name"]: p[field] for p in pairs if p["noise"]}
    parts = []
    for value in sorted(set(noisy.values())):
        part = {s: [r for r in rows if noisy.get(r["name"]) == value] for s, rows in results.items()}
        parts.append(table(part, IN_PART, f"{value} dB" if field == "snr_db" else str(value)))
    return "\n\n".join(parts)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder", type=Path)
    parser.add_argument("systems", nargs="*", help="none, NAME=model.mvw, NAME=folder or NAME=command")
    parser.add_argument("--limit", type=int, default=0, help="score about so many pairs only")
    parser.add_argument("--rate", type=int, help="resample the pairs first, e.g. 16000")
    parser.add_argument("--by", nargs="+", default=[], metavar="FIELD", help="snr_db, place, band, speaker ...")
    parser.add_argument("--dnsmos", type=Path, metavar="NETWORK", help="sig_bak_ovr.onnx of DNSMOS P.835")
    parser.add_argument("--jobs", type=int, default=1, help="processes")
    parser.add_argument("--json", type=Path, help="write every pair's scores here")
    parser.add_argument("--with", type=Path, dest="earlier", metavar="JSON", help="systems scored before")
    args = parser.parse_args()
    listing = args.folder / "pairs.json"
    pairs = json.loads(listing.read_text()) if listing.exists() else []
    faint = {p["name"] for p in pairs if p.get("faint")}
    files = thinned(sorted((args.folder / "noisy").glob("*.wav")), args.limit)
    results: Results = json.loads(args.earlier.read_text()) if args.earlier else {}
    for text in args.systems:
        name, _ = systems.parse(text)
        clean = args.folder / "clean"
        tasks = [Task(text, f, clean / f.name, args.rate, args.dnsmos, f.stem in faint) for f in files]
        results[name] = rows_of(tasks, args.jobs, name)
        if args.json:
            args.json.write_text(json.dumps(results, indent=1))
    add_comparison(results)
    shown = [table(results, columns) for columns in TABLES if any(counted(results, c) for c in columns)]
    print("\n\n".join([*shown, *omissions(results), *(tables_by(results, field, pairs) for field in args.by)]))


if __name__ == "__main__":
    main()

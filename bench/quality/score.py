"""Scores noise suppressors on folders of noisy/clean pairs and prints one table.

    python bench/quality/score.py FOLDER none ours=models/c6.xs.f.ca03f4.mvw "peer=some-program --flag"

FOLDER holds `noisy/` and `clean/` with files of the same names. Where the clean file equals the
noisy one, the pair counts for the no-harm figures instead. Means over the pairs:
PESQ (wide band), STOI, SI-SDR and its gain in dB, attenuation of the noise in pauses in dB, and
for clean speech SI-SDR, PESQ and the change of level. A recording without a figure for one system
(digital silence has no PESQ) counts for none of them. With `--by-snr` (pairs of mixtures.py) a second
table tells the ratios apart.
"""

from __future__ import annotations

import argparse
import json
from collections.abc import Iterable
from pathlib import Path
from typing import Any

import numpy as np
import soundfile
from tqdm import tqdm

import metrics
import systems
import tree  # noqa: F401
from morva_training.measures import level_db, si_sdr

HEADS = {
    "pesq": "PESQ",
    "stoi": "STOI",
    "si_sdr": "SI-SDR",
    "si_sdr_gain": "gain",
    "pause": "pauses",
    "clean_si_sdr": "clean SI-SDR",
    "clean_pesq": "clean PESQ",
    "clean_level": "clean level",
}
COLUMNS = tuple(HEADS)

Row = dict[str, Any]  # a recording's "name" and its figures
Results = dict[str, list[Row]]  # by system


def score_pair(noisy: np.ndarray, clean: np.ndarray, rate: int, process: systems.Process) -> dict[str, float]:
    result = process(noisy, rate)
    reference, shifted = metrics.aligned(clean, result, rate)
    if np.array_equal(noisy, clean):
        return {
            "clean_si_sdr": si_sdr(reference, shifted),
            "clean_pesq": metrics.pesq_score(reference, shifted, rate),
            "clean_level": level_db(shifted) - level_db(reference),
        }
    return {
        "pesq": metrics.pesq_score(reference, shifted, rate),
        "stoi": metrics.stoi_score(reference, shifted, rate),
        "si_sdr": si_sdr(reference, shifted),
        "si_sdr_gain": si_sdr(reference, shifted) - si_sdr(clean, noisy),
        "pause": metrics.pause_attenuation(reference, noisy[: len(reference)], shifted, rate),
    }


def read(path: Path, rate: int | None) -> tuple[np.ndarray, int]:
    samples, file_rate = soundfile.read(path, dtype="float32", always_2d=True)
    mono = samples[:, 0]
    return (mono, file_rate) if rate is None else (metrics.at_rate(mono, file_rate, rate).astype(np.float32), rate)


def score(folder: Path, process: systems.Process, limit: int, rate: int | None, name: str) -> list[Row]:
    files = sorted((folder / "noisy").glob("*.wav"))
    if limit and limit < len(files):
        files = files[:: -(-len(files) // limit)]
    rows = []
    for path in tqdm(files, desc=name, mininterval=5.0):
        noisy, file_rate = read(path, rate)
        clean, _ = read(folder / "clean" / path.name, rate)
        rows.append({"name": path.stem, **score_pair(noisy, clean, file_rate, process)})
    return rows


def counted(results: Results, column: str) -> set[str]:
    """The recordings for which every system has a figure: no system is judged on others than its peers."""
    having = [{r["name"] for r in rows if np.isfinite(r.get(column, np.nan))} for rows in results.values()]
    return set.intersection(*having)


def means(results: Results) -> dict[str, dict[str, float]]:
    """By system and column; NaN where no recording counts."""
    names = {column: counted(results, column) for column in COLUMNS}

    def mean(rows: list[Row], column: str) -> float:
        return float(np.mean([r[column] for r in rows if r["name"] in names[column]] or [np.nan]))

    return {system: {column: mean(rows, column) for column in COLUMNS} for system, rows in results.items()}


def omissions(results: Results) -> list[str]:
    """A line for each system and column with recordings that have no figure and so count for nobody."""
    lines = []
    for system, rows in results.items():
        for column in COLUMNS:
            lost = [r["name"] for r in rows if column in r and not np.isfinite(r[column])]
            if lost and column != "pause":  # not every recording has a pause
                lines.append(f"{system} has no {HEADS[column]} on {len(lost)} recordings: {', '.join(lost[:5])}")
    return lines


def cells(values: dict[str, float], columns: Iterable[str]) -> str:
    return " | ".join(f"{values[c]:.3f}" if "pesq" in c or c == "stoi" else f"{values[c]:.1f}" for c in columns)


def table(results: Results) -> str:
    lines = ["| system | " + " | ".join(HEADS.values()) + " |", "|---" * (len(HEADS) + 1) + "|"]
    lines += [f"| {system} | {cells(values, COLUMNS)} |" for system, values in means(results).items()]
    return "\n".join([*lines, *omissions(results)])


def table_by_snr(results: Results, snr_of: dict[str, float | None]) -> str:
    columns = [c for c in COLUMNS if not c.startswith("clean")]
    lines = ["| SNR | system | " + " | ".join(HEADS[c] for c in columns) + " |", "|---" * (len(columns) + 2) + "|"]
    scored = {snr_of.get(row["name"]) for rows in results.values() for row in rows}
    for snr in sorted(scored - {None}):
        part = {s: [r for r in rows if snr_of.get(r["name"]) == snr] for s, rows in results.items()}
        lines += [f"| {snr:g} dB | {system} | {cells(values, columns)} |" for system, values in means(part).items()]
    return "\n".join(lines)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder", type=Path)
    parser.add_argument("systems", nargs="+", help="none, NAME=model.mvw or NAME=command")
    parser.add_argument("--limit", type=int, default=0, help="score about so many pairs only")
    parser.add_argument("--rate", type=int, help="resample the pairs first, e.g. 16000")
    parser.add_argument("--by-snr", action="store_true")
    parser.add_argument("--json", type=Path, help="write every pair's scores here")
    args = parser.parse_args()
    results = {}
    for text in args.systems:
        name, process = systems.parse(text)
        results[name] = score(args.folder, process, args.limit, args.rate, name)
    print(table(results))
    if args.by_snr:
        pairs = json.loads((args.folder / "pairs.json").read_text())
        print("\n" + table_by_snr(results, {p["name"]: p["snr_db"] for p in pairs}))
    if args.json:
        args.json.write_text(json.dumps(results, indent=1))


if __name__ == "__main__":
    main()

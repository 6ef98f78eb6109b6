"""Scores noise suppressors on folders of noisy/clean pairs and prints one table.

    python bench/quality/score.py FOLDER none ours=models/c6.xs.f.ca03f4.mvw "peer=some-program --flag"

FOLDER holds `noisy/` and `clean/` with files of the same names. Where the clean file equals the
noisy one, the pair counts for the no-harm figures instead. Means over the pairs:
PESQ (wide band), STOI, SI-SDR and its gain in dB, attenuation of the noise in pauses in dB, and
for clean speech SI-SDR, PESQ and the change of level.
"""

from __future__ import annotations

import argparse
import json
from pathlib import Path

import numpy as np
import soundfile
from tqdm import tqdm

import metrics
import systems

COLUMNS = ("pesq", "stoi", "si_sdr", "si_sdr_gain", "pause", "clean_si_sdr", "clean_pesq", "clean_level")
HEADS = ("PESQ", "STOI", "SI-SDR", "gain", "pauses", "clean SI-SDR", "clean PESQ", "clean level")


def score_pair(noisy: np.ndarray, clean: np.ndarray, rate: int, process: systems.Process) -> dict[str, float]:
    result = process(noisy, rate)
    reference, shifted = metrics.aligned(clean, result, rate)
    if np.array_equal(noisy, clean):
        return {
            "clean_si_sdr": metrics.si_sdr(reference, shifted),
            "clean_pesq": metrics.pesq_score(reference, shifted, rate),
            "clean_level": metrics.level_db(shifted) - metrics.level_db(reference),
        }
    return {
        "pesq": metrics.pesq_score(reference, shifted, rate),
        "stoi": metrics.stoi_score(reference, shifted, rate),
        "si_sdr": metrics.si_sdr(reference, shifted),
        "si_sdr_gain": metrics.si_sdr(reference, shifted) - metrics.si_sdr(clean, noisy),
        "pause": metrics.pause_attenuation(reference, noisy[: len(reference)], shifted, rate),
    }


def read(path: Path, rate: int | None) -> tuple[np.ndarray, int]:
    samples, file_rate = soundfile.read(path, dtype="float32", always_2d=True)
    mono = samples[:, 0]
    return (mono, file_rate) if rate is None else (metrics.at_rate(mono, file_rate, rate).astype(np.float32), rate)


def score(folder: Path, process: systems.Process, limit: int, rate: int | None, name: str) -> list[dict[str, float]]:
    files = sorted((folder / "noisy").glob("*.wav"))
    if limit and limit < len(files):
        files = files[:: -(-len(files) // limit)]
    rows = []
    for path in tqdm(files, desc=name, mininterval=5.0):
        noisy, file_rate = read(path, rate)
        clean, _ = read(folder / "clean" / path.name, rate)
        rows.append({"name": path.stem, **score_pair(noisy, clean, file_rate, process)})
    return rows


def means(rows: list[dict[str, float]]) -> dict[str, float]:
    def mean(column: str) -> float:
        values = [row[column] for row in rows if column in row and np.isfinite(row[column])]
        return float(np.mean(values)) if values else float("nan")

    return {column: mean(column) for column in COLUMNS}


def table(results: dict[str, list[dict[str, float]]]) -> str:
    lines = ["| system | " + " | ".join(HEADS) + " |", "|---" * (len(HEADS) + 1) + "|"]
    for name, rows in results.items():
        values = means(rows)
        cells = [f"{values[c]:.3f}" if "pesq" in c or c == "stoi" else f"{values[c]:.1f}" for c in COLUMNS]
        lines.append(f"| {name} | " + " | ".join(cells) + " |")
    return "\n".join(lines)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder", type=Path)
    parser.add_argument("systems", nargs="+", help="none, NAME=model.mvw or NAME=command")
    parser.add_argument("--limit", type=int, default=0, help="score about so many pairs only")
    parser.add_argument("--rate", type=int, help="resample the pairs first, e.g. 16000")
    parser.add_argument("--json", type=Path, help="write every pair's scores here")
    args = parser.parse_args()
    results = {}
    for text in args.systems:
        name, process = systems.parse(text)
        results[name] = score(args.folder, process, args.limit, args.rate, name)
    print(table(results))
    if args.json:
        args.json.write_text(json.dumps(results, indent=1))


if __name__ == "__main__":
    main()

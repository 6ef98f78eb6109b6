"""Scores noise suppressors on folders of noisy/clean pairs and prints tables.

    python bench/quality/score.py FOLDER none ours=models/c6.xs.f.ca03f4.mvw "peer=some-program --flag"

FOLDER holds `noisy/` and `clean/` with files of the same names. Where the clean file equals the
noisy one, the pair counts for the no-harm figures instead. Means over the pairs:
PESQ (wide band), STOI, SI-SDR and its gain in dB, attenuation of the noise in pauses in dB, and
for clean speech SI-SDR, PESQ and the change of level. A second table says what happens to the speech:
the composite ratings CSIG, CBAK, COVL and the log-likelihood ratio of the envelopes, what is lost of
consonants above 4 kHz, of the first 30 ms of words, above 8 kHz and of each octave in dB, and with
`--dnsmos NETWORK` the ratings SIG, BAK and OVRL of that network. With `none` among the systems a third one
says how many recordings are worse than their input.

A recording without a figure for one system
(digital silence has no PESQ) counts for none of them. With `--by-snr` (pairs of mixtures.py) the ratios
are told apart.
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
}
SPEECH = {
    "csig": "CSIG",
    "cbak": "CBAK",
    "covl": "COVL",
    "llr": "LLR",
    "consonants": "consonants",
    "onsets": "onsets",
    "treble": "treble",
    **{f"octave_{low}": f"{low} Hz" for low in lost_speech.OCTAVES_HZ},
    "sig": "SIG",
    "bak": "BAK",
    "ovrl": "OVRL",
}
HEADS = SOUND | SPEECH
UNIT_RATES = {"stoi", "csig", "cbak", "covl", "llr", "sig", "bak", "ovrl"}  # beside PESQ, not in dB
NOT_EVERYWHERE = {"pause", "consonants", "onsets", "treble"}  # not every recording has some
COMPARED = ("pesq", "stoi", "si_sdr")  # with the input

Row = dict[str, Any]  # a recording's "name" and its figures
Results = dict[str, list[Row]]  # by system


def of_the_speech(reference: np.ndarray, result: np.ndarray, rate: int, pesq: float) -> dict[str, float]:
    lost = lost_speech.losses(reference, result, rate)
    octaves = {f"octave_{low}": loss for low, loss in lost.octaves.items()}
    ratings = composite.composite(reference, result, rate, pesq)._asdict() if rate >= composite.RATE else {}
    return {**ratings, "consonants": lost.consonants, "onsets": lost.onsets, "treble": lost.treble, **octaves}


def score_pair(
    noisy: np.ndarray, clean: np.ndarray, rate: int, process: systems.Process, rater: Dnsmos | None = None
) -> dict[str, float]:
    result = process(noisy, rate)
    reference, shifted = metrics.aligned(clean, result, rate)
    if np.array_equal(noisy, clean):
        return {
            "clean_si_sdr": si_sdr(reference, shifted),
            "clean_pesq": metrics.pesq_score(reference, shifted, rate),
            "clean_level": level_db(shifted) - level_db(reference),
        }
    pesq = metrics.pesq_score(reference, shifted, rate)
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
    samples, file_rate = soundfile.read(path, dtype="float32", always_2d=True)
    mono = samples[:, 0]
    return (mono, file_rate) if rate is None else (metrics.at_rate(mono, file_rate, rate).astype(np.float32), rate)


def score(
    folder: Path, process: systems.Process, limit: int, rate: int | None, name: str, rater: Dnsmos | None = None
) -> list[Row]:
    files = sorted((folder / "noisy").glob("*.wav"))
    if limit and limit < len(files):
        files = files[:: -(-len(files) // limit)]
    rows = []
    for path in tqdm(files, desc=name, mininterval=5.0):
        noisy, file_rate = read(path, rate)
        clean, _ = read(folder / "clean" / path.name, rate)
        rows.append({"name": path.stem, **score_pair(noisy, clean, file_rate, process, rater)})
    return rows


def counted(results: Results, column: str) -> set[str]:
    """The recordings for which every system has a figure: no system is judged on others than its peers."""
    having = [{r["name"] for r in rows if np.isfinite(r.get(column, np.nan))} for rows in results.values()]
    return set.intersection(*having)


def means(results: Results) -> dict[str, dict[str, float]]:
    """By system and column; NaN where no recording counts."""
    names = {column: counted(results, column) for column in HEADS}

    def mean(rows: list[Row], column: str) -> float:
        return float(np.mean([r[column] for r in rows if r["name"] in names[column]] or [np.nan]))

    return {system: {column: mean(rows, column) for column in HEADS} for system, rows in results.items()}


def omissions(results: Results) -> list[str]:
    """A line for each system and column with recordings that have no figure and so count for nobody."""
    lines = []
    for system, rows in results.items():
        for column in HEADS:
            lost = [r["name"] for r in rows if column in r and not np.isfinite(r[column])]
            if lost and column not in NOT_EVERYWHERE and not column.startswith("octave"):
                lines.append(f"{system} has no {HEADS[column]} on {len(lost)} recordings: {', '.join(lost[:5])}")
    return lines


def cells(values: dict[str, float], columns: Iterable[str]) -> str:
    return " | ".join(f"{values[c]:.3f}" if "pesq" in c or c in UNIT_RATES else f"{values[c]:.1f}" for c in columns)


def columns_with_figures(results: Results, columns: Iterable[str]) -> list[str]:
    return [c for c in columns if any(np.isfinite(r.get(c, np.nan)) for rows in results.values() for r in rows)]


def table(results: Results, columns: Iterable[str]) -> str:
    shown = columns_with_figures(results, columns)
    lines = ["| system | " + " | ".join(HEADS[c] for c in shown) + " |", "|---" * (len(shown) + 1) + "|"]
    lines += [f"| {system} | {cells(values, shown)} |" for system, values in means(results).items()]
    return "\n".join(lines)


def worse_than_input(results: Results) -> str:
    """The share of recordings on which a system is below the input as it is (`none`)."""
    before = {row["name"]: row for row in results["none"]}
    lines = ["| worse than the input | " + " | ".join(HEADS[c] for c in COMPARED) + " |", "|---" * 4 + "|"]
    for system, rows in results.items():
        shares = []
        for column in COMPARED:
            names = counted(results, column)
            worse = [r[column] < before[r["name"]][column] for r in rows if r["name"] in names]
            shares.append(f"{100 * np.mean(worse or [np.nan]):.0f} %")
        lines.append(f"| {system} | " + " | ".join(shares) + " |")
    return "\n".join(lines)


def table_by_snr(results: Results, snr_of: dict[str, float | None]) -> str:
    columns = columns_with_figures(results, (c for c in HEADS if not c.startswith("clean")))
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
    parser.add_argument("--dnsmos", type=Path, metavar="NETWORK", help="sig_bak_ovr.onnx of DNSMOS P.835")
    parser.add_argument("--json", type=Path, help="write every pair's scores here")
    args = parser.parse_args()
    rater = Dnsmos(args.dnsmos) if args.dnsmos else None
    results = {}
    for text in args.systems:
        name, process = systems.parse(text)
        results[name] = score(args.folder, process, args.limit, args.rate, name, rater)
    print("\n\n".join([table(results, SOUND), table(results, SPEECH)]))
    if "none" in results:
        print("\n" + worse_than_input(results))
    print("\n".join(omissions(results)))
    if args.by_snr:
        pairs = json.loads((args.folder / "pairs.json").read_text())
        print("\n" + table_by_snr(results, {p["name"]: p["snr_db"] for p in pairs}))
    if args.json:
        args.json.write_text(json.dumps(results, indent=1))


if __name__ == "__main__":
    main()

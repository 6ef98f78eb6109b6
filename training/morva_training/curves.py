"""Draws how runs went: what their logs say of the validation part, over time.

python -m morva_training.curves runs/dense runs/shared --out curves.png --figures loss ratio_db lost_db
"""

from __future__ import annotations

import argparse
import json
from pathlib import Path

import matplotlib

matplotlib.use("Agg")
from matplotlib import pyplot


def curve(folder: Path, figure: str) -> tuple[list[float], list[float]]:
    """Minutes and values."""
    rows = map(json.loads, (folder / "log.jsonl").read_text().splitlines())
    points = [(row["seconds"] / 60.0, row[f"dev_{figure}"]) for row in rows if f"dev_{figure}" in row]
    return [x for x, _ in points], [y for _, y in points]


def draw(folders: list[Path], figures: list[str], out: Path) -> None:
    picture, panels = pyplot.subplots(1, len(figures), figsize=(4.2 * len(figures), 3.2), squeeze=False)
    for panel, figure in zip(panels[0], figures):
        for folder in folders:
            panel.plot(*curve(folder, figure), marker=".", label=folder.name)
        panel.set_xlabel("minutes")
        panel.set_title(figure)
        panel.grid(alpha=0.3)
    panels[0][0].legend()
    picture.tight_layout()
    picture.savefig(out, dpi=110)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("runs", type=Path, nargs="+")
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--figures", nargs="+", default=["loss"])
    args = parser.parse_args()
    draw(args.runs, args.figures, args.out)


if __name__ == "__main__":
    main()

"""Averages two weight files of one shape, the second made from the first.

    python -m morva_training.blend BEFORE AFTER OUT --share 0.6

What fine-tuning wins and what it forgets do not lie in the same place: a point between both files is often better than
either (Wortsman et al., 2022).
"""

from __future__ import annotations

import argparse
from pathlib import Path

import numpy as np

from . import mvw
from .convert import half_precision, timestamp
from .mvw import Value


def between(before: Value, after: Value, share: float) -> Value:
    if isinstance(after, list):
        return [between(b, a, share) for b, a in zip(before, after, strict=True)]
    return ((1 - share) * before + share * after).astype(np.float32) if isinstance(after, np.ndarray) else after


def main(arguments: list[str] | None = None) -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("before", type=Path)
    parser.add_argument("after", type=Path)
    parser.add_argument("out", type=Path)
    parser.add_argument("--share", type=float, default=0.5, help="of the second file")
    args = parser.parse_args(arguments)
    before, after = mvw.read(args.before), mvw.read(args.after)
    if not all(np.allclose(before[key], after[key]) for key in ("MU", "SD")):
        parser.error("the files standardise their features differently: neither was made from the other")
    mixed = {key: between(before[key], value, args.share) for key, value in after.items()}
    mvw.write(args.out, half_precision({**mixed, "TimeStamp": timestamp()}))


if __name__ == "__main__":
    main()

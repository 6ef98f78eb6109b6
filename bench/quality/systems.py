"""What can be scored: weight files, other programs, and doing nothing.

A system is named on the command line:
    none                 the input as it is
    NAME=model.mvw       a noise model, run by the engine
    NAME=command         any program called as `command in.wav out.wav`
"""

from __future__ import annotations

import shlex
import subprocess
import tempfile
from pathlib import Path
from typing import Callable

import numpy as np
import soundfile

import tree  # noqa: F401
from metrics import at_rate

import morva

Process = Callable[[np.ndarray, int], np.ndarray]


def from_weight(path: Path) -> Process:
    return lambda samples, rate: morva.denoise(samples, rate, model=str(path.resolve()))


def from_command(command: str) -> Process:
    def process(samples: np.ndarray, rate: int) -> np.ndarray:
        with tempfile.TemporaryDirectory() as folder:
            source, target = Path(folder) / "in.wav", Path(folder) / "out.wav"
            soundfile.write(source, samples, rate, "PCM_16")
            subprocess.run([*shlex.split(command), source, target], check=True, stdout=subprocess.DEVNULL)
            result, result_rate = soundfile.read(target, dtype="float32", always_2d=True)
        return at_rate(result[:, 0], result_rate, rate)

    return process


def parse(text: str) -> tuple[str, Process]:
    if text == "none":
        return "none", lambda samples, _rate: samples
    name, _, rest = text.partition("=")
    if not rest:
        raise SystemExit(f"{text!r} is neither none nor NAME=model.mvw nor NAME=command")
    is_weight = rest.endswith(".mvw") and Path(rest).is_file()  # a command may end in a weight file, too
    return name, from_weight(Path(rest)) if is_weight else from_command(rest)

"""What can be scored: weight files, other programs, what they have made before, and doing nothing.

A system is named on the command line:
    none                 the input as it is
    NAME=model.mvw       a noise model, run by the engine
    NAME=folder          recordings that a system has made before, with the names of the noisy ones
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
from morva_training import mvw

import morva

Process = Callable[[np.ndarray, int, str], np.ndarray]  # samples, rate, the recording's name


_told_apart: dict[tuple, Path] = {}


def weight_file(path: Path) -> str:
    """What the engine is to open. It takes files of one name and minute for one model: of two, the second is refused."""
    weight = mvw.read(path)
    identity = tuple(weight.get(key) for key in ("Version", "SampleRate", "FrameLength", "ModelName", "TimeStamp"))
    other = _told_apart.setdefault(identity, path)
    if other.read_bytes() != path.read_bytes():
        raise SystemExit(f"{other} and {path} are one model to the engine: made in the same minute")
    return str(path.resolve())


def from_weight(path: Path) -> Process:
    model = weight_file(path)
    return lambda samples, rate, _name: morva.denoise(samples, rate, model=model)


def read(path: Path, rate: int) -> np.ndarray:
    samples, file_rate = soundfile.read(path, dtype="float32", always_2d=True)
    return at_rate(samples[:, 0], file_rate, rate)


def from_command(command: str) -> Process:
    def process(samples: np.ndarray, rate: int, _name: str) -> np.ndarray:
        with tempfile.TemporaryDirectory() as folder:
            source, target = Path(folder) / "in.wav", Path(folder) / "out.wav"
            soundfile.write(source, samples, rate, "PCM_16")
            subprocess.run([*shlex.split(command), source, target], check=True, stdout=subprocess.DEVNULL)
            return read(target, rate)

    return process


def parse(text: str) -> tuple[str, Process]:
    if text == "none":
        return "none", lambda samples, _rate, _name: samples
    name, _, rest = text.partition("=")
    if not rest:
        raise SystemExit(f"{text!r} is neither none nor NAME=model.mvw nor NAME=folder nor NAME=command")
    path = Path(rest)  # a command may end in a weight file, too
    if path.is_dir():
        return name, lambda _samples, rate, recording: read(path / f"{recording}.wav", rate)
    return name, from_weight(path) if path.suffix == ".mvw" and path.is_file() else from_command(rest)

"""The process's one engine and its models. Everything here may be called on any thread."""

from __future__ import annotations

import atexit
import functools
import json
import logging
import os
import threading
from dataclasses import dataclass
from pathlib import Path
from typing import Any

from . import _library

RATES = (8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000)


_HIGHEST_RATE = 384000

_log = logging.getLogger("morva")
_log.addHandler(logging.NullHandler())


class EngineError(RuntimeError):
    """The engine could not do what was asked; the text is its own reason."""


@dataclass(frozen=True)
class Model:
    """A registered model: rate in hertz, frame in milliseconds, size in bytes."""

    name: str
    version: str
    rate: int
    frame_ms: int
    size: int


_lock = threading.Lock()
_registered: set[str] = set()


def failure(what: str) -> EngineError:
    reason = _library.library().MorvaExt_LastError().decode(errors="replace")
    return EngineError(f"{what}: {reason}" if reason else what)


def check_rate(rate: int) -> int:
    if rate not in RATES:
        raise ValueError(f"frames of {rate} Hz are not supported; the engine takes {RATES}")
    return int(rate)


def engine_rate(rate: int) -> int:
    """The rate at which sound of `rate` goes through the engine: its own, else the next higher one."""
    if rate != int(rate) or not 0 < rate <= _HIGHEST_RATE:
        raise ValueError(f"a rate of {rate} Hz is not supported; it is a whole number up to {_HIGHEST_RATE}")
    return next((taken for taken in RATES if taken >= rate), RATES[-1])


@functools.cache
def _shipped() -> list[dict[str, Any]]:
    return json.loads((_library.MODELS / "shipped.json").read_text())


def shipped_model(kind: str, rate: int) -> str:
    """The shipped model's file for sound of this rate; kinds as in the C interface: NC, VAD, NoiseDB."""
    return next(row["file"] for row in _shipped() if row["kind"] == kind and rate <= row["maxSampleRate"])


def _model_file(name: str) -> Path:
    if os.sep in name:
        return Path(name)
    file = Path(os.environ.get("MORVA_MODELS") or _library.MODELS) / name
    if not file.exists():
        raise FileNotFoundError(f"there is no model {name} in {file.parent}")
    return file


@_library.Diagnostic
def _note(_stream: int, text: bytes) -> None:
    _log.debug("%s", text.decode(errors="replace"))


@functools.cache
def _start() -> None:
    _library.library().MorvaExt_SetDiagnostics(_note)
    atexit.register(_library.library().MorvaExt_SetDiagnostics, _library.Diagnostic())
    if _library.library().Morva_SDK_GlobalInit(None, 1) != 0:
        raise failure("the engine cannot start")
    atexit.register(_library.library().Morva_SDK_GlobalDestroy)


def register(model: str) -> bytes:
    """Makes a shipped model (by file name) or any weight file (by path) known; returns its name."""
    with _lock:
        _start()
        if model not in _registered:
            weight = _model_file(model).read_bytes()
            name = model.encode()
            if _library.library().Morva_SDK_SetModel_Blob(weight, len(weight), name) != 0:
                raise failure(f"{model} is not a usable model")
            _registered.add(model)
    return model.encode()


def models() -> list[Model]:
    """The models that have been used so far in this process."""
    with _lock:
        _start()
        count = _library.library().MorvaExt_ListModels(None, 0)
        found = (_library.ModelInfo * count)()
        _library.library().MorvaExt_ListModels(found, count)
    return [Model(m.name.decode(), m.version.decode(), m.sampleRate, m.frameMs, m.size) for m in found]


def version() -> str:
    """Version of the engine library."""
    return _library.library().MorvaExt_Version().decode()

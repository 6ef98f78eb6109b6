"""Live sound: objects that take blocks of any length and answer with what is ready."""

from __future__ import annotations

import ctypes
import math
import weakref
from typing import Any

import numpy as np
import numpy.typing as npt

from . import _engine
from ._library import library

Sound = npt.NDArray[Any]


def samples_of(sound: npt.ArrayLike) -> Sound:
    """The rule of every call: int16, or floating point in -1..1. Other types do not say their full scale."""
    given = np.asarray(sound)
    if given.dtype != np.int16 and not np.issubdtype(given.dtype, np.floating):
        raise TypeError(f"samples are int16 or floating point, not {given.dtype}")
    return given


def as_float(samples: Sound) -> npt.NDArray[np.float32]:
    return samples / np.float32(32768) if samples.dtype == np.int16 else samples.astype(np.float32, copy=False)


class _Session:
    """A session of the engine, closed with its owner; frames of `frame_size` samples."""

    def __init__(self, kind: str, rate: int, frame_ms: int, model: str | None) -> None:
        self.rate = _engine.check_rate(rate)
        model = model or _engine.shipped_model(kind, rate)
        if frame_ms not in (10, 20, 30, 40):
            raise ValueError(f"frames have 10, 20, 30 or 40 ms, not {frame_ms}")
        self.frame_size = self.rate * frame_ms // 1000
        name = _engine.register(model)
        create = getattr(library(), f"Morva_{kind}_CreateSession")
        rates = (self.rate, self.rate) if kind == "NC" else (self.rate,)
        handle = create(*rates, frame_ms, name)
        if not handle:
            raise _engine.failure(f"{model} cannot be used")
        self._handle = handle
        self._closer = weakref.finalize(self, getattr(library(), f"Morva_{kind}_CloseSession"), handle)
        self._closer.atexit = False  # the engine closes what is open when it ends

    def close(self) -> None:
        """Frees the session; the object cannot be used any more."""
        self._closer()
        self._handle = None

    def _live(self) -> int:
        if self._handle is None:
            raise ValueError("closed")
        return self._handle

    def _checked(self, frame: npt.ArrayLike) -> Sound:
        given = samples_of(frame)
        if given.shape != (self.frame_size,):
            raise ValueError(f"a frame has {self.frame_size} samples, not shape {given.shape}")
        return given

    def __enter__(self):
        return self

    def __exit__(self, *_: object) -> None:
        self.close()


class Denoiser(_Session):
    """Removes background noise from one channel.

    `frame()` is the live call: a frame in, a frame out, `latency` samples late. `push()` and `flush()`
    take blocks of any length and remove the latency: together they give back exactly as many samples as
    went in, in their place. All blocks of a sound have one type.
    """

    def __init__(
        self,
        rate: int,
        *,
        frame_ms: int = 10,
        model: str | None = None,
        attenuation_limit_db: float = math.inf,
    ) -> None:
        super().__init__("NC", rate, frame_ms, model)
        self.latency: int = library().MorvaExt_SessionLatencySamples(self._handle)
        self._skip = self.latency
        self._taken = self._given = 0
        self._waiting: Sound | None = None
        self._flushed = False
        self.set_attenuation_limit(attenuation_limit_db)

    def set_attenuation_limit(self, limit_db: float) -> None:
        """No part of the sound in the model's band is lowered by more; infinity is no limit."""
        if library().MorvaExt_NC_SetAttenuationLimit(self._live(), limit_db) != 0:
            raise ValueError(f"an attenuation limit of {limit_db} dB")

    def set_bypass(self, on: bool) -> None:
        """Lets the sound through at the same latency; the change cross-fades."""
        library().MorvaExt_NC_SetBypass(self._live(), int(on))

    def frame(self, frame: npt.ArrayLike) -> Sound:
        """Cleans one frame of `frame_size` samples, int16 or float."""
        checked = self._checked(frame)
        pcm = checked.dtype == np.int16
        clean = library().Morva_NC_CleanAmbientNoiseInt16 if pcm else library().Morva_NC_CleanAmbientNoiseFloat
        given = np.ascontiguousarray(checked, np.int16 if pcm else np.float32)
        out = np.empty_like(given)
        if clean(self._live(), given.ctypes.data, given.size, out.ctypes.data, out.size) != 0:
            raise _engine.failure("the engine refused a frame")
        return out.astype(checked.dtype, copy=False)

    def push(self, block: npt.ArrayLike) -> Sound:
        """Takes a block of any length and returns the cleaned samples that are ready."""
        given = samples_of(block)
        if self._flushed:
            raise ValueError("the sound has been flushed; the next one needs a new object")
        if given.ndim != 1:
            raise ValueError("one channel at a time")
        if self._waiting is None:
            self._waiting = given[:0]
        if given.dtype != self._waiting.dtype:
            raise TypeError(f"the sound began as {self._waiting.dtype}, this block is {given.dtype}")
        self._taken += len(given)
        sound = np.concatenate([self._waiting, given])
        whole = len(sound) // self.frame_size * self.frame_size
        self._waiting = sound[whole:]
        return self._release(sound[:whole])

    def flush(self) -> Sound:
        """Returns the rest; after it the object can only be closed."""
        self._flushed = True
        waiting = np.empty(0, np.float32) if self._waiting is None else self._waiting
        rest = self._taken - self._given
        self._waiting = waiting[:0]
        frames = -(-(rest + self._skip) // self.frame_size) if rest else 0
        padded = np.zeros(frames * self.frame_size, waiting.dtype)
        padded[: len(waiting)] = waiting
        return self._release(padded)

    def _release(self, sound: Sound) -> Sound:
        frames = [self.frame(frame) for frame in sound.reshape(-1, self.frame_size)]
        cleaned = np.concatenate([sound[:0], *frames])
        skipped = min(self._skip, len(cleaned))
        self._skip -= skipped
        ready = cleaned[skipped : skipped + self._taken - self._given]
        self._given += len(ready)
        return ready


class VoiceDetector(_Session):
    """Tells per frame how likely it holds voice."""

    def __init__(self, rate: int, *, frame_ms: int = 10, model: str | None = None) -> None:
        super().__init__("VAD", rate, frame_ms, model)

    def frame(self, frame: npt.ArrayLike) -> float:
        """Voice score of one frame, 0..1."""
        given = np.ascontiguousarray(as_float(self._checked(frame)))
        score = library().Morva_VAD_FrameFloat(self._live(), given.ctypes.data, given.size)
        if not 0.0 <= score <= 1.0:
            raise _engine.failure("no voice score")
        return score


class NoiseLevelMeter(_Session):
    """Measures the background noise."""

    def __init__(self, rate: int, *, frame_ms: int = 10, model: str | None = None) -> None:
        super().__init__("NoiseDB", rate, frame_ms, model)

    def frame(self, frame: npt.ArrayLike) -> float:
        """Noise level after one frame, in decibels re one squared unit of the 16-bit scale."""
        given = np.ascontiguousarray(as_float(self._checked(frame)))
        level = ctypes.c_float()
        measure = library().MorvaExt_NoiseDB_FrameFloat
        if measure(self._live(), given.ctypes.data, given.size, ctypes.byref(level)) != 0:
            raise _engine.failure("no noise level")
        return level.value

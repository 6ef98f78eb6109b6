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


def _pointer(values: Sound, kind: Any) -> Any:
    return values.ctypes.data_as(ctypes.POINTER(kind))


def to_pcm16(sound: Sound) -> npt.NDArray[np.int16]:
    if sound.dtype == np.int16:
        return sound
    scaled = np.nan_to_num(sound.astype(np.float32) * np.float32(32768), nan=0.0)
    return np.rint(np.clip(scaled, -32768, 32767)).astype(np.int16)


class _Session:
    """A session of the engine, closed with its owner; frames of `frame_size` samples."""

    def __init__(self, kind: str, rate: int, frame_ms: int, model: str) -> None:
        self.rate = _engine.check_rate(rate)
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

    def __enter__(self):
        return self

    def __exit__(self, *_: object) -> None:
        self.close()


class Denoiser(_Session):
    """Removes background noise from one channel.

    `frame()` is the live call: a frame in, a frame out, `latency` samples late. `push()` and `flush()`
    take blocks of any length and remove the latency: together they give back exactly as many samples as
    went in, in their place.
    """

    def __init__(
        self,
        rate: int,
        *,
        frame_ms: int = 10,
        model: str | None = None,
        attenuation_limit_db: float = math.inf,
    ) -> None:
        super().__init__("NC", rate, frame_ms, model or _engine.cleaning_model(_engine.check_rate(rate)))
        self.latency: int = library().MorvaExt_SessionLatencySamples(self._handle)
        self._skip = self.latency
        self._taken = self._given = 0
        self._waiting: list[Sound] = []
        self._dtype: np.dtype[Any] | None = None
        self.set_attenuation_limit(attenuation_limit_db)

    def set_attenuation_limit(self, limit_db: float) -> None:
        """No part of the sound in the model's band is lowered by more; infinity is no limit."""
        if library().MorvaExt_NC_SetAttenuationLimit(self._live(), limit_db) != 0:
            raise ValueError(f"an attenuation limit of {limit_db} dB")

    def set_bypass(self, on: bool) -> None:
        """Lets the sound through at the same latency; the change cross-fades."""
        library().MorvaExt_NC_SetBypass(self._live(), int(on))

    def frame(self, frame: Sound) -> Sound:
        """Cleans one frame of `frame_size` samples, int16 or float."""
        if frame.shape != (self.frame_size,):
            raise ValueError(f"a frame has {self.frame_size} samples, not shape {frame.shape}")
        kind: Any = ctypes.c_float
        clean = library().Morva_NC_CleanAmbientNoiseFloat
        if frame.dtype == np.int16:
            kind, clean = ctypes.c_short, library().Morva_NC_CleanAmbientNoiseInt16
        given = np.ascontiguousarray(frame, np.int16 if frame.dtype == np.int16 else np.float32)
        out = np.empty_like(given)
        size = self.frame_size
        if clean(self._live(), _pointer(given, kind), size, _pointer(out, kind), size) != 0:
            raise _engine.failure("the engine refused a frame")
        return out.astype(frame.dtype, copy=False)

    def push(self, block: Sound) -> Sound:
        """Takes a block of any length and returns the cleaned samples that are ready."""
        if block.ndim != 1:
            raise ValueError("one channel at a time")
        self._dtype = block.dtype
        self._taken += len(block)
        sound = np.concatenate([*self._waiting, block])
        whole = len(sound) // self.frame_size * self.frame_size
        self._waiting = [sound[whole:]]
        return self._release([self.frame(f) for f in sound[:whole].reshape(-1, self.frame_size)])

    def flush(self) -> Sound:
        """Returns the rest; after it the object can only be closed."""
        rest = self._taken - self._given
        if rest == 0:
            return np.empty(0, self._dtype or np.float32)
        waiting = np.concatenate(self._waiting)
        padded = np.zeros(rest + self._skip + self.frame_size, self._dtype)
        padded[: len(waiting)] = waiting
        frames = padded[: len(padded) // self.frame_size * self.frame_size]
        return self._release([self.frame(f) for f in frames.reshape(-1, self.frame_size)])

    def _release(self, frames: list[Sound]) -> Sound:
        cleaned = np.concatenate([np.empty(0, self._dtype), *frames])
        skipped = min(self._skip, len(cleaned))
        self._skip -= skipped
        ready = cleaned[skipped : skipped + self._taken - self._given]
        self._given += len(ready)
        return ready


class VoiceDetector(_Session):
    """Tells per frame how likely it holds voice."""

    def __init__(self, rate: int, *, frame_ms: int = 10, model: str | None = None) -> None:
        super().__init__("VAD", rate, frame_ms, model or _engine.VOICE_MODEL)

    def frame(self, frame: Sound) -> float:
        """Voice score of one frame, 0..1."""
        pcm = np.ascontiguousarray(to_pcm16(frame))
        score = library().Morva_VAD_FrameInt16(self._live(), _pointer(pcm, ctypes.c_short), pcm.size)
        if not 0.0 <= score <= 1.0:
            raise _engine.failure("no voice score")
        return score


class NoiseLevelMeter(_Session):
    """Measures the background noise."""

    def __init__(self, rate: int, *, frame_ms: int = 10, model: str | None = None) -> None:
        super().__init__("NoiseDB", rate, frame_ms, model or _engine.LEVEL_MODEL)

    def frame(self, frame: Sound) -> float:
        """Noise level after one frame, in decibels re one squared unit of the 16-bit scale."""
        if frame.shape != (self.frame_size,):
            raise ValueError(f"a frame has {self.frame_size} samples, not shape {frame.shape}")
        pcm = np.ascontiguousarray(to_pcm16(frame))
        return library().Morva_NoiseDB_FrameInt16(self._live(), _pointer(pcm, ctypes.c_short), pcm.size)

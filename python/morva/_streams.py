"""Live sound: objects that take blocks of any length and answer with what is ready."""

from __future__ import annotations

import ctypes
import math
import weakref
from typing import TYPE_CHECKING, Any

import numpy as np
import numpy.typing as npt
import soxr

from . import _engine
from ._library import library

if TYPE_CHECKING:
    from typing_extensions import Self

Sound = npt.NDArray[Any]


def samples_of(sound: npt.ArrayLike) -> Sound:
    """The rule of every call: int16, or floating point in -1..1. Other types do not say their full scale."""
    given = np.asarray(sound)
    if given.dtype != np.int16 and not np.issubdtype(given.dtype, np.floating):
        raise TypeError(f"samples are int16 or floating point, not {given.dtype}")
    return given


def as_float(samples: Sound) -> npt.NDArray[np.float32]:
    return samples / np.float32(32768) if samples.dtype == np.int16 else samples.astype(np.float32, copy=False)


def as_type(samples: Sound, kind: np.dtype[Any]) -> Sound:
    """From floating point to the type of a sound."""
    if kind == np.int16:
        return np.rint(samples * 32768).clip(-32768, 32767).astype(np.int16)
    return samples.astype(kind, copy=False)


class _RateConverter:
    """From one rate to another, block by block; the output stands in time where the input stood."""

    def __init__(self, from_rate: int, to_rate: int) -> None:
        self._stream = soxr.ResampleStream(from_rate, to_rate, 1, dtype="float32", quality="VHQ")

    def convert(self, sound: Sound, *, last: bool) -> Sound:
        finite = np.nan_to_num(as_float(sound), nan=0.0, posinf=0.0, neginf=0.0)  # as the engine takes them
        return self._stream.resample_chunk(finite, last=last)


class _Session:
    """A session of the engine, closed with its owner; frames of `frame_size` samples."""

    def __init__(self, kind: str, rate: int, frame_ms: int, model: str | None) -> None:
        self.rate = rate
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

    def __enter__(self) -> Self:
        return self

    def __exit__(self, *_: object) -> None:
        self.close()

    def __reduce__(self) -> str:
        raise TypeError(f"a {type(self).__name__} cannot be pickled or copied: open one where it is used")


class Denoiser(_Session):
    """Removes background noise from one channel.

    `frame()` is the live call: a frame in, a frame out, `latency` samples late; the rate must be one of
    RATES. `push()` and `flush()` take blocks of any length at any rate and remove the latency: together
    they give back exactly as many samples as went in, in their place. All blocks of a sound have one type.
    """

    def __init__(
        self,
        rate: int,
        *,
        frame_ms: int = 10,
        model: str | None = None,
        attenuation_limit_db: float = math.inf,
    ) -> None:
        engine_rate = _engine.engine_rate(rate)
        super().__init__("NC", engine_rate, frame_ms, model)
        self.rate = int(rate)
        self._skip: int = library().MorvaExt_SessionLatencySamples(self._handle)  # still to be left out
        self.latency = round(self._skip * rate / engine_rate)
        self._to_engine = self._from_engine = None
        if rate != engine_rate:
            self._to_engine = _RateConverter(rate, engine_rate)
            self._from_engine = _RateConverter(engine_rate, rate)
        self._taken = self._given = 0  # samples at the caller's rate
        self._fed = self._released = 0  # at the engine's
        self._kind: np.dtype[Any] = np.dtype(np.float32)
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
        _engine.check_rate(self.rate)
        return self._clean(self._checked(frame))

    def _clean(self, frame: Sound) -> Sound:
        pcm = frame.dtype == np.int16
        clean = library().Morva_NC_CleanAmbientNoiseInt16 if pcm else library().Morva_NC_CleanAmbientNoiseFloat
        given = np.ascontiguousarray(frame, np.int16 if pcm else np.float32)
        out = np.empty_like(given)
        if clean(self._live(), given.ctypes.data, given.size, out.ctypes.data, out.size) != 0:
            raise _engine.failure("the engine refused a frame")
        return out.astype(frame.dtype, copy=False)

    def push(self, block: npt.ArrayLike) -> Sound:
        """Takes a block of any length and returns the cleaned samples that are ready."""
        given = samples_of(block)
        if self._flushed:
            raise ValueError("the sound has been flushed; the next one needs a new object")
        if given.ndim != 1:
            raise ValueError(f"one channel at a time, not shape {given.shape}")
        if self._taken == 0:
            self._kind = given.dtype
        if given.dtype != self._kind:
            raise TypeError(f"the sound began as {self._kind}, this block is {given.dtype}")
        self._taken += len(given)
        return self._run(given, last=False)

    def flush(self) -> Sound:
        """Returns the rest; after it the object can only be closed."""
        self._flushed = True
        rest = self._run(np.empty(0, self._kind), last=True) if self._taken > self._given else np.empty(0, self._kind)
        self._given = self._taken
        return rest

    def _run(self, sound: Sound, *, last: bool) -> Sound:
        if self._to_engine is not None:
            sound = self._to_engine.convert(sound, last=last)
        self._fed += len(sound)
        if self._waiting is not None:
            sound = np.concatenate([self._waiting, sound])
        if last:  # silence pushes the rest out
            due = -(-(self._fed - self._released + self._skip) // self.frame_size) * self.frame_size
            sound = np.concatenate([sound, np.zeros(due - len(sound), sound.dtype)])
        whole = len(sound) // self.frame_size * self.frame_size
        self._waiting = sound[whole:]
        frames = [self._clean(frame) for frame in sound[:whole].reshape(-1, self.frame_size)]
        cleaned = np.concatenate([sound[:0], *frames])
        skipped = min(self._skip, len(cleaned))
        self._skip -= skipped
        ready = cleaned[skipped : skipped + self._fed - self._released]
        self._released += len(ready)
        return self._out(ready, last=last)

    def _out(self, ready: Sound, *, last: bool) -> Sound:
        if self._from_engine is not None:
            ready = self._from_engine.convert(ready, last=last)
        due = self._taken - self._given
        if last:  # the converters may differ from the exact length by a sample
            ready = np.concatenate([ready, np.zeros(max(due - len(ready), 0), ready.dtype)])
        ready = ready[:due]
        self._given += len(ready)
        return ready if ready.dtype == self._kind else as_type(ready, self._kind)


class VoiceDetector(_Session):
    """Tells per frame how likely it holds voice."""

    def __init__(self, rate: int, *, frame_ms: int = 10, model: str | None = None) -> None:
        super().__init__("VAD", _engine.check_rate(rate), frame_ms, model)

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
        super().__init__("NoiseDB", _engine.check_rate(rate), frame_ms, model)

    def frame(self, frame: npt.ArrayLike) -> float:
        """Noise level after one frame, in decibels re one squared unit of the 16-bit scale."""
        given = np.ascontiguousarray(as_float(self._checked(frame)))
        level = ctypes.c_float()
        measure = library().MorvaExt_NoiseDB_FrameFloat
        if measure(self._live(), given.ctypes.data, given.size, ctypes.byref(level)) != 0:
            raise _engine.failure("no noise level")
        return level.value

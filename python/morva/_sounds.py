"""Whole sounds in memory."""

from __future__ import annotations

import math

import numpy as np
import numpy.typing as npt
import soxr

from ._engine import engine_rate
from ._streams import Denoiser, NoiseLevelMeter, Sound, VoiceDetector, as_float, samples_of


_MOST_CHANNELS = 16


def _channels_of(sound: npt.ArrayLike) -> Sound:
    """The sound as an array of shape (n, channels)."""
    given = samples_of(sound)
    channels = given[:, None] if given.ndim == 1 else given
    if channels.ndim != 2 or not 1 <= channels.shape[1] <= _MOST_CHANNELS:
        raise ValueError(
            f"a sound has shape (n,) or (n, channels) with up to {_MOST_CHANNELS} channels, not {given.shape}"
        )
    if 0 < len(channels) < channels.shape[1]:
        raise ValueError(f"shape {given.shape} has more channels than samples; it is (n, channels): transpose it")
    return channels


def denoise(
    sound: npt.ArrayLike,
    rate: int,
    *,
    frame_ms: int = 10,
    model: str | None = None,
    attenuation_limit_db: float = math.inf,
) -> Sound:
    """The sound without its background noise: same shape, type and place in time."""
    channels = _channels_of(sound)
    cleaned = np.empty_like(channels)
    for c in range(channels.shape[1]):
        with Denoiser(rate, frame_ms=frame_ms, model=model, attenuation_limit_db=attenuation_limit_db) as stream:
            cleaned[:, c] = np.concatenate([stream.push(channels[:, c]), stream.flush()])
    return cleaned.reshape(np.shape(sound))


def _per_frame(stream: VoiceDetector | NoiseLevelMeter, sound: npt.ArrayLike, rate: int) -> npt.NDArray[np.float32]:
    mono = as_float(_channels_of(sound)).mean(axis=1)
    if rate != stream.rate:
        mono = soxr.resample(np.nan_to_num(mono), rate, stream.rate, quality="VHQ")
    size = stream.frame_size
    padded = np.zeros(-(-len(mono) // size) * size, np.float32)
    padded[: len(mono)] = mono
    return np.array([stream.frame(frame) for frame in padded.reshape(-1, size)], np.float32)


def voice(sound: npt.ArrayLike, rate: int, *, frame_ms: int = 10, model: str | None = None) -> npt.NDArray[np.float32]:
    """Voice scores, 0..1, one per frame; channels are averaged, the last frame is filled with zeros."""
    with VoiceDetector(engine_rate(rate), frame_ms=frame_ms, model=model) as stream:
        return _per_frame(stream, sound, rate)


def noise_level(
    sound: npt.ArrayLike, rate: int, *, frame_ms: int = 10, model: str | None = None
) -> npt.NDArray[np.float32]:
    """Noise levels, one per frame, in decibels re one squared unit of the 16-bit scale; as voice()."""
    with NoiseLevelMeter(engine_rate(rate), frame_ms=frame_ms, model=model) as stream:
        return _per_frame(stream, sound, rate)

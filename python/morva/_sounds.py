"""Whole sounds in memory."""

from __future__ import annotations

import math

import numpy as np
import numpy.typing as npt

from ._streams import Denoiser, NoiseLevelMeter, Sound, VoiceDetector, as_float, samples_of


def denoise(
    sound: npt.ArrayLike,
    rate: int,
    *,
    frame_ms: int = 10,
    model: str | None = None,
    attenuation_limit_db: float = math.inf,
) -> Sound:
    """The sound without its background noise: same shape, type and place in time."""
    given = samples_of(sound)
    channels = given[:, None] if given.ndim == 1 else given
    if channels.ndim != 2:
        raise ValueError(f"a sound has shape (n,) or (n, channels), not {given.shape}")
    cleaned = np.empty_like(channels)
    for c in range(channels.shape[1]):
        with Denoiser(rate, frame_ms=frame_ms, model=model, attenuation_limit_db=attenuation_limit_db) as stream:
            cleaned[:, c] = np.concatenate([stream.push(channels[:, c]), stream.flush()])
    return cleaned.reshape(given.shape)


def _per_frame(stream: VoiceDetector | NoiseLevelMeter, sound: npt.ArrayLike) -> npt.NDArray[np.float32]:
    given = as_float(samples_of(sound))
    mono = given if given.ndim == 1 else given.mean(axis=1)
    size = stream.frame_size
    padded = np.zeros(-(-len(mono) // size) * size, np.float32)
    padded[: len(mono)] = mono
    return np.array([stream.frame(frame) for frame in padded.reshape(-1, size)], np.float32)


def voice(sound: npt.ArrayLike, rate: int, *, frame_ms: int = 10, model: str | None = None) -> npt.NDArray[np.float32]:
    """Voice scores, 0..1, one per frame; channels are averaged, the last frame is filled with zeros."""
    with VoiceDetector(rate, frame_ms=frame_ms, model=model) as stream:
        return _per_frame(stream, sound)


def noise_level(
    sound: npt.ArrayLike, rate: int, *, frame_ms: int = 10, model: str | None = None
) -> npt.NDArray[np.float32]:
    """Noise levels, one per frame, in decibels re one squared unit of the 16-bit scale; as voice()."""
    with NoiseLevelMeter(rate, frame_ms=frame_ms, model=model) as stream:
        return _per_frame(stream, sound)

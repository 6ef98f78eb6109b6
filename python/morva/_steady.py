"""For callers that hand over blocks of any length and want one of the same length back at once."""

from __future__ import annotations

import math
from typing import Any

import numpy as np

from ._streams import Denoiser, Sound


class SteadyDenoiser:
    """Interleaved int16 blocks in, blocks of the same length out, late by `delay` samples.

    That is the latency of the engine and, where the first block is no whole number of frames, what keeps
    the blocks full: less than one frame.
    """

    def __init__(self, rate: int, channels: int, options: dict[str, Any]) -> None:
        self._streams = [Denoiser(rate, **options) for _ in range(channels)]
        self._size = self._streams[0].frame_size
        self._in = self._silence(0)
        self._out: Sound | None = None

    def _silence(self, samples: int) -> Sound:
        return np.zeros((samples, len(self._streams)), np.int16)

    def process(self, audio: bytes | memoryview) -> bytes:
        block = np.frombuffer(audio, np.int16).reshape(-1, len(self._streams))
        if self._out is None:
            self._out = self._silence(self._size - math.gcd(len(block), self._size))
        self._in = np.concatenate([self._in, block])
        whole = len(self._in) // self._size * self._size
        ready, self._in = np.split(self._in, [whole])
        cleaned = [self._clean(frame) for frame in ready.reshape(-1, self._size, len(self._streams))]
        missing = self._silence(max(len(block) - len(self._out) - whole, 0))  # blocks have become longer
        given, self._out = np.split(np.concatenate([missing, self._out, *cleaned]), [len(block)])
        return given.tobytes()

    def _clean(self, frame: Sound) -> Sound:
        return np.stack([stream.frame(frame[:, c]) for c, stream in enumerate(self._streams)], axis=1)

    def set_bypass(self, on: bool) -> None:
        for stream in self._streams:
            stream.set_bypass(on)

    def set_attenuation_limit(self, limit_db: float) -> None:
        for stream in self._streams:
            stream.set_attenuation_limit(limit_db)

    def close(self) -> None:
        for stream in self._streams:
            stream.close()

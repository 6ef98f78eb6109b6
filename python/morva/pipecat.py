"""An audio filter for pipecat's transports: pip install "morva[pipecat]".

    params = TransportParams(audio_in_enabled=True, audio_in_filter=MorvaFilter())

16-bit audio at one of morva.RATES. A block comes back as long as it was, late by the engine's latency, 10 to
12 ms, and, when blocks are no whole frames, by what is missing to one. FilterEnableFrame switches it off and
on, cross-fading at the same delay; FilterUpdateSettingsFrame takes {"attenuation_limit_db": 12.0}.
"""

from __future__ import annotations

import math

from pipecat.audio.filters.base_audio_filter import BaseAudioFilter
from pipecat.frames.frames import FilterControlFrame, FilterEnableFrame, FilterUpdateSettingsFrame

from ._steady import SteadyDenoiser


class MorvaFilter(BaseAudioFilter):
    """Removes background noise; `channels` is the transport's audio_in_channels, the rest as for Denoiser."""

    def __init__(
        self,
        *,
        channels: int = 1,
        frame_ms: int = 10,
        model: str | None = None,
        attenuation_limit_db: float = math.inf,
    ) -> None:
        self._channels = channels
        self._options = {"frame_ms": frame_ms, "model": model, "attenuation_limit_db": attenuation_limit_db}
        self._enabled = True
        self._stream: SteadyDenoiser | None = None

    async def start(self, sample_rate: int) -> None:
        self._stream = SteadyDenoiser(sample_rate, self._channels, self._options)
        self._stream.set_bypass(not self._enabled)

    async def stop(self) -> None:
        if self._stream is not None:
            self._stream.close()
        self._stream = None

    async def process_frame(self, frame: FilterControlFrame) -> None:
        if isinstance(frame, FilterEnableFrame):
            self._enabled = frame.enable
            if self._stream is not None:
                self._stream.set_bypass(not frame.enable)
        elif isinstance(frame, FilterUpdateSettingsFrame) and "attenuation_limit_db" in frame.settings:
            limit = self._options["attenuation_limit_db"] = float(frame.settings["attenuation_limit_db"])
            if self._stream is not None:
                self._stream.set_attenuation_limit(limit)

    async def filter(self, audio: bytes) -> bytes:
        return audio if self._stream is None or not audio else self._stream.process(audio)

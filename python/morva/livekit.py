"""A frame processor for livekit's audio streams: pip install "morva[livekit]".

    stream = rtc.AudioStream.from_track(track=track, noise_cancellation=MorvaFrameProcessor())

Any number of channels at one of morva.RATES. A frame comes back as long as it was, late by the engine's
latency, 10 to 12 ms, and, when frames are no multiple of 10 ms, by what is missing to one. One processor
per stream; it may serve another one afterwards.
"""

from __future__ import annotations

import math

from livekit import rtc

from ._steady import SteadyDenoiser


class MorvaFrameProcessor(rtc.FrameProcessor[rtc.AudioFrame]):
    """Removes background noise; options as for Denoiser. `enabled` switches it off and on."""

    def __init__(
        self,
        *,
        frame_ms: int = 10,
        model: str | None = None,
        attenuation_limit_db: float = math.inf,
    ) -> None:
        self._options = {"frame_ms": frame_ms, "model": model, "attenuation_limit_db": attenuation_limit_db}
        self._enabled = True
        self._stream: SteadyDenoiser | None = None
        self._format: tuple[int, int] | None = None

    @property
    def enabled(self) -> bool:
        return self._enabled

    @enabled.setter
    def enabled(self, value: bool) -> None:
        self._enabled = value
        if not value:
            self._close()  # what it has heard is old when it goes on

    def set_attenuation_limit(self, limit_db: float) -> None:
        """No part of the sound in the model's band is lowered by more; infinity is no limit."""
        self._options["attenuation_limit_db"] = limit_db
        if self._stream is not None:
            self._stream.set_attenuation_limit(limit_db)

    def _process(self, frame: rtc.AudioFrame) -> rtc.AudioFrame:
        if frame.samples_per_channel == 0:
            return frame
        rate, channels = frame.sample_rate, frame.num_channels
        if self._stream is None or self._format != (rate, channels):
            self._close()
            self._stream = SteadyDenoiser(rate, channels, self._options)
            self._format = (rate, channels)
        cleaned = self._stream.process(frame.data[: channels * frame.samples_per_channel])
        return rtc.AudioFrame(cleaned, rate, channels, frame.samples_per_channel, userdata=frame.userdata)

    def _close(self) -> None:
        if self._stream is not None:
            self._stream.close()
        self._stream = None

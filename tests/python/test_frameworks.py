"""The adapters inside the real frameworks: pipecat's input transport, livekit's audio stream, on a recording."""

import asyncio

import numpy as np
import pytest

import morva

pytest.importorskip("pipecat", reason="tests/python/frameworks.txt is not installed")
pytest.importorskip("livekit", reason="tests/python/frameworks.txt is not installed")

from livekit import rtc
from pipecat.clocks.system_clock import SystemClock
from pipecat.frames.frames import (
    FilterEnableFrame,
    FilterUpdateSettingsFrame,
    InputAudioRawFrame,
    StartFrame,
)
from pipecat.processors.frame_processor import FrameDirection, FrameProcessorSetup
from pipecat.transports.base_input import BaseInputTransport
from pipecat.transports.base_transport import TransportParams
from pipecat.utils.asyncio.task_manager import TaskManager

from morva.livekit import MorvaFrameProcessor
from morva.pipecat import MorvaFilter


@pytest.fixture(scope="module")
def pcm(speech):
    return np.rint(speech[: 2 * 48000] * 32768).astype(np.int16)


def is_late(got, pcm, rate, waiting=0, **options):
    """Whether it is what the engine makes of the sound, late by its latency and what waits for whole frames."""
    delay = waiting + morva.Denoiser(rate).latency
    wanted = morva.denoise(pcm, rate, **options)[: len(pcm) - delay]
    np.testing.assert_array_equal(got[delay:], wanted)


def through_pipecat(morva_filter, pcm, rate, block, control=()):
    class Input(BaseInputTransport):
        async def push_frame(self, frame, direction=FrameDirection.DOWNSTREAM):
            received.append(frame)

    async def flow():
        transport = Input(
            TransportParams(audio_in_enabled=True, audio_in_sample_rate=rate, audio_in_filter=morva_filter)
        )
        setup = FrameProcessorSetup(clock=SystemClock(), task_manager=TaskManager(), pipeline_worker=None)
        await transport.setup(setup)
        await transport.process_frame(StartFrame(), FrameDirection.DOWNSTREAM)
        await transport.set_transport_ready(StartFrame())
        for frame in control:
            await transport.process_frame(frame, FrameDirection.DOWNSTREAM)
        for at in range(0, len(pcm), block):
            await transport.push_audio_frame(InputAudioRawFrame(pcm[at : at + block].tobytes(), rate, 1))
        await transport._audio_in_queue.join()
        await transport.cleanup()

    received = []
    asyncio.run(flow())
    audio = [frame.audio for frame in received if isinstance(frame, InputAudioRawFrame)]
    assert [len(each) for each in audio] == [2 * len(pcm[at : at + block]) for at in range(0, len(pcm), block)]
    return np.frombuffer(b"".join(audio), np.int16)


@pytest.mark.parametrize(("rate", "block", "waiting"), [(16000, 320, 0), (48000, 512, 480 - 32), (24000, 100, 220)])
def test_pipecat_gets_the_engines_sound(pcm, rate, block, waiting):
    is_late(through_pipecat(MorvaFilter(), pcm, rate, block), pcm, rate, waiting)


def test_pipecat_switches_and_limits(pcm):
    limited = through_pipecat(MorvaFilter(), pcm, 16000, 320, [FilterUpdateSettingsFrame({"attenuation_limit_db": 6})])
    off = through_pipecat(MorvaFilter(), pcm, 16000, 320, [FilterEnableFrame(enable=False)])
    is_late(limited, pcm, 16000, attenuation_limit_db=6)
    np.testing.assert_allclose(off[480:], pcm[320:-160], atol=1)


def test_livekit_frames_of_any_length_and_channels(pcm):
    processor = MorvaFrameProcessor()
    stereo = np.stack([pcm, pcm[::-1]], axis=1)
    cleaned = []
    for block in (441, 960, 960, 64, 480, 5000):
        part = stereo[sum(map(len, cleaned)) :][:block]
        frame = processor._process(rtc.AudioFrame(part.tobytes(), 48000, 2, block, userdata={"a": block}))
        assert (frame.sample_rate, frame.num_channels, frame.userdata) == (48000, 2, {"a": block})
        cleaned.append(np.frombuffer(frame.data, np.int16).reshape(-1, 2))
    for got, sound in zip(np.concatenate(cleaned).T, stereo[:7905].T):
        is_late(got, sound, 48000, 480 - 3)


def test_livekit_streams_hear_the_engines_sound(pcm):
    class Witness(MorvaFrameProcessor):
        def _process(self, frame):
            given.append(np.frombuffer(frame.data, np.int16))
            return super()._process(frame)

    async def play(source):
        for at in range(0, len(pcm), 480):
            await source.capture_frame(rtc.AudioFrame(pcm[at : at + 480].tobytes(), 48000, 1, 480))

    async def flow():
        source = rtc.AudioSource(48000, 1)
        track = rtc.LocalAudioTrack.create_audio_track("microphone", source)
        stream = rtc.AudioStream.from_track(track=track, noise_cancellation=Witness())
        playing = asyncio.create_task(play(source))
        while len(heard) < 100:
            heard.append(np.frombuffer((await anext(stream)).frame.data, np.int16))
        playing.cancel()
        await stream.aclose()

    given, heard = [], []
    asyncio.run(flow())
    sound = np.concatenate(given[: len(heard)])
    assert np.std(sound) > 100
    is_late(np.concatenate(heard), sound, 48000)

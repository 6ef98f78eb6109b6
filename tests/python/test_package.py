"""Arrays, streams and files give what the command line gives."""

from concurrent.futures import ThreadPoolExecutor

import numpy as np
import pytest
import soundfile

import morva


@pytest.mark.parametrize("rate", morva.RATES)
def test_denoise_is_the_command_lines(command, speech, write, tmp_path, rate):
    sound = speech[: rate * 2 + 77]  # read at another rate it is a sound of its own, which is all that matters here
    command("denoise", "-q", write("in.wav", sound, rate), tmp_path / "out.wav")
    wanted, _ = soundfile.read(tmp_path / "out.wav", dtype="float32")
    got = morva.denoise(sound, rate)
    assert got.dtype == np.float32
    np.testing.assert_array_equal(got, wanted)


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
def test_channels_frames_and_types(command, speech, write, tmp_path, frame_ms):
    stereo = np.stack([speech[:50000], speech[50000:100000]], axis=1)
    path = write("in.wav", stereo, 48000)
    command("denoise", "-q", "--frame", frame_ms, path, tmp_path / "out.wav")
    wanted, _ = soundfile.read(tmp_path / "out.wav", dtype="float32")
    np.testing.assert_array_equal(morva.denoise(stereo, 48000, frame_ms=frame_ms), wanted)
    double = morva.denoise(stereo.astype(np.float64), 48000, frame_ms=frame_ms)
    assert double.dtype == np.float64
    np.testing.assert_array_equal(double, wanted)
    pcm = np.rint(stereo * 32768).clip(-32768, 32767).astype(np.int16)
    rounded = morva.denoise(pcm, 48000, frame_ms=frame_ms)
    assert rounded.dtype == np.int16
    assert np.abs(rounded / 32768 - wanted).max() < 2 / 32768
    for measure in (morva.voice, morva.noise_level):
        values = measure(pcm, 48000, frame_ms=frame_ms)
        np.testing.assert_array_equal(values, measure(pcm / 32768, 48000, frame_ms=frame_ms))


def test_blocks_of_any_length_are_the_whole(speech):
    random = np.random.default_rng(1)
    whole = morva.denoise(speech[:96000], 48000)
    for longest, length in ((1, 20000), (100, 96000), (5000, 96000)):
        with morva.Denoiser(48000) as stream:
            at, out = 0, []
            while at < length:
                n = int(random.integers(0, longest + 1))
                out.append(stream.push(speech[at : min(at + n, length)]))
                at += n
            cleaned = np.concatenate([*out, stream.flush()])
            with pytest.raises(ValueError, match="flushed"):
                stream.push(speech[:480])
        assert cleaned.shape == (length,)
        settled = length - 2000 if length < 96000 else length
        np.testing.assert_array_equal(cleaned[:settled], whole[:settled])


@pytest.mark.parametrize("length", [0, 1, 479, 480, 481, 1441])
def test_short_sounds_keep_their_length(length):
    assert morva.denoise(np.full(length, 0.1, np.float32), 48000).shape == (length,)


def test_voice_and_level_are_the_command_lines(command, speech, write):
    path = write("in.wav", speech[:100100], 48000)
    for name, key, ours, tolerance in (
        ("vad", "score", morva.voice, 2e-3),  # the command rounds to 16 bits on the way
        ("level", "level_db", morva.noise_level, 2e-2),
    ):
        lines = command(name, path, "--format", "csv").splitlines()
        column = lines[0].split(",").index(key)
        wanted = np.array([float(line.split(",")[column]) for line in lines[1:]])
        np.testing.assert_allclose(ours(speech[:100100], 48000), wanted, atol=tolerance)


@pytest.mark.parametrize("dbfs", [-30, -96, -110])
def test_the_level_of_faint_noise(dbfs):
    noise = np.random.default_rng(3).standard_normal(64000).astype(np.float32) * 10 ** (dbfs / 20)
    assert np.median(morva.noise_level(noise, 16000)[200:]) == pytest.approx(dbfs + 20 * np.log10(32768), abs=1)


CALLS = {
    "denoise": lambda sound: morva.denoise(sound, 16000),
    "voice": lambda sound: morva.voice(sound, 16000),
    "noise_level": lambda sound: morva.noise_level(sound, 16000),
    "frame": lambda sound: morva.Denoiser(16000).frame(sound),
    "push": lambda sound: morva.Denoiser(16000).push(sound),
    "voice frame": lambda sound: morva.VoiceDetector(16000).frame(sound),
    "level frame": lambda sound: morva.NoiseLevelMeter(16000).frame(sound),
}


@pytest.mark.parametrize("call", CALLS)
def test_types_without_a_full_scale_are_refused_everywhere(call):
    for kind in (np.int32, np.uint8, np.int64, np.complex64):
        with pytest.raises(TypeError, match="int16 or floating"):
            CALLS[call](np.zeros(160, kind))
    CALLS[call](np.zeros(160, np.int16))


def test_limit_and_bypass(speech):
    within = morva.denoise(speech[:32000], 16000, attenuation_limit_db=0)
    np.testing.assert_allclose(within, speech[:32000], atol=1e-5)
    with morva.Denoiser(48000) as stream:
        stream.set_bypass(True)
        out = np.concatenate([stream.push(speech[:96000]), stream.flush()])
        np.testing.assert_allclose(out[960:], speech[960:96000], atol=1e-6)
        with pytest.raises(ValueError):
            stream.set_attenuation_limit(-1)


def test_files(command, speech, write, tmp_path):
    path = write("in.wav", np.stack([speech, speech[::-1]], axis=1), 48000, "PCM_24")
    morva.denoise_file(path, tmp_path / "ours.flac")
    command("denoise", "-q", path, tmp_path / "theirs.flac")
    ours, wanted = (soundfile.SoundFile(tmp_path / f"{n}.flac") for n in ("ours", "theirs"))
    assert (ours.subtype, ours.channels, ours.frames) == (wanted.subtype, 2, len(speech))
    np.testing.assert_allclose(ours.read(), wanted.read(), atol=2**-22)


def test_a_failed_file_leaves_nothing(tmp_path, write, speech):
    (tmp_path / "broken.wav").write_bytes(b"RIFF")
    target = tmp_path / "target.wav"
    target.write_text("older")
    odd = write("odd.wav", speech[:1000], 22050)
    for source in (tmp_path / "broken.wav", odd):
        with pytest.raises((soundfile.LibsndfileError, ValueError)):
            morva.denoise_file(source, target)
    assert target.read_text() == "older"
    assert sorted(p.name for p in tmp_path.iterdir()) == ["broken.wav", "odd.wav", "target.wav"]


def test_errors_say_why(tmp_path):
    bad = tmp_path / "bad.mvw"
    bad.write_bytes(b"no weight")
    for error, text, options in (
        (ValueError, "22050", {"rate": 22050}),
        (ValueError, "15", {"rate": 16000, "frame_ms": 15}),
        (FileNotFoundError, "nothing.mvw", {"rate": 16000, "model": "nothing.mvw"}),
        (morva.EngineError, "bad.mvw", {"rate": 16000, "model": str(bad)}),
        (morva.EngineError, "Unsupported weight version", {"rate": 16000, "model": "VAD_weight.mvw"}),
    ):
        with pytest.raises(error, match=text):
            morva.Denoiser(**options)
    with morva.Denoiser(16000) as stream:
        with pytest.raises(ValueError, match="160 samples"):
            stream.frame(np.zeros(159, np.float32))
        stream.push(np.zeros(100, np.float32))
        with pytest.raises(TypeError, match="began as float32"):
            stream.push(np.zeros(100, np.int16))
    with pytest.raises(ValueError, match="closed"):
        stream.frame(np.zeros(160, np.float32))
    names = {m.name: m for m in morva.models()}
    assert names["NC_small_16k.mvw"].rate == 16000
    assert morva.version() == morva.__version__


def test_threads_side_by_side(speech):
    wanted = morva.denoise(speech[:96000], 48000)
    with ThreadPoolExecutor(4) as pool:
        for result in pool.map(lambda _: morva.denoise(speech[:96000], 48000), range(4)):
            np.testing.assert_array_equal(result, wanted)

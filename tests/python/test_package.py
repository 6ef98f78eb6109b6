"""Arrays, streams and files give what the command line gives."""

import threading

import numpy as np
import pytest
import soundfile

import morva


def at_rate(speech, rate):
    """The recording read at another rate: a sound of its own, which is all that matters here."""
    return speech[: rate * 2 + 77]


@pytest.mark.parametrize("rate", morva.RATES)
def test_denoise_is_the_command_lines(command, speech, write, tmp_path, rate):
    sound = at_rate(speech, rate)
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


def test_blocks_of_any_length_are_the_whole(speech):
    random = np.random.default_rng(1)
    sound = speech[:96000]
    whole = morva.denoise(sound, 48000)
    for longest in (1, 100, 5000):
        with morva.Denoiser(48000) as stream:
            part, out = sound[: 20000 if longest == 1 else None], []
            at = 0
            while at < len(part):
                n = int(random.integers(0, longest + 1))
                out.append(stream.push(part[at : at + n]))
                at += n
            cleaned = np.concatenate([*out, stream.flush()])
        assert cleaned.shape == part.shape
        settled = len(part) - 2000 if longest == 1 else len(part)
        np.testing.assert_array_equal(cleaned[:settled], whole[:settled])


@pytest.mark.parametrize("length", [0, 1, 479, 480, 481, 1441])
def test_short_sounds_keep_their_length(length):
    assert morva.denoise(np.full(length, 0.1, np.float32), 48000).shape == (length,)


def test_voice_and_level_are_the_command_lines(command, speech, write):
    path = write("in.wav", speech[:100100], 48000)
    for name, key, ours in (
        ("vad", "score", morva.voice),
        ("level", "level_db", morva.noise_level),
    ):
        lines = command(name, path, "--format", "csv").splitlines()
        column = lines[0].split(",").index(key)
        wanted = np.array([float(line.split(",")[column]) for line in lines[1:]])
        np.testing.assert_allclose(ours(speech[:100100], 48000), wanted, atol=1e-2 if name == "level" else 1e-4)


def test_limit_and_bypass(speech):
    sound = speech[:96000]
    within = morva.denoise(at_rate(speech, 16000), 16000, attenuation_limit_db=0)
    np.testing.assert_allclose(within, at_rate(speech, 16000), atol=1e-5)
    with morva.Denoiser(48000) as stream:
        stream.set_bypass(True)
        out = np.concatenate([stream.push(sound), stream.flush()])
        np.testing.assert_allclose(out[960:], sound[960:], atol=1e-6)
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
    with pytest.raises(ValueError, match="22050"):
        morva.Denoiser(22050)
    with pytest.raises(ValueError, match="15"):
        morva.Denoiser(16000, frame_ms=15)
    with pytest.raises(FileNotFoundError, match="nothing.mvw"):
        morva.Denoiser(16000, model="nothing.mvw")
    bad = tmp_path / "bad.mvw"
    bad.write_bytes(b"no weight")
    with pytest.raises(morva.EngineError, match="bad.mvw"):
        morva.Denoiser(16000, model=str(bad))
    with pytest.raises(morva.EngineError, match="Unsupported weight version"):
        morva.Denoiser(16000, model="VAD_weight.mvw")
    with pytest.raises(TypeError):
        morva.denoise(np.zeros(100, np.int32), 16000)
    with morva.Denoiser(16000) as stream, pytest.raises(ValueError):
        stream.frame(np.zeros(159, np.float32))
    with pytest.raises(ValueError, match="closed"):
        stream.frame(np.zeros(160, np.float32))
    names = {m.name: m for m in morva.models()}
    assert names["NC_small_16k.mvw"].rate == 16000
    assert morva.version() == morva.__version__


def test_threads_side_by_side(speech):
    sound = speech[:96000]
    wanted = morva.denoise(sound, 48000)
    results = [None] * 4

    def work(i):
        results[i] = morva.denoise(sound, 48000)

    threads = [threading.Thread(target=work, args=(i,)) for i in range(4)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    for result in results:
        np.testing.assert_array_equal(result, wanted)

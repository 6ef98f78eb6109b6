"""Arrays, streams, files and folders give what the command line gives."""

import copy
import json
import os
import signal
import time
import pickle
import re
from functools import partial
from importlib.resources import files

import numpy as np
import pytest
import soundfile

import morva
from morva import batch


@pytest.mark.parametrize(("rate", "ms"), [*((rate, 10) for rate in morva.RATES), (48000, 20), (48000, 30), (16000, 40)])
def test_sounds_of_every_kind_are_the_command_lines(command, speech, write, tmp_path, rate, ms):
    # Read at another rate the recording is a sound of its own, which is all that matters here.
    stereo = np.stack([speech[: rate + 77], speech[rate : 2 * rate + 77]], axis=1)
    command("denoise", "-q", "--frame", ms, write("in.wav", stereo, rate), tmp_path / "out.wav")
    wanted, _ = soundfile.read(tmp_path / "out.wav", dtype="float32")
    pcm = np.rint(stereo * 32768).clip(-32768, 32767).astype(np.int16)
    for sound, tolerance in ((stereo, 0), (stereo.astype(np.float64), 0), (pcm, 2)):
        clean = morva.denoise(sound, rate, frame_ms=ms)
        assert clean.dtype == sound.dtype
        scale = 32768 if sound is pcm else 1
        if rate in (8000, 16000, 48000, 96000):  # elsewhere the command line takes out a part of a sample, too
            np.testing.assert_allclose(clean / scale, wanted, rtol=0, atol=tolerance / 32768)
        for ours, theirs in zip(clean.T, wanted.T):
            assert np.corrcoef(ours, theirs)[0, 1] > 0.9
    for measure in (morva.voice, morva.noise_level):
        as_float = measure(pcm / 32768, rate, frame_ms=ms)
        np.testing.assert_array_equal(measure(pcm, rate, frame_ms=ms), as_float)


def test_blocks_of_any_length_are_the_whole(speech):
    random = np.random.default_rng(1)
    for longest, length in ((1, 1441), (100, 20000), (5000, 96000), (500, 1), (500, 0)):
        cuts = np.cumsum(random.integers(0, longest + 1, 2 + 3 * length // longest)).clip(max=length)
        with morva.Denoiser(48000) as stream:
            out = [stream.push(block) for block in np.split(speech[:length], cuts)] + [stream.flush()]
            with pytest.raises(ValueError, match="flushed"):
                stream.push(speech[:480])
        assert sum(map(len, out)) == length
        np.testing.assert_array_equal(np.concatenate(out), morva.denoise(speech[:length], 48000))


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


def test_the_level_of_faint_noise():
    noise = np.random.default_rng(3).standard_normal(64000)
    for dbfs in (-30, -96, -110):
        levels = morva.noise_level(noise * 10 ** (dbfs / 20), 16000)
        assert np.median(levels[200:]) == pytest.approx(dbfs + 20 * np.log10(32768), abs=1)


def test_types_without_a_full_scale_are_refused_everywhere():
    whole = (morva.denoise, morva.voice, morva.noise_level)
    streams = [kind(16000) for kind in (morva.Denoiser, morva.VoiceDetector, morva.NoiseLevelMeter)]
    calls = [*(partial(call, rate=16000) for call in whole), *(s.frame for s in streams), morva.Denoiser(16000).push]
    for call in calls:
        for kind in (np.int32, np.uint8, np.complex64):
            with pytest.raises(TypeError, match="int16 or floating"):
                call(np.zeros(160, kind))
        call(np.zeros(160, np.int16))


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

    before = {file: file.stat().st_mtime_ns for file in tmp_path.iterdir()}
    for odd in (write("odd.wav", speech[:1000], 400000), tmp_path / "missing.wav"):
        with pytest.raises((soundfile.LibsndfileError, ValueError)):
            morva.denoise_file(odd, tmp_path / "ours.flac")
    (tmp_path / "odd.wav").unlink()
    (tmp_path / "link.wav").symlink_to(path)
    for own in (path, tmp_path / "link.wav"):
        with pytest.raises(ValueError, match="input as well"):
            morva.denoise_file(path, own)
    (tmp_path / "link.wav").unlink()
    assert {file: file.stat().st_mtime_ns for file in tmp_path.iterdir()} == before, "what fails leaves nothing"


@pytest.mark.parametrize("rate", [4000, 11025, 22050, 192000])
def test_rates_that_the_engine_does_not_take(command, speech, write, tmp_path, rate):
    sound = np.convolve(speech[: 3 * rate : 2], np.ones(9) / 9, "same")  # little above half the band
    path = write("in.wav", sound, rate)
    clean = morva.denoise(sound, rate)
    command("denoise", "-q", path, tmp_path / "out.wav")
    wanted, _ = soundfile.read(tmp_path / "out.wav", dtype="float32")
    assert np.corrcoef(clean, wanted)[0, 1] > 0.98, "the converters differ a little"
    morva.denoise_file(path, tmp_path / "ours.wav")
    np.testing.assert_allclose(soundfile.read(tmp_path / "ours.wav", dtype="float32")[0], clean, atol=1e-6)
    for given, tolerance in ((sound, 1e-6), (np.rint(sound * 32768).astype(np.int16), 1e-3)):  # which rounds it
        with morva.Denoiser(rate) as stream:
            out = np.concatenate([*map(stream.push, np.array_split(given, 77)), stream.flush()])
            assert out.dtype == given.dtype
            np.testing.assert_allclose(out / (32768 if out.dtype == np.int16 else 1), clean, atol=tolerance)
            with pytest.raises(ValueError, match=str(rate)):
                stream.frame(np.zeros(stream.frame_size))
    for measure in (morva.voice, morva.noise_level):
        assert len(measure(sound, rate)) == pytest.approx(len(sound) / rate * 100, abs=1)


def test_mp3_in_wav_out_and_types_that_hold_the_source(speech, write, tmp_path):
    soundfile.write(tmp_path / "in.mp3", speech[:96000], 48000, format="MP3")
    for source, target, subtype in (
        ("in.mp3", "out.wav", "PCM_16"),
        (write("in.wav", speech[:4800], 48000, "FLOAT"), "out.flac", "PCM_24"),
        (write("u8.wav", speech[:4800], 48000, "PCM_U8"), "out.ogg", "VORBIS"),
    ):
        morva.denoise_file(tmp_path / source, tmp_path / target)
        assert soundfile.info(tmp_path / target).subtype == subtype
    assert run(tmp_path / "in.mp3", "-o", tmp_path / "folder") == 0
    assert soundfile.info(tmp_path / "folder/in.wav").frames == soundfile.info(tmp_path / "in.mp3").frames


def test_shapes_that_are_no_sound():
    for shape in ((2, 480), (480, 17), (480, 0), (4, 4, 4), ()):
        for call in (morva.denoise, morva.voice, morva.noise_level):
            with pytest.raises(ValueError, match=re.escape(f"{shape}")):
                call(np.zeros(shape), 16000)
    assert morva.denoise(np.zeros((0, 2)), 16000).shape == (0, 2)


def test_what_the_engine_says_goes_to_the_log_alone(capfd, caplog, tmp_path):
    (tmp_path / "bad.mvw").write_bytes(b"no weight")
    with caplog.at_level("DEBUG", "morva"), pytest.raises(morva.EngineError):
        morva.Denoiser(16000, model=str(tmp_path / "bad.mvw"))
    assert "Warning Nothing added from weight" in caplog.text and "no Weight version" in caplog.text
    assert capfd.readouterr() == ("", "")


def test_sessions_are_neither_pickled_nor_copied():
    for refuse in (pickle.dumps, copy.copy, copy.deepcopy):
        with morva.VoiceDetector(16000) as stream, pytest.raises(TypeError, match="VoiceDetector cannot be pickled"):
            refuse(stream)


def test_the_licences_go_along():
    folder = files("morva") / "_bundled/licenses"
    assert {"LICENSE", "LICENSE.Highway.txt"} <= {each.name for each in folder.iterdir()}


def test_errors_say_why(tmp_path):
    bad = tmp_path / "bad.mvw"
    bad.write_bytes(b"no weight")
    for error, text, options in (
        (ValueError, "400000", {"rate": 400000}),
        (ValueError, "16000.5", {"rate": 16000.5}),
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
    assert {m.name: m.rate for m in morva.models()}["NC_small_16k.mvw"] == 16000
    assert morva.version() == morva.__version__


@pytest.fixture
def recordings(tmp_path, speech, write):
    for i, (name, subtype) in enumerate([("a.wav", "PCM_16"), ("deep/b.flac", "PCM_16"), ("deep/c.ogg", "VORBIS")]):
        write(f"in/{name}", speech[i * 48000 : (i + 1) * 48000], 48000, subtype)
    (tmp_path / "in/notes.txt").write_text("not a sound")
    return tmp_path / "in"


def run(*arguments):
    return batch.main([*map(str, arguments), "--workers", "2", "--quiet"])


def test_a_folder_is_cleaned_on_threads_resumed_and_its_failures_listed(recordings, tmp_path, capsys):
    out = tmp_path / "out"
    (recordings / "broken.wav").write_bytes(b"RIFF")
    assert run(recordings, "-o", out) == 1
    assert "broken.wav: LibsndfileError" in capsys.readouterr().err
    for name in ("a.wav", "deep/b.flac", "deep/c.ogg"):
        source, got = (soundfile.read(folder / name, dtype="float32")[0] for folder in (recordings, out))
        tolerance = 0.1 if name.endswith("ogg") else 1.01 / 32768  # which is lossy
        np.testing.assert_allclose(got, morva.denoise(source, 48000), atol=tolerance)
    entries = map(json.loads, filter(None, (out / batch.JOURNAL).read_text().split("\n")))
    assert [e["source"] for e in entries if e["error"]] == [str(recordings / "broken.wav")]

    # Again: only what failed, changed or vanished. The journal's last line was cut by a crash.
    before = (out / "deep/c.ogg").stat().st_mtime_ns
    with (out / batch.JOURNAL).open("a") as journal:
        journal.write('\n{"target": "')
    (out / "deep/b.flac").unlink()
    for name in ("broken.wav", "a.wav"):
        soundfile.write(recordings / name, np.zeros(9600), 48000)
    assert run(recordings, "-o", out) == 0
    assert "1 of 4 files are done already" in capsys.readouterr().err
    assert (out / "deep/c.ogg").stat().st_mtime_ns == before
    assert [soundfile.info(out / name).frames for name in ("a.wav", "broken.wav", "deep/b.flac")] == [9600, 9600, 48000]


def test_what_a_signal_stops_leaves_only_whole_files(recordings, tmp_path, monkeypatch, capsys):
    clean_file = batch.clean_file

    def interrupted(source, target, advance, **options):
        def step(*counts):
            os.kill(os.getpid(), signal.SIGTERM)
            while not advance.__self__.number:
                time.sleep(0.01)
            advance(*counts)

        clean_file(source, target, step, **options)

    monkeypatch.setattr(batch, "clean_file", interrupted)
    arguments = [str(recordings), "-o", str(tmp_path / "out"), "--workers", "1", "--quiet"]
    assert batch.main(arguments) == 128 + signal.SIGTERM
    assert "Traceback" not in capsys.readouterr().err
    assert not [path for path in (tmp_path / "out").rglob("*") if path.is_file()]


def test_plans_that_would_lose_something_are_refused(recordings, tmp_path, speech, write):
    other = write("other/a.wav", speech[:4800], 48000)
    assert run(recordings, other.parent, "-o", tmp_path / "out") == 2
    assert run(recordings, "-o", recordings) == 2
    assert run(tmp_path / "nowhere", "-o", tmp_path / "out") == 2

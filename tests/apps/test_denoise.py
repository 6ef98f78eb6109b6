"""morva denoise on real files: what comes out has the place, length, shape and format of what went in."""

import itertools
import os
import pathlib
import re
import resource

import numpy as np
import pytest
import soundfile

from conftest import BUILD, SOURCE, speechlike
from weights import constant_mask

RATES = [8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000]
OTHER_RATES = [4000, 11025, 22050, 37800, 64000]


def lag_and_likeness(before, after, rate, top):
    """Samples (to 1/100) by which `after` is late, and how alike the two are once that is undone."""
    hz = np.fft.rfftfreq(len(before), 1 / rate)
    band = (hz > 250) & (hz < 0.95 * top)
    x, y = np.fft.rfft(before)[band], np.fft.rfft(after)[band]
    lags = np.arange(-400, 401) / 100
    scores = np.real(np.exp(2j * np.pi * np.outer(lags, hz[band]) / rate) @ (y * np.conj(x)))
    best = int(np.argmax(scores))
    return lags[best], scores[best] / (np.linalg.norm(x) * np.linalg.norm(y))


@pytest.mark.parametrize("rate", RATES + OTHER_RATES)
@pytest.mark.parametrize("model_rate", [8000, 16000, 32000])
def test_identity_keeps_time_and_length_at_every_rate(morva, model, recording, tmp_path, rate, model_rate):
    top = min(3000, 0.4 * rate)
    before = speechlike(rate, 1.0, seed=rate + model_rate, top=top)
    source = recording(before, rate, subtype="FLOAT")
    frame = [10, 20, 30, 40][(rate + model_rate) // 100 % 4]
    weight = model(constant_mask(model_rate, [20, 30, 32][rate % 3]))
    morva("denoise", source, tmp_path / "out.wav", "--model", weight, "--frame", frame)
    after, out_rate = soundfile.read(tmp_path / "out.wav")
    assert out_rate == rate
    assert len(after) == len(before)
    lag, likeness = lag_and_likeness(before[:, 0], after, rate, top)
    print(f"lag {lag} samples, likeness {likeness:.5f}")
    assert abs(lag) <= 0.51  # delays are whole samples, so half a sample may be left
    assert likeness > 0.999


@pytest.mark.parametrize("length", [0, 1, 2, 159, 160, 161, 319, 4096, 4097, 12345])
@pytest.mark.parametrize("rate", [16000, 22050, 48000])
@pytest.mark.parametrize("ending", ["wav", "flac"])
def test_any_length_comes_back_as_it_was(morva, model, recording, tmp_path, length, rate, ending):
    if (length, ending) == (0, "flac"):
        pytest.skip("the sound-file library cannot read back a FLAC file without samples")
    source = recording(np.full(length, 0.1), rate, f"in.{ending}")
    morva("denoise", source, tmp_path / f"out.{ending}", "--model", model(constant_mask(16000)))
    info = soundfile.info(tmp_path / f"out.{ending}")
    assert (info.frames, info.samplerate) == (length, rate)


@pytest.mark.parametrize("channels", [1, 2, 3, 6])
@pytest.mark.parametrize("rate", [16000, 22050])
def test_channels_do_not_mix(morva, model, recording, tmp_path, channels, rate):
    before = speechlike(rate, 0.5, seed=channels, channels=channels)
    before[:, -1] = 0  # a silent channel stays silent
    source = recording(before, rate, subtype="PCM_16")
    morva("denoise", source, tmp_path / "out.wav", "--model", model(constant_mask(16000)))
    after, _ = soundfile.read(tmp_path / "out.wav", always_2d=True)
    assert after.shape == before.shape
    assert np.all(after[:, -1] == 0)
    for c in range(channels - 1):
        likeness = np.corrcoef(before.T, after[:, c])[-1, :-1]
        assert np.nanargmax(likeness) == c
        assert likeness[c] > 0.95  # half a sample late at the odd rate


FORMATS = [("wav", s) for s in ("PCM_U8", "PCM_16", "PCM_24", "PCM_32", "FLOAT", "DOUBLE", "ULAW")]
FORMATS += [("flac", s) for s in ("PCM_S8", "PCM_16", "PCM_24")] + [("ogg", "VORBIS")]
NEAREST = {  # where the container has no such sample type
    ("flac", "PCM_U8"): "PCM_S8",
    ("flac", "PCM_32"): "PCM_24",
    ("flac", "FLOAT"): "PCM_24",
    ("flac", "DOUBLE"): "PCM_24",
    ("flac", "ULAW"): "PCM_16",
    ("flac", "VORBIS"): "PCM_16",
    ("wav", "PCM_S8"): "PCM_U8",
    ("wav", "VORBIS"): "PCM_16",
}


@pytest.mark.parametrize(("source_format", "ending"), itertools.product(FORMATS, ["wav", "flac", "ogg"]))
def test_output_format_follows_the_ending(morva, model, recording, tmp_path, source_format, ending):
    container, subtype = source_format
    before = speechlike(16000, 0.3, seed=1)
    source = recording(before, 16000, f"in.{container}", subtype=subtype)
    out = tmp_path / f"out.{ending}"
    morva("denoise", source, out, "--model", model(constant_mask(16000)))
    info = soundfile.info(out)
    assert info.format == ending.upper()
    known = subtype if (ending, subtype) in FORMATS else NEAREST.get((ending, subtype), "VORBIS")
    assert info.subtype == known
    after, _ = soundfile.read(out)
    assert len(after) == len(before)
    assert np.corrcoef(before[:, 0], after)[0, 1] > (0.95 if "VORBIS" in (subtype, known) else 0.99)


@pytest.mark.parametrize("subtype", ["PCM_16", "PCM_24"])
def test_integer_samples_survive_to_the_last_bit(morva, model, recording, tmp_path, subtype):
    before = speechlike(16000, 0.5, seed=4)
    before[100] = -1.0  # the extremes of the scale
    before[200] = 32767 / 32768
    source = recording(before, 16000, subtype=subtype)
    morva("denoise", source, tmp_path / "out.wav", "--model", model(constant_mask(16000)))
    before, _ = soundfile.read(source)
    after, _ = soundfile.read(tmp_path / "out.wav")
    step = 2.0 ** -(int(subtype[4:]) - 1)
    # 16-bit comes back bit for bit; 24-bit within the engine's single precision on its 16-bit scale.
    assert np.abs(after - before).max() <= (step / 2 if subtype == "PCM_16" else 32 * step)


def test_tags_are_kept(morva, model, tmp_path):
    with soundfile.SoundFile(tmp_path / "in.flac", "w", 16000, 1) as file:
        file.title = "Interview 7"
        file.write(np.zeros(1600))
    morva("denoise", tmp_path / "in.flac", tmp_path / "out.wav", "--model", model(constant_mask(16000)))
    with soundfile.SoundFile(tmp_path / "out.wav") as file:
        assert file.title == "Interview 7"


@pytest.mark.parametrize(
    ("rate", "name"),
    [
        (8000, "NC_small_8k"),
        (4000, "NC_small_8k"),
        (11025, "NC_small_16k"),
        (16000, "NC_small_16k"),
        (22050, "c6.xs.f.ca03f4"),
        (96000, "c6.xs.f.ca03f4"),
    ],
)
def test_the_shipped_model_follows_the_rate(morva, recording, tmp_path, rate, name):
    source = recording(np.zeros(rate // 10), rate)
    done = morva("denoise", source, "-o", tmp_path / "out.wav", "--models", SOURCE / "models")
    assert name + ".mvw" in done.stderr
    assert done.stdout == ""


def test_the_bundled_recording_gets_cleaner(morva, tmp_path):
    audio = SOURCE / "examples/audio"
    morva("denoise", audio / "noisy.flac", tmp_path / "out.flac")
    noisy, clean, cleaned = (
        soundfile.read(p)[0] for p in (audio / "noisy.flac", audio / "clean.flac", tmp_path / "out.flac")
    )
    silent = np.convolve(clean**2, np.ones(4800), "same") < 1e-6
    assert silent.mean() > 0.1
    noise_before, noise_after = np.mean(noisy[silent] ** 2), np.mean(cleaned[silent] ** 2)
    assert 10 * np.log10(noise_before / noise_after) > 10
    error_before, error_after = np.sum((noisy - clean) ** 2), np.sum((cleaned - clean) ** 2)
    assert 10 * np.log10(error_before / error_after) > 3


def test_control_file_over_a_weight(morva, model, recording, tmp_path):
    before = 0.3 * speechlike(16000, 0.5, seed=9)
    source = recording(before, 16000, subtype="FLOAT")
    control = tmp_path / "louder.cfg"
    control.write_text("MORVA_VOLUME_UP_v0_0_6 TRUE\nMORVA_VOLUME_UP_PERCENT_v0_0_6 100\n")
    morva("denoise", source, tmp_path / "out.wav", "--model", model(constant_mask(16000)), "--control", control)
    after, _ = soundfile.read(tmp_path / "out.wav")
    assert np.abs(after - 2 * before[:, 0]).max() < 1e-5


def test_nothing_is_left_when_the_disk_is_full(morva, model, recording, tmp_path):
    """Neither the control file laid over a weight, which is written to a temporary one, nor half a result."""
    source, weight = recording(np.zeros(16000), 16000), model(constant_mask(16000))
    control = tmp_path / "louder.cfg"
    control.write_text("MORVA_VOLUME_UP_v0_0_6 TRUE\n")
    there = set(tmp_path.iterdir())
    for more in (["--control", control], []):
        done = morva("denoise", source, tmp_path / "out.wav", "--model", weight, *more, fails=True,
                     env=os.environ | {"TMPDIR": str(tmp_path)}, restore_signals=False,
                     preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (0, 0)))
        print(done.stderr)
        assert set(tmp_path.iterdir()) == there


@pytest.mark.parametrize("option", ["--model", "--control"])
def test_control_file_that_names_its_weight(morva, model, recording, tmp_path, option):
    before = speechlike(16000, 0.5, seed=9)
    source = recording(before, 16000, subtype="FLOAT")
    (tmp_path / "sub").mkdir()
    model(constant_mask(16000, mask=0.0), "sub/silent.mvw")
    control = tmp_path / "sub/model.cfg"
    control.write_text("WEIGHT silent.mvw\n")  # beside the control file, wherever one stands
    morva("denoise", source, tmp_path / "out.wav", option, control)
    after, _ = soundfile.read(tmp_path / "out.wav")
    assert np.abs(after).max() < 1e-6


def test_names_outside_ascii(morva, model, recording, tmp_path):
    weight = model(constant_mask(16000), "Gewichte für 音声.mvw")
    source = recording(np.zeros(1000), 16000, "größe 音.wav")
    morva("denoise", source, tmp_path / "ausgabe ü.flac", "--model", weight)
    assert soundfile.info(tmp_path / "ausgabe ü.flac").frames == 1000


def test_folder_keeps_its_structure_and_names_every_failure(morva, model, recording, tmp_path):
    names = [
        f"{folder}take{i}.{ending}"
        for i, (folder, ending) in enumerate(itertools.product(["", "a/", "a/b/"], ["wav", "flac", "ogg"]))
    ]
    sounds = {name: speechlike(16000, 0.2, seed=i) for i, name in enumerate(names)}
    for name, sound in sounds.items():
        recording(sound, 16000, "in/" + name)
    recording(np.zeros(10), 192000, "in/a/fast.wav")
    (tmp_path / "in/broken.wav").write_bytes(b"RIFF nonsense")
    (tmp_path / "in/notes.txt").write_text("not a sound")
    out = tmp_path / "out"
    done = morva("denoise", tmp_path / "in", "-o", out, "--model", model(constant_mask(16000)), "-j", 4, fails=True)
    assert "fast.wav: a rate of 192000 Hz is not supported" in done.stderr
    assert "broken.wav" in done.stderr
    assert "2 of 11 files failed" in done.stderr
    written = sorted(str(p.relative_to(out)) for p in out.rglob("*") if p.is_file())
    assert written == sorted(names)
    for name, before in sounds.items():
        after, _ = soundfile.read(out / name)
        assert np.corrcoef(before[:, 0], after)[0, 1] > 0.95


def test_several_files_give_the_same_as_one_by_one(morva, recording, tmp_path):
    sources = [recording(speechlike(16000, 0.4, seed=i), 16000, f"f{i}.wav") for i in range(6)]
    models = ("--models", SOURCE / "models")
    morva("denoise", *sources, "-o", tmp_path / "batch/", "-j", 4, *models)
    for source in sources:
        morva("denoise", source, tmp_path / "one.wav", *models)
        assert (tmp_path / "one.wav").read_bytes() == (tmp_path / "batch" / source.name).read_bytes()


def write_bad_models(folder: pathlib.Path):
    from weights import encode, loudness_voice

    (folder / "text.mvw").write_text("this is not a model")
    (folder / "empty.mvw").write_bytes(b"")
    (folder / "voice.mvw").write_bytes(encode(loudness_voice()))
    whole = encode(constant_mask(16000))
    (folder / "cut.mvw").write_bytes(whole[: len(whole) // 2])
    (folder / "half.cfg").write_text("WEIGHT\n")


@pytest.mark.parametrize(
    ("arguments", "text"),
    [
        (["in.wav"], "name one input and one output"),
        (["in.wav", "other.wav", "out.wav"], "name one input and one output"),
        (["missing.wav", "out.wav"], "missing.wav: no such file"),
        (["notes.txt", "out.wav"], "notes.txt: cannot be read"),
        (["cut.flac", "out.wav"], "cut.flac"),
        (["fast.wav", "out.wav"], "192000 Hz is not supported"),
        (["in.wav", "in.wav"], "is an input as well"),
        (["in.wav", "link.wav"], "is an input as well"),
        (["in.wav", "./x/../in.wav"], "is an input as well"),
        (["in.wav", "folder"], "folder: is a folder"),
        (["folder", "out.wav"], "folder: is a folder"),
        (["folder", "-o", "out"], "no .wav, .flac or .ogg file"),
        (["in.wav", "missing/out.wav"], "missing/out.wav: cannot be written"),
        (["in.wav", "out.mp3"], "ends in .wav, .flac or .ogg"),
        (["in.wav", "device.wav"], "not a regular file"),
        (["in.wav", "other.wav", "-o", "notes.txt"], "notes.txt: is a file"),
        (["in.wav", "sub/in.wav", "-o", "out"], "two inputs would be written"),
        (["in.wav", "out.wav", "--model", "missing.mvw"], "missing.mvw: no such file"),
        (["in.wav", "out.wav", "--model", "notes.txt"], "ends in .mvw or .cfg"),
        (["in.wav", "out.wav", "--model", "folder"], "is a folder"),
        (["in.wav", "out.wav", "--model", "text.mvw"], "text.mvw"),
        (["in.wav", "out.wav", "--model", "empty.mvw"], "empty.mvw"),
        (["in.wav", "out.wav", "--model", "cut.mvw"], "cut.mvw"),
        (["in.wav", "out.wav", "--model", "voice.mvw"], "Unsupported weight version"),
        (["in.wav", "out.wav", "--model", "half.cfg"], "half.cfg"),
        (["in.wav", "out.wav", "--control", "missing.cfg"], "missing.cfg: no such file"),
        (["in.wav", "out.wav", "--models", "folder"], "no such file"),
        (["in.wav", "out.wav", "--frame", "15"], "--frame"),
    ],
)
def test_errors_are_told_and_leave_nothing_behind(morva, model, recording, tmp_path, arguments, text):
    recording(np.zeros(1600), 16000)
    recording(np.zeros(1600), 16000, "other.wav")
    recording(np.zeros(1600), 16000, "sub/in.wav")
    recording(np.zeros(1600), 192000, "fast.wav")
    whole = recording(speechlike(16000, 2.0, 1), 16000, "whole.flac").read_bytes()
    (tmp_path / "cut.flac").write_bytes(whole[: len(whole) // 2])
    (tmp_path / "notes.txt").write_text("not a sound")
    (tmp_path / "folder").mkdir()
    (tmp_path / "link.wav").symlink_to("in.wav")
    (tmp_path / "device.wav").symlink_to("/dev/full")
    (tmp_path / "x").mkdir()
    write_bad_models(tmp_path)
    weight = model(constant_mask(16000))
    if not {"--model", "--models", "--control"} & set(arguments):
        arguments = [*arguments, "--model", weight]
    (tmp_path / "out.wav").write_bytes(b"older result")
    done = morva("denoise", *arguments, cwd=tmp_path, fails=True)
    assert text in done.stderr
    assert done.stdout == ""
    assert (tmp_path / "out.wav").read_bytes() == b"older result"
    assert not list(tmp_path.rglob("*.part-*"))


def test_progress_bar_only_on_a_terminal(morva, model, recording, tmp_path):
    source = recording(np.zeros(16000 * 120), 16000)
    arguments = ("denoise", source, tmp_path / "out.wav", "--model", model(constant_mask(16000)))
    assert "%" not in morva(*arguments).stderr

    import pty
    import subprocess

    leader, follower = pty.openpty()
    process = subprocess.Popen([BUILD / "morva", *map(str, arguments)], stderr=follower)
    os.close(follower)
    seen = b""
    while True:
        try:
            block = os.read(leader, 4096)
        except OSError:  # the other end is closed
            break
        if not block:
            break
        seen += block
    os.close(leader)
    assert process.wait(timeout=60) == 0
    assert re.search(rb"\[#* *\] +\d+%", seen)


def test_verbose_shows_the_engine_and_plain_does_not(morva, model, recording, tmp_path):
    arguments = ("denoise", recording(np.zeros(100), 16000), tmp_path / "o.wav", "--model", model(constant_mask(16000)))
    assert "WEIGHT" not in morva(*arguments).stderr
    loud = morva(*arguments, "--verbose")
    assert "WEIGHT" in loud.stderr
    assert loud.stdout == ""

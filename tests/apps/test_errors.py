"""What the commands refuse: one line says why, and every file stays as it was."""

import os
import resource
import subprocess

import numpy as np
import pytest
import soundfile

from conftest import constant_mask, loudness_voice, mvw, noise_level, speechlike

REFUSED = [
    ("denoise missing.wav out.wav", "missing.wav: no such file"),
    ("denoise notes.txt out.wav", "notes.txt: cannot be read"),
    ("denoise cut.flac out.wav", "cut.flac: damaged"),
    ("denoise fast.wav out.wav", "fast.wav: a rate of 192000 Hz is not supported"),
    ("denoise in.wav in.wav", "is an input as well"),
    ("denoise in.wav link.wav", "is an input as well"),
    ("denoise in.wav missing/out.wav", "missing/out.wav: cannot be written"),
    ("denoise in.wav out.mp3", "ends in .wav, .flac or .ogg"),
    ("denoise in.wav sub/in.wav -o out", "two inputs would be written"),
    ("denoise in.wav out.wav --model missing.mvw", "missing.mvw: no such file"),
    ("denoise in.wav out.wav --model notes.txt", "ends in .mvw or .cfg"),
    ("denoise in.wav out.wav --model cut.mvw", "cut.mvw: the model cannot be used: ERROR DATA"),
    ("vad in.wav --model raw.mvw", "gives scores outside 0..1: it is not calibrated"),
    ("inspect text.mvw", "text.mvw: is no weight file"),
]


@pytest.fixture(scope="module")
def folder(tmp_path_factory):
    path = tmp_path_factory.mktemp("errors")
    (path / "sub").mkdir()
    for name in ("in.wav", "other.wav", "sub/in.wav", "fast.wav"):
        soundfile.write(path / name, np.full(1600, 0.1), 192000 if name == "fast.wav" else 16000)
    soundfile.write(path / "whole.flac", speechlike(16000, 2.0, 1), 16000)
    raw = {name: value for name, value in loudness_voice().items() if name != "Test_MINMAX"}
    models = {"good": constant_mask(), "raw": raw, "level": noise_level()}
    for name, values in models.items():
        mvw.write(path / f"{name}.mvw", values)
    for whole, cut in [("whole.flac", "cut.flac"), ("good.mvw", "cut.mvw")]:
        data = (path / whole).read_bytes()
        (path / cut).write_bytes(data[: len(data) // 2])
    texts = {"text.mvw": "this is not a model", "notes.txt": "not a sound", "out.wav": "older result"}
    for name, text in (texts | {"louder.cfg": "MORVA_VOLUME_UP_v0_0_6 TRUE\n"}).items():
        (path / name).write_text(text)
    (path / "link.wav").symlink_to("in.wav")
    return path


def content(folder):
    return {path: path.is_file() and path.read_bytes() for path in folder.rglob("*")}


@pytest.mark.parametrize(("command", "text"), REFUSED)
def test_errors_are_told_and_leave_everything_as_it_was(morva, folder, command, text):
    before = content(folder)
    done = morva(*command.split(), cwd=folder, status=1)
    assert text in done.stderr
    assert done.stderr.startswith("morva: ") and done.stderr.count("\n") == 1
    assert done.stdout == ""
    assert content(folder) == before


@pytest.mark.parametrize("more", [[], ["--control", "louder.cfg"]])
def test_a_full_disk_is_left_as_it_was(morva, folder, more):
    """Neither half a result stays nor the temporary file that joins a weight and a control file."""
    before = content(folder)
    options = {"env": os.environ | {"TMPDIR": str(folder)}, "cwd": folder, "restore_signals": False}
    options["preexec_fn"] = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (0, 0))
    morva("denoise", "in.wav", "out.wav", "--model", "good.mvw", *more, status=1, **options)
    assert content(folder) == before


def test_standard_output_that_takes_nothing(morva, folder):
    with open("/dev/full", "w") as full:
        options = {"cwd": folder, "capture_output": False, "stdout": full, "stderr": subprocess.PIPE}
        assert "standard output" in morva("level", "in.wav", "--model", "level.mvw", status=1, **options).stderr

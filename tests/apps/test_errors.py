"""What the commands refuse: one line says why, and every file stays as it was."""

import os
import resource
import signal
import subprocess

import numpy as np
import pytest
import soundfile

from conftest import BUILD, constant_mask, loudness_voice, mvw, noise_level, speechlike

CUT = ["wav", "flac", "ogg", "aiff", "mp3"]  # kinds of files that are cut off
REFUSED = [
    ("denoise missing.wav out.wav", "missing.wav: no such file"),
    ("denoise notes.txt out.wav", "notes.txt: cannot be read"),
    ("denoise head.wav out.wav", "head.wav: nothing of it can be read"),
    ("denoise fast.wav out.wav", "fast.wav: a rate of 400000 Hz is not supported"),
    ("denoise in.wav in.wav", "is an input as well"),
    ("denoise in.wav link.wav", "is an input as well"),
    ("denoise other.wav in.wav -o links", "is an input as well"),
    ("vad in.wav -o in.wav", "is an input as well"),
    ("level in.wav -o link.wav --model level.mvw", "is an input as well"),
    ("level in.wav -o level.mvw --model level.mvw", "is an input as well"),
    ("inspect good.mvw -o good.mvw", "is an input as well"),
    ("report in.wav links/other.wav", "is an input as well"),
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
        soundfile.write(path / name, np.full(1600, 0.1), 400000 if name == "fast.wav" else 16000)
    for ending in CUT:
        soundfile.write(path / f"whole.{ending}", speechlike(16000, 9.0, 1), 16000)
    raw = {name: value for name, value in loudness_voice().items() if name != "Test_MINMAX"}
    models = {"good": constant_mask(), "raw": raw, "level": noise_level()}
    for name, values in models.items():
        mvw.write(path / f"{name}.mvw", values)
    for whole in [path / "good.mvw", *path.glob("whole.*")]:
        data = whole.read_bytes()
        (path / f"cut{whole.suffix}").write_bytes(data[: len(data) // 2])
    (path / "head.wav").write_bytes((path / "whole.wav").read_bytes()[:44])
    texts = {"text.mvw": "this is not a model", "notes.txt": "not a sound", "out.wav": "older result"}
    for name, text in (texts | {"louder.cfg": "MORVA_VOLUME_UP_v0_0_6 TRUE\n"}).items():
        (path / name).write_text(text)
    (path / "link.wav").symlink_to("in.wav")
    (path / "links").mkdir()
    (path / "links/other.wav").hardlink_to(path / "in.wav")
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


FULL = ["denoise in.wav out.wav --model good.mvw", "denoise in.wav out.wav --model good.mvw --control louder.cfg"]
FULL += ["level in.wav -o out.wav --model level.mvw", "inspect good.mvw -o out.wav"]


@pytest.mark.parametrize("command", FULL)
def test_a_full_disk_is_left_as_it_was(morva, folder, command):
    """Neither half a result stays nor the temporary file that joins a weight and a control file."""
    before = content(folder)
    options = {"env": os.environ | {"TMPDIR": str(folder)}, "cwd": folder, "restore_signals": False}
    options["preexec_fn"] = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (0, 0))
    morva(*command.split(), status=1, **options)
    assert content(folder) == before


@pytest.mark.parametrize("ending", CUT)
def test_what_is_left_of_a_cut_file_is_cleaned_and_the_status_says_so(morva, folder, tmp_path, ending):
    source = folder / f"cut.{ending}"
    piped = {"input": source.read_bytes(), "text": False} if ending in ("wav", "ogg") else None
    for name, options in [(source, {}), *([("-", piped)] if piped else [])]:
        out = tmp_path / "out.wav"
        done = morva("denoise", name, out, "--model", folder / "good.mvw", status=3, **options)
        assert "only its first" in str(done.stderr)
        assert 1 < soundfile.info(out).duration < 8
        out.unlink()
    assert "only its first" in morva("level", source, "--model", folder / "level.mvw", status=3).stderr


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_signals_leave_no_half_file(folder, number):
    before = content(folder)
    command = [BUILD / "morva", "denoise", "-", "out.wav", "--model", "good.mvw"]
    options = {"cwd": folder, "stdin": subprocess.PIPE, "preexec_fn": lambda: signal.signal(number, signal.SIG_DFL)}
    with subprocess.Popen(command, **options) as process:
        process.stdin.write((folder / "whole.wav").read_bytes()[:10000])
        process.stdin.flush()
        while not list(folder.glob("out.wav.part-*")):
            assert process.poll() is None
        process.send_signal(number)
        assert process.wait() == -number
    assert content(folder) == before


def test_standard_output_that_takes_nothing(morva, folder):
    with open("/dev/full", "w") as full:
        options = {"cwd": folder, "capture_output": False, "stdout": full, "stderr": subprocess.PIPE}
        assert "standard output" in morva("level", "in.wav", "--model", "level.mvw", status=1, **options).stderr

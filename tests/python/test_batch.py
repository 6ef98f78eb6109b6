"""Folders of recordings: complete, resumable, failures listed."""

import json
import os

import numpy as np
import pytest
import soundfile

import morva
from morva import batch


@pytest.fixture
def recordings(tmp_path, speech, write):
    for i, name in enumerate(["in/a.wav", "in/deep/b.flac", "in/deep/c.ogg"]):
        subtype = {"wav": "PCM_16", "flac": "PCM_16", "ogg": "VORBIS"}[name.rsplit(".", 1)[1]]
        write(name, speech[i * 48000 : (i + 1) * 48000], 48000, subtype)
    (tmp_path / "in/notes.txt").write_text("not a sound")
    return tmp_path / "in"


def run(*arguments):
    return batch.main([*map(str, arguments), "--workers", "2", "--quiet"])


def times(folder):
    return {p.relative_to(folder): p.stat().st_mtime_ns for p in folder.rglob("*.*")}


def test_a_folder_is_cleaned_resumed_and_its_failures_listed(recordings, tmp_path, capsys):
    out = tmp_path / "out"
    (recordings / "broken.wav").write_bytes(b"RIFF")
    assert run(recordings, "-o", out) == 1
    assert "broken.wav: LibsndfileError" in capsys.readouterr().err
    for name in ("a.wav", "deep/b.flac", "deep/c.ogg"):
        source, rate = soundfile.read(recordings / name, dtype="float32")
        got, _ = soundfile.read(out / name, dtype="float32")
        assert got.shape == source.shape
        if name != "deep/c.ogg":  # which is lossy
            np.testing.assert_allclose(got, morva.denoise(source, rate), atol=1.01 / 32768)
    assert not (out / "broken.wav").exists()
    failed = [e for e in map(json.loads, filter(None, (out / batch.JOURNAL).read_text().split("\n"))) if e["error"]]
    assert [os.path.basename(e["source"]) for e in failed] == ["broken.wav"]

    # Again: only what failed, changed or vanished. The journal's last line was cut by a crash.
    before = times(out)
    with (out / batch.JOURNAL).open("a") as journal:
        journal.write('\n{"target": "')
    (out / "deep/b.flac").unlink()
    soundfile.write(recordings / "broken.wav", np.zeros(4800), 48000)
    soundfile.write(recordings / "a.wav", np.zeros(9600), 48000)
    assert run(recordings, "-o", out) == 0
    assert "1 of 4 files are done already" in capsys.readouterr().err
    after = times(out)
    same = {str(name) for name in before if after[name] == before[name]}
    assert "deep/c.ogg" in same and not same & {"a.wav", "deep/b.flac", "broken.wav"}
    assert soundfile.info(out / "a.wav").frames == 9600


def test_plans_that_would_lose_something_are_refused(recordings, tmp_path, speech, write):
    other = write("other/a.wav", speech[:4800], 48000)
    assert run(recordings, other.parent, "-o", tmp_path / "out") == 2
    assert run(recordings, "-o", recordings) == 2
    assert run(tmp_path / "nowhere", "-o", tmp_path / "out") == 2

"""morva vad and morva level, with models whose answer can be told beforehand."""

import csv
import io
import json

import numpy as np
import pytest

from conftest import speechlike
from weights import constant_mask, loudness_voice

RATES = [8000, 11025, 12000, 16000, 22050, 24000, 32000, 44100, 48000, 88200, 96000]
BURSTS = [(0.5, 1.0), (1.05, 1.4), (2.0, 2.6)]  # the first two are one for a listener


def bursts(rate):
    sound = speechlike(rate, 3.0, seed=rate, top=min(3000, 0.4 * rate))[:, 0]
    time = np.arange(len(sound)) / rate
    return sound * np.any([(time >= start) & (time < end) for start, end in BURSTS], axis=0)


def rows(text):
    return list(csv.DictReader(io.StringIO(text)))


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("frame", [10, 20, 40])
def test_segments_lie_where_the_sound_is(morva, model, recording, rate, frame):
    source = recording(bursts(rate), rate)
    weight = model(loudness_voice())
    page = json.loads(morva("vad", source, "--model", weight, "--frame", frame, "--format", "json").stdout)
    assert page["frame_ms"] == frame
    assert abs(len(page["scores"]) - 3000 / frame) <= 1
    assert 0 <= min(page["scores"]) and max(page["scores"]) <= 1
    reach = (30 + 30 + frame) / 1000  # padding, analysis window, one frame
    expected = [(0.5, 1.4), (2.0, 2.6)]
    assert len(page["segments"]) == len(expected)
    for segment, (start, end) in zip(page["segments"], expected, strict=True):
        assert start - reach <= segment["start_s"] <= start
        assert end <= segment["end_s"] <= end + reach


def test_rules_are_taken_from_the_command_line(morva, model, recording):
    arguments = ("vad", recording(bursts(16000), 16000), "--model", model(loudness_voice()), "--format", "json")

    def count(*more):
        return len(json.loads(morva(*arguments, *more).stdout)["segments"])

    assert count("--min-silence", 10, "--padding", 0) == 3
    assert count("--min-silence", 1000) == 1
    assert count("--threshold", 1.0) == 0
    bare, wide = (json.loads(morva(*arguments, "--padding", p).stdout)["speech_s"] for p in (0, 50))
    assert wide == pytest.approx(bare + 4 * 0.05)


def test_csv_and_text_tell_the_same_as_json(morva, model, recording, tmp_path):
    arguments = ("vad", recording(bursts(48000), 48000), "--model", model(loudness_voice()))
    page = json.loads(morva(*arguments, "--format", "json").stdout)
    table = rows(morva(*arguments, "--format", "csv").stdout)
    assert [float(r["score"]) for r in table] == pytest.approx(page["scores"], abs=1e-6)
    assert [float(r["time_s"]) for r in table] == pytest.approx(np.arange(len(table)) / 100)
    spoken = [
        any(s["start_s"] <= t < s["end_s"] for s in page["segments"]) for t in np.arange(len(table)) / 100 + 0.005
    ]
    assert [r["speech"] == "1" for r in table] == spoken
    text = morva(*arguments).stdout.splitlines()
    assert len(text) == len(page["segments"]) + 2
    assert [float(x) for x in text[1].split()[:2]] == pytest.approx(list(page["segments"][0].values()), abs=1e-3)
    for ending in ("csv", "json"):
        out = tmp_path / f"scores.{ending}"
        assert morva(*arguments, "-o", out).stdout == ""
        assert out.read_text() == morva(*arguments, "--format", ending).stdout


def test_channels_are_averaged(morva, model, recording):
    sound = bursts(16000)
    arguments = ("--model", model(loudness_voice()), "--format", "csv")
    opposite = recording(np.stack([sound, -sound], axis=1), 16000, "opposite.wav")
    assert max(float(r["score"]) for r in rows(morva("vad", opposite, *arguments).stdout)) < 0.1
    same = recording(np.stack([sound, sound], axis=1), 16000, "same.wav")
    alone = recording(sound, 16000, "alone.wav")
    assert morva("vad", same, *arguments).stdout == morva("vad", alone, *arguments).stdout


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("level", [-20.0, -50.0, -115.0])
def test_what_is_removed_is_the_level(morva, model, recording, rate, level):
    noise = speechlike(rate, 3.0, seed=1, top=min(3000, 0.4 * rate))[:, 0]
    second = slice(rate, 2 * rate)
    noise *= 10 ** (level / 20) / np.sqrt(np.mean(noise[second] ** 2))
    source = recording(noise, rate, subtype="FLOAT")
    table = rows(
        morva("level", source, "--model", model(constant_mask(16000, 20, 0.0, "0.0.5")), "--format", "csv").stdout
    )
    heard = [10 ** (float(r["level_dbfs"]) / 10) for r in table if 1 <= float(r["time_s"]) < 2]
    assert 10 * np.log10(np.mean(heard)) == pytest.approx(level, abs=0.5)
    for r in table:
        assert float(r["level_db"]) - float(r["level_dbfs"]) == pytest.approx(90.309, abs=1e-3)


def test_a_mask_that_removes_nothing_reads_as_silence(morva, model, recording):
    source = recording(speechlike(16000, 1.0, 2), 16000)
    weight = model(constant_mask(16000, 20, 1.0, "0.0.5"))
    page = json.loads(morva("level", source, "--model", weight, "--format", "json").stdout)
    assert max(page["levels_db"]) < -50
    assert len(page["levels_db"]) == 100


@pytest.mark.parametrize("command", ["vad", "level"])
def test_errors(morva, model, recording, tmp_path, command):
    source = recording(np.zeros(1600), 16000)
    fast = recording(np.zeros(1600), 192000, "fast.wav")
    cleaner = model(constant_mask(16000))
    other = model(loudness_voice(), "voice.mvw") if command == "level" else cleaner
    good = cleaner if command == "level" else model(loudness_voice(), "voice.mvw")
    assert "Unsupported weight version" in morva(command, source, "--model", other, fails=True).stderr
    assert "no such file" in morva(command, tmp_path / "none.wav", "--model", good, fails=True).stderr
    assert "192000 Hz is not supported" in morva(command, fast, "--model", good, fails=True).stderr
    with open("/dev/full", "w") as full:
        import subprocess
        from conftest import BUILD

        weight = model(constant_mask(16000, 20, 1.0, "0.0.5"), "level.mvw") if command == "level" else good
        done = subprocess.run(
            [BUILD / "morva", command, source, "--model", weight, "--format", "csv"],
            stdout=full,
            stderr=subprocess.PIPE,
            text=True,
        )
    assert done.returncode == 1 and "standard output" in done.stderr


def test_an_uncalibrated_model_is_told_apart(morva, model, recording):
    values = loudness_voice()
    del values["Test_MINMAX"]
    done = morva("vad", recording(bursts(16000), 16000), "--model", model(values), fails=True)
    assert "not calibrated" in done.stderr


def test_a_file_without_samples(morva, model, recording):
    source = recording(np.zeros(0), 16000)
    assert rows(morva("vad", source, "--model", model(loudness_voice()), "--format", "csv").stdout) == []
    weight = model(constant_mask(16000, 20, 0.0, "0.0.5"), "level.mvw")
    assert morva("level", source, "--model", weight).stdout == "no frames\n"

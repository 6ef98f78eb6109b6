"""morva vad and morva level, with models whose answer can be told beforehand."""

import csv
import io
import json

import numpy as np
import pytest

from conftest import speechlike
from weights import loudness_voice, noise_level

RATES = [8000, 11025, 12000, 16000, 22050, 24000, 32000, 44100, 48000, 88200, 96000]
BURSTS = [(0.5, 1.0), (1.05, 1.4), (2.0, 2.6)]  # the first two are one for a listener


def bursts(rate):
    sound = speechlike(rate, 3.0, seed=rate)[:, 0]
    time = np.arange(len(sound)) / rate
    return sound * np.any([(time >= start) & (time < end) for start, end in BURSTS], axis=0)


def rows(text):
    return list(csv.DictReader(io.StringIO(text)))


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("frame", [10, 20, 40])
def test_segments_lie_where_the_sound_is(morva, model, recording, rate, frame):
    source, weight = recording(bursts(rate), rate), model(loudness_voice())
    page = json.loads(morva("vad", source, "--model", weight, "--frame", frame, "--format", "json").stdout)
    assert page["frame_ms"] == frame
    assert abs(len(page["scores"]) - 3000 / frame) <= 1
    assert 0 <= min(page["scores"]) and max(page["scores"]) <= 1
    reach = (30 + 30 + frame) / 1000  # padding, analysis window, one frame
    for segment, (start, end) in zip(page["segments"], [(0.5, 1.4), (2.0, 2.6)], strict=True):
        assert start - reach <= segment["start_s"] <= start
        assert end <= segment["end_s"] <= end + reach


def segments_by_hand(scores, frame, threshold, release, silence, padding):
    """Speech starts at the threshold and ends before the first silence, a run of frames below the threshold from one
    below the release threshold on, that is long enough or reaches the end. Padding ends in the middle of a gap."""
    bare, n, i = [], len(scores), 0
    while (start := next((k for k in range(i, n) if scores[k] >= threshold), n)) < n:
        end = i = n
        for low in range(start, n):
            back = next((k for k in range(low, n) if scores[k] >= threshold), n)
            if scores[low] < release and ((back - low) * frame >= silence or back == n):
                end, i = low, back
                break
        bare.append((start * frame, end * frame))
    for k, (start, end) in enumerate(bare):
        before = (start - bare[k - 1][1]) / 2 if k else start
        after = (bare[k + 1][0] - end) / 2 if k + 1 < len(bare) else n * frame - end
        yield start - min(padding, before), end + min(padding, after)


@pytest.mark.parametrize("seed", range(40))
def test_segments_follow_the_rules(morva, model, recording, seed):
    rng = np.random.default_rng(seed)
    steps = rng.choice([0, 0.0003, 0.001, 0.01, 0.1, 1], 120).repeat(rng.integers(1, 12, 120))
    sound = 0.5 * rng.standard_normal(len(steps) * 80) * steps.repeat(80)
    frame, threshold = rng.choice([10, 20, 30, 40]), round(rng.uniform(0.3, 0.9), 3)
    rules = [threshold, round(threshold * rng.uniform(), 3), 10 * rng.integers(20), 10 * rng.integers(20)]
    options = zip(["--threshold", "--release-threshold", "--min-silence", "--padding"], rules)
    arguments = [*sum(options, ()), "--frame", frame, "--format", "json", "--model", model(loudness_voice())]
    page = json.loads(morva("vad", recording(sound, 8000), *arguments).stdout)
    found = [1000 * segment[end] for segment in page["segments"] for end in ("start_s", "end_s")]
    wanted = [*sum(segments_by_hand(page["scores"], frame, *rules), ())]
    assert found == pytest.approx(wanted)
    assert page["speech_s"] == pytest.approx(sum(found[1::2]) / 1000 - sum(found[::2]) / 1000)


def test_csv_and_text_tell_the_same_as_json(morva, model, recording, tmp_path):
    arguments = ("vad", recording(bursts(48000), 48000), "--model", model(loudness_voice()))
    page = json.loads(morva(*arguments, "--format", "json").stdout)
    table = rows(morva(*arguments, "--format", "csv").stdout)
    times = np.arange(len(page["scores"])) / 100
    assert [float(r["score"]) for r in table] == pytest.approx(page["scores"], abs=1e-6)
    assert [float(r["time_s"]) for r in table] == pytest.approx(times)
    spoken = [any(s["start_s"] <= t < s["end_s"] for s in page["segments"]) for t in times + 0.005]
    assert [r["speech"] == "1" for r in table] == spoken
    text = morva(*arguments).stdout.splitlines()
    assert len(text) == len(page["segments"]) + 2
    assert [float(x) for x in text[1].split()[:2]] == pytest.approx(list(page["segments"][0].values()), abs=1e-3)
    for ending in ("csv", "json"):
        out = tmp_path / f"scores.{ending}"
        assert morva(*arguments, "-o", out).stdout == ""
        assert out.read_text() == morva(*arguments, "--format", ending).stdout


def test_channels_are_averaged_and_names_may_be_any_bytes(morva, model, recording):
    sound = bursts(16000)
    arguments = ("--model", model(loudness_voice()), "--format", "json")

    def page(name, *channels):
        source = recording(np.stack(channels, axis=1), 16000, "in.wav")
        named = source.rename(source.with_name(name))
        return json.loads(morva("vad", named, *arguments).stdout)

    assert max(page("opposite", sound, -sound)["scores"]) < 0.1
    assert page("\udcff.wav", sound, sound)["scores"] == page("alone.wav", sound)["scores"]


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("level", [-20.0, -50.0, -115.0])
def test_what_is_removed_is_the_level(morva, model, recording, rate, level):
    noise = speechlike(rate, 3.0, seed=1)[:, 0]
    noise *= 10 ** (level / 20) / np.sqrt(np.mean(noise[rate : 2 * rate] ** 2))
    source = recording(noise, rate, subtype="FLOAT")
    table = rows(morva("level", source, "--model", model(noise_level()), "--format", "csv").stdout)
    heard = [10 ** (float(r["level_dbfs"]) / 10) for r in table if 1 <= float(r["time_s"]) < 2]
    assert 10 * np.log10(np.mean(heard)) == pytest.approx(level, abs=0.5)
    for r in table:
        assert float(r["level_db"]) - float(r["level_dbfs"]) == pytest.approx(90.309, abs=1e-3)


def test_a_file_without_samples(morva, model, recording):
    source = recording(np.zeros(0), 16000)
    assert morva("vad", source, "--model", model(loudness_voice()), "--format", "csv").stdout.count("\n") == 1
    assert morva("level", source, "--model", model(noise_level())).stdout == "no frames\n"

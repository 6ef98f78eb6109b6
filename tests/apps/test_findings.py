"""morva vad, level and inspect, with models whose answer can be told beforehand."""

import csv
import json

import numpy as np
import pytest

from conftest import SOURCE, constant_mask, loudness_voice, mvw, noise_level, speechlike

RATES = [8000, 11025, 12000, 16000, 22050, 24000, 32000, 44100, 48000, 88200, 96000]
TYPES = ["float", "int", "string", "vector", "matrix", "vectors", "matrices"]  # in the order of their codes


@pytest.fixture
def find(morva, model, recording, tmp_path):
    """What a command finds in a sound with the model of these values; a table is written to a file."""

    def run(command, values, sound, rate, *options, name="in.wav", form="json"):
        source = recording(sound, rate, subtype="FLOAT")
        arguments = (command, source.rename(source.with_name(name)), "--model", model(values), *options)
        if form == "csv":
            assert morva(*arguments, "-o", tmp_path / "found.csv").stdout == ""
            return list(csv.DictReader((tmp_path / "found.csv").open()))
        return json.loads(morva(*arguments, "--format", "json").stdout)

    return run


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


@pytest.mark.parametrize("seed", range(66))
def test_scores_lie_where_the_sound_is_and_segments_follow_the_rules(find, seed):
    rng = np.random.default_rng(seed)
    rate, frame, threshold = RATES[seed % 11], rng.choice([10, 20, 30, 40]), round(rng.uniform(0.3, 0.9), 3)
    steps = rng.choice([0, 0.0003, 0.001, 0.01, 0.1, 1], 120).repeat(rng.integers(1, 12, 120))  # of 10 ms
    time = np.arange(len(steps) * rate // 100) * 100 // rate
    sound = 0.2 * rng.standard_normal(len(time)) * steps[time]
    rules = [threshold, round(threshold * rng.uniform(), 3), 10 * rng.integers(20), 10 * rng.integers(20)]
    options = zip(["--threshold", "--release-threshold", "--min-silence", "--padding"], rules)
    page = find("vad", loudness_voice(), sound, rate, "--frame", frame, *sum(options, ()))
    assert len(page["scores"]) == -(-len(steps) * 10 // frame)
    for i, score in enumerate(page["scores"]):  # of a window of 30 ms near the end of the frame
        heard = set(steps[max((i + 1) * frame // 10 - 5, 0) : (i + 1) * frame // 10])
        assert score < 0.3 if heard == {0} else score > 0.5 if heard == {1} else 0 <= score <= 1, i
    found = [1000 * segment[end] for segment in page["segments"] for end in ("start_s", "end_s")]
    assert found == pytest.approx([*sum(segments_by_hand(page["scores"], frame, *rules), ())])
    assert page["speech_s"] == pytest.approx(sum(found[1::2]) / 1000 - sum(found[::2]) / 1000)


def test_csv_tells_the_same_as_json(find):
    case = ("vad", loudness_voice(), speechlike(48000, 3.0, 1), 48000)
    page, table = find(*case), find(*case, form="csv")
    assert [float(r["score"]) for r in table] == pytest.approx(page["scores"], abs=1e-6)
    times = [float(r["time_s"]) + 0.005 for r in table]
    spoken = [any(s["start_s"] <= t < s["end_s"] for s in page["segments"]) for t in times]
    assert [r["speech"] == "1" for r in table] == spoken and any(spoken)


def test_channels_are_averaged_and_names_may_be_any_bytes(find):
    sound = speechlike(16000, 1.0, 1)
    scores = find("vad", loudness_voice(), np.hstack([sound, -sound]), 16000, name="\udcff.wav")["scores"]
    assert max(scores) < 0.3


@pytest.mark.parametrize("rate", RATES)
@pytest.mark.parametrize("level", [-20.0, -50.0, -115.0])
def test_what_is_removed_is_the_level(find, rate, level):
    noise = speechlike(rate, 3.0, seed=1)
    noise *= 10 ** (level / 20) / np.sqrt(np.mean(noise[rate : 2 * rate] ** 2))
    levels = np.array([list(map(float, r.values())) for r in find("level", noise_level(), noise, rate, form="csv")])
    assert levels[:, 1] - levels[:, 2] == pytest.approx(90.309, abs=1e-3)
    assert 10 * np.log10(np.mean(10 ** (levels[100:200, 2] / 10))) == pytest.approx(level, abs=0.5)
    assert levels[:, 0] == pytest.approx(np.arange(len(levels)) / 100)
    assert find("level", noise_level(), noise[:0], rate, form="csv") == []


@pytest.mark.parametrize("path", sorted((SOURCE / "models").glob("*.mvw")), ids=lambda path: path.name)
def test_shipped_models_run_and_are_described_as_written(morva, path):
    page, written = json.loads(morva("inspect", path, "--json").stdout), mvw.read(path)
    assert page["runs"] is True and page["reason"] == ""
    types = {name: TYPES[mvw.type_code(value)] for name, value in written.items()}
    assert {entry["name"]: entry["type"] for entry in page["values"]} == types
    parts = [part for value in written.values() for part in (value if isinstance(value, list) else [value])]
    assert page["parameters"] == sum(part.size for part in parts if isinstance(part, np.ndarray))


def test_what_is_odd_is_shown_and_steers_no_terminal(morva, model):
    values = constant_mask() | {"na\x07me": 0.5, "ModelName": "ä\x1b[31m".encode() + b"\xff"}
    values["MU"] = np.array([np.nan, 5, np.inf, -np.inf] * 84)
    path = model(values)
    entries = {entry["name"]: entry for entry in json.loads(morva("inspect", path, "--json").stdout)["values"]}
    assert [entries["MU"][name] for name in ("not_finite", "min", "max")] == [252, 5, 5]
    assert (entries["na\x07me"]["type"], float(entries["na\x07me"]["value"])) == ("float", 0.5)
    text = morva("inspect", path, encoding="latin1").stdout
    assert "252 NOT FINITE" in text
    assert not set(text) & {"\x1b", "\x07"}

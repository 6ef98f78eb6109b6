"""morva inspect: the facts of a weight file, compared with how it was written."""

import json
import math

import numpy as np
import pytest

from conftest import SOURCE
from weights import constant_mask, encode, loudness_voice


def facts(morva, path, *options, **more):
    return json.loads(morva("inspect", path, "--json", *options, **more).stdout)


@pytest.mark.parametrize("seed", range(20))
def test_values_are_described_as_written(morva, tmp_path, seed):
    rng = np.random.default_rng(seed)
    kinds = [
        lambda: float(np.float32(rng.standard_normal())),
        lambda: int(rng.integers(-1000, 1000)),
        lambda: "".join(rng.choice(list('abc äöü<"\\\n'), 5)),
        lambda: rng.standard_normal(rng.integers(1, 9)),
        lambda: rng.standard_normal(rng.integers(1, 9, 2)),
        lambda: [rng.standard_normal(n) for n in rng.integers(1, 5, 3)],
        lambda: [rng.standard_normal(rng.integers(1, 5, 2)) for _ in range(2)],
    ]
    values = {f"value {i} of {seed}": kinds[rng.integers(len(kinds))]() for i in range(12)}
    path = tmp_path / "any.mvw"
    path.write_bytes(encode(values))
    page = facts(morva, path, fails=True)
    assert page["runs"] is False and page["reason"]
    assert [entry["name"] for entry in page["values"]] == sorted(values)
    arrays = 0
    for entry in page["values"]:
        value = values[entry["name"]]
        if isinstance(value, str):
            assert (entry["type"], entry["value"]) == ("string", value)
            continue
        if isinstance(value, int):
            assert (entry["type"], entry["value"]) == ("int", str(value))
            continue
        many = isinstance(value, list)
        parts = value if many else [value]
        if not isinstance(value, float):
            assert entry["shape"] == " ".join("x".join(map(str, part.shape)) for part in parts)
            assert (
                entry["type"]
                == {(False, 1): "vector", (False, 2): "matrix", (True, 1): "vectors", (True, 2): "matrices"}[
                    many, parts[0].ndim
                ]
            )
            arrays += sum(part.size for part in parts)
        numbers = np.concatenate([np.ravel(part) for part in parts]).astype("f4").astype(float)
        for name, expected in [("min", numbers.min()), ("max", numbers.max()), ("mean", numbers.mean())]:
            assert math.isclose(entry[name], expected, rel_tol=1e-9, abs_tol=1e-12)
    assert page["parameters"] == arrays


@pytest.mark.parametrize("rate", [8000, 16000, 32000])
@pytest.mark.parametrize("frame_ms", [20, 30, 32])
def test_cost_and_latency_of_a_cleaner(morva, model, recording, tmp_path, rate, frame_ms):
    values = constant_mask(rate, frame_ms)
    path = model(values)
    matrices = [values["WeightGRU"], values["WeightGRU_reset"], *values["WeightLinear"], *values["WeightNonLinear"]]
    for session_ms in (10, 20, 30, 40):
        page = facts(morva, path, "--frame", session_ms)
        assert page["runs"] is True
        assert page["kind"] == "noise cancellation"
        assert page["sample_rate"] == rate
        assert page["multiply_adds_per_second"] == pytest.approx(sum(m.size for m in matrices) * rate / values["Step"])
        table = {20: [10, 10, 10, 10], 30: [25, 25, 15, 25], 32: [31, 28, 30, 28]}
        assert page["latency_ms"] == pytest.approx(table[frame_ms][session_ms // 10 - 1], abs=1000 / rate)


def test_cost_of_a_voice_model_goes_with_the_frame(morva, model):
    path = model(loudness_voice())
    pages = [facts(morva, path, "--frame", ms) for ms in (10, 40)]
    assert pages[0]["kind"] == "voice activity"
    assert pages[0]["latency_ms"] is None
    assert pages[0]["multiply_adds_per_second"] == pytest.approx((306 + 306 + 1) * 100)
    assert pages[1]["multiply_adds_per_second"] == pytest.approx((306 + 306 + 1) * 25)


def test_numbers_that_are_none_are_counted(morva, tmp_path):
    values = constant_mask(16000)
    values["MU"][:3] = [np.nan, np.inf, -np.inf]
    (tmp_path / "a.mvw").write_bytes(encode(values))
    page = json.loads(morva("inspect", tmp_path / "a.mvw", "--json").stdout)
    entry = next(e for e in page["values"] if e["name"] == "MU")
    assert (entry["not_finite"], entry["min"], entry["max"]) == (3, 0, 0)
    assert "3 NOT FINITE" in morva("inspect", tmp_path / "a.mvw").stdout


def test_a_file_cut_anywhere_never_crashes_it(morva, tmp_path):
    whole = encode({"Version": "0.0.6", "SampleRate": 16000, "MU": np.arange(5.0), "W": np.ones((3, 2))})
    path = tmp_path / "cut.mvw"
    for length in range(len(whole)):
        path.write_bytes(whole[:length])
        morva("inspect", path, "--json", fails=True)  # status 1 and a reason, on every cut


def test_control_characters_do_not_reach_the_terminal(morva, tmp_path):
    path = tmp_path / "a.mvw"
    path.write_bytes(encode({"Version": "\x1b[31m", "na\x07me": 3}))
    assert not set(morva("inspect", path, fails=True).stdout) & {"\x1b", "\x07"}


@pytest.mark.parametrize("name", [p.name for p in sorted((SOURCE / "models").glob("*.mvw"))])
def test_every_shipped_model_runs(morva, name):
    page = facts(morva, SOURCE / "models" / name)
    assert page["runs"] is True
    assert page["kind"] != "unknown"
    assert page["multiply_adds_per_second"] <= 100e6
    assert not any("not_finite" in entry for entry in page["values"])


@pytest.mark.parametrize("content", [None, b"", b"hello, this is no weight file at all"])
def test_what_is_no_weight_is_refused(morva, tmp_path, content):
    path = tmp_path / "x.mvw"
    if content is not None:
        path.write_bytes(content)
    done = morva("inspect", path, fails=True)
    assert "x.mvw" in done.stderr
    assert done.stdout == ""


def test_an_output_that_cannot_be_written(morva, model, tmp_path):
    done = morva("inspect", model(constant_mask(16000)), "-o", tmp_path / "no/such/file", fails=True)
    assert "cannot be written" in done.stderr

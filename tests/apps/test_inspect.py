"""morva inspect: the facts of a weight file, compared with how it was written."""

import json

import numpy as np
import pytest

from weights import constant_mask, loudness_voice


def facts(morva, path, *options, **more):
    return json.loads(morva("inspect", path, "--json", *options, **more).stdout)


@pytest.mark.parametrize("seed", range(20))
def test_values_are_described_as_written(morva, model, seed):
    rng = np.random.default_rng(seed)
    kinds = {  # how to make one, and its parts
        "float": (lambda: float(rng.standard_normal()), lambda v: [np.array(v)]),
        "int": (lambda: int(rng.integers(-1000, 1000)), lambda v: [np.array(v)]),
        "string": (lambda: "".join(rng.choice(list('abc äöü<"\\\n'), 5)).encode(), lambda v: []),
        "vector": (lambda: rng.standard_normal(rng.integers(1, 9)), lambda v: [v]),
        "matrix": (lambda: rng.standard_normal(rng.integers(1, 9, 2)), lambda v: [v]),
        "vectors": (lambda: [rng.standard_normal(n) for n in rng.integers(1, 5, 3)], list),
        "matrices": (lambda: [rng.standard_normal(rng.integers(1, 5, 2)) for _ in range(2)], list),
    }
    written = {f"{i} of {seed}": (kind, kinds[kind][0]()) for i, kind in enumerate(rng.choice(list(kinds), 12))}
    page = facts(morva, model({name: value for name, (_, value) in written.items()}), status=1)
    assert page["runs"] is False and page["reason"]
    assert [entry["name"] for entry in page["values"]] == sorted(written)
    for entry in page["values"]:
        kind, value = written[entry["name"]]
        parts = kinds[kind][1](value)
        assert entry["type"] == kind
        if kind in ("int", "string"):
            assert entry["value"] == (value.decode() if kind == "string" else str(value))
        assert entry.get("shape", "") == " ".join("x".join(map(str, part.shape)) for part in parts)
        if parts:
            numbers = np.concatenate([part.ravel() for part in parts]).astype("f4").astype(float)
            wanted = [numbers.min(), numbers.max(), numbers.mean()]
            assert [entry[name] for name in ("min", "max", "mean")] == pytest.approx(wanted)
    arrays = [part for kind, value in written.values() for part in kinds[kind][1](value) if part.ndim]
    assert page["parameters"] == sum(part.size for part in arrays)


@pytest.mark.parametrize("ms", [10, 40])
@pytest.mark.parametrize(
    ("values", "kind"), [(constant_mask, "noise cancellation"), (loudness_voice, "voice activity")]
)
def test_cost_and_latency(morva, model, values, kind, ms):
    page = facts(morva, model(values()), "--frame", ms)
    cleans = values is constant_mask
    lists = [value if isinstance(value, list) else [value] for value in values().values()]
    products = sum(part.size for parts in lists for part in parts if getattr(part, "ndim", 0) == 2)
    assert page["multiply_adds_per_second"] == pytest.approx(products * (100 if cleans else 1000 / ms))
    assert (page["runs"], page["kind"], page["latency_ms"]) == (True, kind, 10 if cleans else None)


def test_what_is_odd_is_shown_and_steers_no_terminal(morva, model):
    values = constant_mask() | {"na\x07me": 3, "ModelName": b"\x1b[31m \xff"}
    values["MU"] = np.array([0, np.nan, np.inf, -np.inf] * 20)
    path = model(values)
    entry = next(e for e in facts(morva, path)["values"] if e["name"] == "MU")
    assert (entry["not_finite"], entry["min"], entry["max"]) == (60, 0, 0)
    text = morva("inspect", path, encoding="latin1").stdout
    assert "60 NOT FINITE" in text
    assert not set(text) & {"\x1b", "\x07"}

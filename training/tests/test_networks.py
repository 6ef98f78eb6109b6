"""Networks over sequences, their growth and their way through weight files (their values: test_agreement)."""

from __future__ import annotations

from pathlib import Path
from typing import Callable

import numpy as np
import pytest
import torch
from test_agreement import shaken

from morva_training import mvw
from morva_training.convert import half_precision, network_of, noise_weight, voice_weight
from morva_training.describe import described
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork
from morva_training.reshape import deepened, widened, with_outputs
from morva_training.spectra import SMALL_8K


def outputs(network: torch.nn.Module, x: torch.Tensor) -> torch.Tensor:
    with torch.no_grad():
        return network(x, network.initial_state(len(x)))[0]


@pytest.mark.parametrize("kind", [LayerNormGatedNetwork, PlainGatedNetwork])
def test_a_cut_sequence_goes_on_where_it_stopped(kind: type) -> None:
    network, x = shaken(kind(6, 8, 4), 1), torch.randn(3, 30, 6)
    with torch.no_grad():
        first, state = network(x[:, :13], network.initial_state(3))
        second, _ = network(x[:, 13:], state)
    assert torch.allclose(torch.cat([first, second], 1), outputs(network, x), atol=1e-5)


@pytest.mark.parametrize("kind", ["0.0.6", "0.0.5", "VAD_0.0.1"])
def test_weight_file_round_trip(kind: str, tmp_path: Path) -> None:
    """Every value comes back, the header says the shape, and halves are what the engine stores as halves."""
    features, rng = 3 * SMALL_8K.bands, np.random.default_rng(2)
    mean, spread = rng.random(60), 1 + rng.random(60)
    if kind == "VAD_0.0.1":
        network = shaken(PlainGatedNetwork(features, 10, 1, linear_output=True), 2)
        weight = voice_weight(network, mean, spread, [-1.0, 0.5, 2.0])
        assert weight["Test_MINMAX"].tolist() == [-1.0, 2.0] and weight["Test_BestF1"].tolist() == [0.5]
    else:
        network = shaken((LayerNormGatedNetwork if kind == "0.0.6" else PlainGatedNetwork)(features, 10, 60), 2)
        weight = noise_weight(network, SMALL_8K, mean, spread, "test")
        assert weight[f"CONTROL_MORVA_COMPRESS_RATE_v{kind.replace('.', '_')}"] == 1
        assert weight["CoefficientNumber"] == 81 and weight["FiltrEnd"] == 80
    mvw.write(tmp_path / "weight.mvw", weight)
    back = mvw.read(tmp_path / "weight.mvw")
    assert bytes(back["Version"]).decode() == kind and back["TimeStamp"].isdigit() and len(back["TimeStamp"]) == 10
    assert np.allclose(back["MU"], mean) and np.allclose(back["SD"], spread)
    restored = network_of(back)
    assert all(torch.equal(a, b) for a, b in zip(network.parameters(), restored.parameters(), strict=True))
    halves = half_precision(weight)["WeightGRU"]
    assert np.array_equal(halves, halves.astype(np.float16)) and np.allclose(halves, weight["WeightGRU"], rtol=1e-3)
    matrices = [p for p in network.parameters() if p.dim() == 2]
    assert described(back)["multiply-adds per frame"] == sum(p.numel() for p in matrices)


@pytest.mark.parametrize(
    ("kind", "grow", "size", "name"),
    [
        (LayerNormGatedNetwork, widened, 80, "hidden"),
        (PlainGatedNetwork, widened, 80, "hidden"),
        (PlainGatedNetwork, deepened, 5, "layers"),
    ],
)
def test_a_grown_network_says_about_the_same(kind: type, grow: Callable, size: int, name: str) -> None:
    torch.manual_seed(5)
    small = kind(20, 32, 6)
    large, x = grow(small, size), torch.randn(4, 40, 20)
    before, after = outputs(small, x), outputs(large, x)
    assert getattr(large, name) == size
    assert (after - before).std() < 0.15 * before.std()
    with pytest.raises(ValueError, match="cannot make"):
        grow(large, getattr(small, name))


@pytest.mark.parametrize("count", [1, 5])
def test_outputs_can_be_added_and_taken_away(count: int) -> None:
    network, x = shaken(PlainGatedNetwork(20, 12, 3, linear_output=True), 6), torch.randn(2, 10, 20)
    before, after = outputs(network, x), outputs(with_outputs(network, count), x)
    kept = min(count, 3)
    assert torch.allclose(before[..., :kept], after[..., :kept], atol=1e-6)
    assert (after[..., kept:] == 0).all()

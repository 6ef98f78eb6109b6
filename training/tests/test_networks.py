"""The sequence networks against the frame-by-frame reference, and their way through weight files."""

from __future__ import annotations

from typing import Callable

import numpy as np
import pytest
import torch

from morva_training import mvw
from morva_training.convert import gated_network, gated_values, noise_weight, plain_network, plain_values
from morva_training.engine import GatedStep, PlainStep, sigmoid
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork
from morva_training.reshape import deepened, widened, with_outputs
from morva_training.spectra import SMALL_8K


def shaken(network: torch.nn.Module, seed: int) -> torch.nn.Module:
    """Random values everywhere, biases and gains included."""
    torch.manual_seed(seed)
    with torch.no_grad():
        for parameter in network.parameters():
            parameter.add_(0.3 * torch.randn_like(parameter))
    return network


CASES = [(5, 4, 3, 2), (9, 16, 7, 3), (12, 8, 6, 4)]


@pytest.mark.parametrize(("features", "hidden", "outputs", "layers"), CASES)
def test_gated_sequence_equals_steps(features: int, hidden: int, outputs: int, layers: int) -> None:
    network = shaken(LayerNormGatedNetwork(features, hidden, outputs, layers), layers)
    x = torch.randn(1, 25, features)
    with torch.no_grad():
        logits, state = network(x, network.initial_state(1))
    step = GatedStep(gated_values(network))
    masks = np.stack([step(frame) for frame in x[0].numpy()])
    assert np.abs(masks - torch.sigmoid(logits[0]).numpy()).max() < 2e-5
    assert np.abs(step.state - state[0].numpy()).max() < 2e-5


@pytest.mark.parametrize("voice", [False, True])
@pytest.mark.parametrize(("features", "hidden", "outputs", "layers"), CASES)
def test_plain_sequence_equals_steps(features: int, hidden: int, outputs: int, layers: int, voice: bool) -> None:
    network = shaken(PlainGatedNetwork(features, hidden, outputs, layers, voice), layers)
    x = torch.randn(1, 25, features)
    with torch.no_grad():
        logits, state = network(x, network.initial_state(1))
    step = PlainStep(plain_values(network), voice)
    results = np.stack([step(frame) for frame in x[0].numpy()])
    expected = logits[0].numpy() if voice else sigmoid(logits[0].numpy())
    assert np.allclose(results, expected, rtol=1e-4, atol=2e-5)
    assert np.allclose(step.state, state[0].numpy(), rtol=1e-4, atol=2e-5)


@pytest.mark.parametrize("kind", [LayerNormGatedNetwork, PlainGatedNetwork])
def test_a_cut_sequence_goes_on_where_it_stopped(kind: type) -> None:
    network = shaken(kind(6, 8, 4), 1)
    x = torch.randn(3, 30, 6)
    with torch.no_grad():
        whole, _ = network(x, network.initial_state(3))
        first, state = network(x[:, :13], network.initial_state(3))
        second, _ = network(x[:, 13:], state)
    assert torch.allclose(torch.cat([first, second], 1), whole, atol=1e-5)


@pytest.mark.parametrize(("kind", "back"), [(LayerNormGatedNetwork, gated_network), (PlainGatedNetwork, plain_network)])
def test_weight_file_round_trip(kind: type, back) -> None:
    network = shaken(kind(3 * SMALL_8K.bands, 10, SMALL_8K.bands), 2)
    ones = np.ones(SMALL_8K.bands)
    data = mvw.encode(noise_weight(network, SMALL_8K, ones, ones, "test", {"SMOOT_COEF": 0.5}))
    weight = mvw.decode(data)
    restored = back(weight)
    for name, value in network.state_dict().items():
        assert torch.equal(restored.state_dict()[name], value), name
    suffix = "v0_0_6" if kind is LayerNormGatedNetwork else "v0_0_5"
    assert weight[f"CONTROL_MORVA_SMOOT_COEF_{suffix}"] == 0.5
    assert weight[f"CONTROL_MORVA_COMPRESS_RATE_{suffix}"] == 1
    assert weight["CoefficientNumber"] == 81 and weight["FiltrEnd"] == 80
    assert len(weight["TimeStamp"]) == 10 and weight["TimeStamp"].isdigit()


def test_voice_weight_round_trip() -> None:
    network = shaken(PlainGatedNetwork(305, 12, 1, linear_output=True), 4)
    restored = plain_network({"Version": b"VAD_0.0.1", **plain_values(network)})
    assert restored.linear_output
    for name, value in network.state_dict().items():
        assert torch.equal(restored.state_dict()[name], value), name


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
    large = grow(small, size)
    x = torch.randn(4, 40, 20)
    with torch.no_grad():
        before, _ = small(x, small.initial_state(4))
        after, _ = large(x, large.initial_state(4))
    assert getattr(large, name) == size
    assert (after - before).std() < 0.15 * before.std()
    with pytest.raises(ValueError, match="cannot make"):
        grow(large, getattr(small, name))


@pytest.mark.parametrize("outputs", [1, 5])
def test_outputs_can_be_added_and_taken_away(outputs: int) -> None:
    network = shaken(PlainGatedNetwork(20, 12, 3, linear_output=True), 6)
    changed = with_outputs(network, outputs)
    x = torch.randn(2, 10, 20)
    with torch.no_grad():
        before, _ = network(x, network.initial_state(2))
        after, _ = changed(x, changed.initial_state(2))
    kept = min(outputs, 3)
    assert torch.allclose(before[..., :kept], after[..., :kept], atol=1e-6)
    assert (after[..., kept:] == 0).all()


def test_cost_counts_every_product() -> None:
    network = LayerNormGatedNetwork(300, 224, 100)
    matrices = [p for p in network.parameters() if p.dim() == 2]
    assert network.macs_per_frame() == sum(p.numel() for p in matrices)
    assert network.macs_per_frame() <= 1_000_000
    plain = PlainGatedNetwork(300, 128, 80)
    assert plain.macs_per_frame() == sum(p.numel() for p in plain.parameters() if p.dim() == 2)


def test_gradients_reach_every_value() -> None:
    for network in (LayerNormGatedNetwork(6, 8, 4), PlainGatedNetwork(6, 8, 4)):
        logits, _ = network(torch.randn(2, 12, 6), network.initial_state(2))
        logits.square().sum().backward()
        for name, parameter in network.named_parameters():
            assert parameter.grad is not None and parameter.grad.abs().sum() > 0, name

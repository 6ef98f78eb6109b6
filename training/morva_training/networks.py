"""The networks as PyTorch modules that run over whole sequences.

All weights are stored inputs-down, outputs-across (x W + b), the way the weight file holds them,
and every matrix that also sees the recurrent state has the state's rows first. Products with the
features are done once for the whole sequence; only the state's share stays in the time loop.

Shapes: features [B, T, F], state [B, H], results [B, T, K] before the output sigmoid.
"""

from __future__ import annotations

import math
from dataclasses import dataclass
from typing import List, Tuple

import torch
from torch import Tensor, nn
from torch.nn import functional

from .recurrence import recurrent
from .spectra import Layout


@torch.jit.script
def normalised_recurrence(
    inputs: Tensor, state: Tensor, gates: Tensor, branches: Tensor, gain: Tensor, bias: Tensor
) -> Tuple[Tensor, Tensor]:
    """Time loop of the layer-normalised gated layer.

    inputs [T, B, 4H] (update, reset, rectified, linear), gates and branches [H, 2H],
    gain and bias [2, H] (rectified, linear). Returns the states [T, B, H] and the last one.
    """
    size = state.shape[1]
    states: List[Tensor] = []
    for step in inputs.unbind(0):
        open_ = torch.sigmoid(torch.addmm(step[:, : 2 * size], state, gates))
        keep = open_[:, :size]
        both = torch.addmm(step[:, 2 * size :], open_[:, size:] * state, branches)
        both = functional.layer_norm(both.view(-1, 2, size), [size], None, None, 1e-12) * gain + bias
        new = torch.relu(both[:, 0]) + both[:, 1]
        state = new + keep * (state - new)
        states.append(state)
    return torch.stack(states), state


@torch.jit.script
def plain_recurrence(inputs: Tensor, state: Tensor, weights: Tensor) -> Tuple[Tensor, Tensor]:
    """Time loop of the layer without normalisation and reset gate.

    inputs [T, B, 3H] (gate, rectified, linear), weights [H, 3H]. The gate weighs the new value.
    Returns the layer's outputs [T, B, H] (not the states) and the last state.
    """
    size = state.shape[1]
    outputs: List[Tensor] = []
    for step in inputs.unbind(0):
        sums = torch.addmm(step, state, weights)
        new = torch.relu(sums[:, size : 2 * size]) + sums[:, 2 * size :]
        state = state + torch.sigmoid(sums[:, :size]) * (new - state)
        outputs.append(new)
    return torch.stack(outputs), state


def network_input(features: Tensor, mean: Tensor, scale: Tensor, context: int, goes_on: bool = False) -> Tensor:
    """Standardised features with their context, oldest first; before the start there is silence, unless the first
    context - 1 frames are what was there."""
    padded = features if goes_on else functional.pad(features, (0, 0, context - 1, 0))
    standard = (padded - mean) / scale
    count = padded.shape[1] - context + 1
    return torch.cat([standard[:, i : i + count] for i in range(context)], dim=-1)


def _product(x: Tensor, matrix: Tensor, kind: torch.dtype) -> Tensor:
    """x W with factors of the given kind and the sums in single precision."""
    return (x.to(kind) @ matrix.to(kind)).to(x.dtype)


def _matrix(rows: int, cols: int) -> nn.Parameter:
    bound = 1.0 / math.sqrt(rows)
    return nn.Parameter(torch.empty(rows, cols).uniform_(-bound, bound))


def _vector(size: int, value: float = 0.0) -> nn.Parameter:
    return nn.Parameter(torch.full((size,), value))


class LayerNormGatedNetwork(nn.Module):
    """Network of the noise models of version 0.0.6."""

    def __init__(self, features: int, hidden: int, outputs: int, layers: int = 3) -> None:
        super().__init__()
        if layers < 2:
            raise ValueError("a network without a hidden layer has no memory")
        self.features, self.hidden, self.outputs, self.layers = features, hidden, outputs, layers
        width = hidden + features
        self.update, self.update_bias = _matrix(width, hidden), _vector(hidden, 1.0)
        self.reset, self.reset_bias = _matrix(width, hidden), _vector(hidden, 1.0)
        rows = [width] + [hidden] * (layers - 2)
        self.linear = nn.ParameterList([_matrix(r, hidden) for r in rows])
        self.linear_bias = nn.ParameterList([_vector(hidden) for _ in rows])
        self.rectified = nn.ParameterList([_matrix(r, hidden) for r in rows])
        self.rectified_bias = nn.ParameterList([_vector(hidden) for _ in rows])
        self.linear_gain = nn.ParameterList([_vector(hidden, 0.5) for _ in rows])
        self.linear_offset = nn.ParameterList([_vector(hidden) for _ in rows])
        self.rectified_gain = nn.ParameterList([_vector(hidden, 0.5) for _ in rows])
        self.rectified_offset = nn.ParameterList([_vector(hidden) for _ in rows])
        self.output, self.output_bias = _matrix(hidden, outputs), _vector(outputs, 1.0)

    def initial_state(self, batch: int) -> Tensor:
        return self.output.new_zeros(batch, self.hidden)

    def forward(self, x: Tensor, state: Tensor) -> Tuple[Tensor, Tensor]:
        first = (self.update, self.reset, self.rectified[0], self.linear[0])
        biases = (self.update_bias, self.reset_bias, self.rectified_bias[0], self.linear_bias[0])
        h = self.hidden
        inputs = x.transpose(0, 1) @ torch.cat([w[h:] for w in first], 1) + torch.cat(biases)
        y, state = normalised_recurrence(
            inputs,
            state,
            torch.cat([w[:h] for w in first[:2]], 1),
            torch.cat([w[:h] for w in first[2:]], 1),
            torch.stack([self.rectified_gain[0], self.linear_gain[0]]),
            torch.stack([self.rectified_offset[0], self.linear_offset[0]]),
        )
        for i in range(1, self.layers - 1):
            a = functional.layer_norm(y @ self.rectified[i] + self.rectified_bias[i], [h], eps=1e-12)
            b = functional.layer_norm(y @ self.linear[i] + self.linear_bias[i], [h], eps=1e-12)
            a = a * self.rectified_gain[i] + self.rectified_offset[i]
            y = torch.relu(a) + b * self.linear_gain[i] + self.linear_offset[i]
        return (y @ self.output + self.output_bias).transpose(0, 1), state


class PlainGatedNetwork(nn.Module):
    """Network of version 0.0.5; with `linear_output` that of the voice-activity model.

    The products outside of the time loop may run on bfloat16 factors while it trains.
    """

    products: torch.dtype = torch.float32

    def __init__(self, features: int, hidden: int, outputs: int, layers: int = 3, linear_output: bool = False) -> None:
        super().__init__()
        if layers < 2:
            raise ValueError("a network without a hidden layer has no memory")
        self.features, self.hidden, self.outputs, self.layers = features, hidden, outputs, layers
        self.linear_output = linear_output
        width = hidden + features
        self.update, self.update_bias = _matrix(width, hidden), _vector(hidden, -1.0)
        rows = [width] + [hidden] * (layers - 2)
        self.linear = nn.ParameterList([_matrix(r, hidden) for r in rows])
        self.linear_bias = nn.ParameterList([_vector(hidden) for _ in rows])
        self.rectified = nn.ParameterList([_matrix(r, hidden) for r in rows])
        self.rectified_bias = nn.ParameterList([_vector(hidden) for _ in rows])
        self.output = _matrix(hidden, outputs)
        self.output_bias = _vector(outputs, 0.0 if linear_output else 1.0)

    def initial_state(self, batch: int) -> Tensor:
        return self.output.new_zeros(batch, self.hidden)

    def hidden_layers(self, x: Tensor, state: Tensor) -> Tuple[List[Tensor], Tensor]:
        """What each layer before the output hands on [T, B, H], and the last state."""
        h = self.hidden
        first = (self.update, self.rectified[0], self.linear[0])
        biases = (self.update_bias, self.rectified_bias[0], self.linear_bias[0])
        inputs = _product(x.transpose(0, 1), torch.cat([w[h:] for w in first], 1), self.products) + torch.cat(biases)
        y, state = plain_recurrence(inputs, state, torch.cat([w[:h] for w in first], 1))
        layers = [y]
        for i in range(1, self.layers - 1):
            both = _product(y, torch.cat([self.rectified[i], self.linear[i]], 1), self.products)
            y = torch.relu(both[..., :h] + self.rectified_bias[i]) + both[..., h:] + self.linear_bias[i]
            layers.append(y)
        return layers, state

    def forward(self, x: Tensor, state: Tensor) -> Tuple[Tensor, Tensor]:
        layers, state = self.hidden_layers(x, state)
        return (layers[-1] @ self.output + self.output_bias).transpose(0, 1), state


class Block(nn.Module):
    """Recurrence over the groups of bands, both ways, then over time; the weights are those of every group and frame.

    x [T, B, G, C] to the same shape; states [B * G, C]. Without `across` units groups do not hear of each other.
    """

    def __init__(self, channels: int, across: int) -> None:
        super().__init__()
        self.across = across
        if across:
            self.norm_groups = nn.LayerNorm(channels)
            self.groups = nn.GRU(channels, across, bidirectional=True)
            self.mixed = nn.Linear(2 * across, channels)
        self.norm_time = nn.LayerNorm(channels)
        self.time = nn.GRU(channels, channels)

    def forward(self, x: Tensor, state: Tensor) -> tuple[Tensor, Tensor]:
        if self.across:
            x = x + self.mixed(recurrent(self.groups, self.norm_groups(x), -2))
        y = recurrent(self.time, self.norm_time(x), 0, state)
        return x + y, y[-1].flatten(0, 1)


@dataclass(frozen=True)
class Shape:
    """Of a `BandNetwork`."""

    bands: int  # K
    features: int  # per band
    group: int = 4  # bands
    reach: int = 2  # bands that a group sees beyond its own, on either side
    channels: int = 32
    across: int = 16
    depth: int = 2
    decoded: int = 48
    scored: int = 24  # units between all groups and the voice score
    taps: int = 0  # frames that a complex filter of the lowest bands spans
    filtered: int = 0  # of the bands
    kernels: int = 0  # matrices that `spread` is mixed of, frame by frame


class BandNetwork(nn.Module):
    """Network of version NC_1.0.0: neighbouring bands are gathered to groups, recurrent layers run over groups and
    over time with shared weights, and each group says for each of its bands what to keep and how much is noise. What
    all groups know together is the voice score.

    Features [B, T, F K], one kind after the other; results [B, T, 2 K + 1]: masks, shares of noise, voice; with `taps`
    another 2 * taps * filtered: real parts of each tap's factors, then imaginary ones, one tap after the other.
    """

    def __init__(self, shape: Shape) -> None:
        super().__init__()
        self.shape = shape
        seen, c = (shape.group + 2 * shape.reach) * shape.features, shape.channels
        self.gather = nn.Linear(seen, c)
        self.place = nn.Parameter(torch.zeros(shape.bands // shape.group, c))  # where in the spectrum a group is
        self.blocks = nn.ModuleList(Block(c, shape.across) for _ in range(shape.depth))
        self.norm = nn.LayerNorm(c)
        self.spread = nn.Linear(c + seen, shape.decoded)
        self.output = nn.Linear(shape.decoded, 2 * shape.group)
        if shape.taps:
            self.filter = nn.Linear(shape.decoded, 2 * shape.taps * shape.group)
            nn.init.zeros_(self.filter.weight)
            nn.init.zeros_(self.filter.bias)
        if shape.kernels:
            self.choice = nn.Linear(c, shape.kernels)
            self.bank = nn.Parameter(self.spread.weight.detach().repeat(shape.kernels, 1, 1))
            nn.init.uniform_(self.bank, -((c + seen) ** -0.5), (c + seen) ** -0.5)
        self.score = nn.ModuleList([nn.Linear(len(self.place) * c, shape.scored), nn.Linear(shape.scored, 1)])
        with torch.no_grad():
            self.output.bias[: shape.group] = 1.0
            self.score[1].bias.zero_()

    def initial_state(self, batch: int) -> Tensor:
        return self.place.new_zeros(len(self.blocks), batch * len(self.place), self.shape.channels)

    def neighbourhoods(self, x: Tensor) -> Tensor:
        """What each group sees [T, B, G, F * (group + 2 reach)] of x [T, B, F, K]."""
        padded = functional.pad(x, (self.shape.reach, self.shape.reach))
        windows = padded.unfold(-1, self.shape.group + 2 * self.shape.reach, self.shape.group)
        return windows.transpose(-2, -3).flatten(-2)

    def forward(self, x: Tensor, state: Tensor) -> Tuple[Tensor, Tensor]:
        seen = self.neighbourhoods(x.unflatten(-1, (self.shape.features, -1)).transpose(0, 1))
        y = functional.relu(self.gather(seen) + self.place)
        states = []
        for block, before in zip(self.blocks, state):
            y, after = block(y, before)
            states.append(after)
        y = self.norm(y)
        spread = functional.relu(self.decoded(torch.cat([y, seen], -1), y))
        masks, noise = (part.flatten(-2) for part in self.output(spread).split(self.shape.group, -1))
        voice = self.score[1](functional.relu(self.score[0](y.flatten(-2))))
        results = [masks, noise, voice]
        if self.shape.taps:
            factors = self.filter(spread[..., : self.shape.filtered // self.shape.group, :])
            results += [part.flatten(-2) for part in factors.split(self.shape.group, -1)]
        return torch.cat(results, -1).transpose(0, 1), torch.stack(states)

    def decoded(self, x: Tensor, y: Tensor) -> Tensor:
        if not self.shape.kernels:
            return self.spread(x)
        shares = functional.softmax(self.choice(y.mean(-2)), -1)
        return x @ torch.einsum("tbn,noi->tbio", shares, self.bank) + self.spread.bias


Network = LayerNormGatedNetwork | PlainGatedNetwork | BandNetwork


def filter_factors(y: Tensor, layout: Layout) -> Tensor:
    """The complex factors [B, T, taps, filtered] of a band network's filter."""
    last = 2 * layout.taps * layout.filtered
    values = y[..., y.shape[-1] - last :].tanh().unflatten(-1, (layout.taps, 2, layout.filtered))
    return torch.complex(*values.unbind(-2))


def log_gains(network: Network, y: Tensor) -> Tensor:
    """Natural logarithms of the amplitude gains of the bands [B, T, K] that a noise model's results stand for."""
    if isinstance(network, BandNetwork):
        return functional.logsigmoid(y[..., : network.shape.bands])
    return 2.0 * functional.logsigmoid(y)  # the engine squares the mask

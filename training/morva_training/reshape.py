"""Networks of another shape that start with what a trained one has learned."""

from __future__ import annotations


import torch
from scipy.linalg import qr
from torch import Tensor

from .networks import BandNetwork, Network, PlainGatedNetwork, Shape

NOISE = 0.02  # of a matrix's standard deviation


def _like(network: Network, hidden: int, outputs: int, layers: int = 0) -> Network:
    arguments = {"linear_output": network.linear_output} if isinstance(network, PlainGatedNetwork) else {}
    return type(network)(network.features, hidden, outputs, layers or network.layers, **arguments)


def widened(network: Network, hidden: int, seed: int = 1) -> Network:
    """A network with more units per layer (Net2Net, Chen et al. 2016).

    Units are doubled: the copy has the original's inputs, and what reads the original reads half of
    each. The layer norms see about the same statistics, so the wider network begins close to the
    narrower one; a little noise lets the copies part.
    """
    old = network.hidden
    if hidden < old:
        raise ValueError(f"cannot make {hidden} units of {old}")
    if hidden == old:
        return network
    generator = torch.Generator().manual_seed(seed)
    doubled = torch.randperm(old, generator=generator).repeat(-(-hidden // old))[: hidden - old]
    units = torch.cat([torch.arange(old), doubled])
    share = 1.0 / torch.bincount(units, minlength=old)[units].float()

    def grown(name: str, value: Tensor) -> Tensor:
        wide = value if name.startswith("output") else value[..., units]
        if value.dim() == 1:
            return wide
        wide = torch.cat([wide[units] * share[:, None], wide[old:]])  # rows of units first, then of features
        return wide + NOISE * wide.std() * torch.randn(wide.shape, generator=generator)

    result = _like(network, hidden, network.outputs)
    with torch.no_grad():
        for (name, value), target in zip(network.named_parameters(), result.parameters()):
            target.copy_(grown(name, value))
    return result


def narrowed(network: PlainGatedNetwork, hidden: int, x: Tensor) -> PlainGatedNetwork:
    """A network with fewer units per layer: those from which the others' values on inputs x [B, T, F] are best guessed.

    Units are chosen by a pivoted QR decomposition of each layer's values; what read a unit that is gone reads its least
    squares estimate from the units that are left.
    """
    if hidden > network.hidden:
        raise ValueError(f"cannot make {hidden} units of {network.hidden}")
    kept, guesses = [], []
    with torch.no_grad():
        for values in network.hidden_layers(x, network.initial_state(len(x)))[0]:
            values = values.flatten(0, 1)
            units = torch.from_numpy(qr(values.cpu().numpy(), mode="r", pivoting=True)[1][:hidden].astype("int64"))
            kept.append(units)
            guesses.append(torch.linalg.lstsq(values[:, units], values).solution)
        result = _like(network, hidden, network.outputs)
        for (name, value), target in zip(network.named_parameters(), result.parameters()):
            layer = int(name[-1]) if name[-1].isdigit() else 0
            less = value if name.startswith("output") else value[..., kept[layer]]
            if value.dim() == 2:
                known = guesses[-1 if name.startswith("output") else max(0, layer - 1)]
                less = torch.cat([known @ less[: network.hidden], less[network.hidden :]])
            target.copy_(less)
    return result


def deepened(network: PlainGatedNetwork, layers: int, seed: int = 1) -> PlainGatedNetwork:
    """A network with more hidden layers before the output, which begin by handing on what they get."""
    if layers < network.layers:
        raise ValueError(f"cannot make {layers} layers of {network.layers}")
    generator = torch.Generator().manual_seed(seed)
    result = _like(network, network.hidden, network.outputs, layers)
    with torch.no_grad():
        known = dict(network.named_parameters())
        for name, target in result.named_parameters():
            if name in known:
                target.copy_(known[name])
            elif name.startswith("linear."):
                target.copy_(torch.eye(network.hidden))
            else:
                target.zero_()
            if name not in known and target.dim() == 2:
                target.add_(NOISE * network.hidden**-0.5 * torch.randn(target.shape, generator=generator))
    return result


def with_outputs(network: Network, outputs: int) -> Network:
    """A network with the first `outputs` outputs; new ones start at nothing."""
    result = _like(network, network.hidden, outputs)
    kept = min(outputs, network.outputs)
    with torch.no_grad():
        for (name, value), target in zip(network.named_parameters(), result.parameters()):
            if name.startswith("output"):
                target.zero_()
                target[..., :kept] = value[..., :kept]
            else:
                target.copy_(value)
    return result


def grown(network: BandNetwork, shape: Shape) -> BandNetwork:
    """A network with more bands above those of another one, more blocks or a longer filter, that begins as what it was:
    new groups like the highest that is known, new blocks and taps without a say.
    """
    if shape == network.shape:
        return network
    result = BandNetwork(shape)
    known, values = len(network.place), network.state_dict()
    fresh = {key: value for key, value in result.state_dict().items() if key not in values}
    for key, value in fresh.items():
        if ".mixed." in key:
            value.zero_()
        elif ".time." in key:
            value[2 * shape.channels :] = 0.0  # of the candidate: the state stays where it is, at nothing
    score = result.score[0].weight.detach().clone().zero_()
    score[:, : known * shape.channels] = values["score.0.weight"]
    more = values["place"][-1:].expand(len(result.place) - known, -1)
    result.load_state_dict({**values, **fresh, "place": torch.cat([values["place"], more]), "score.0.weight": score})
    return result

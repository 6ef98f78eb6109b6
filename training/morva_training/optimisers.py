"""AdamW, and for the hidden matrices Muon (Jordan 2024): momentum made orthogonal.

The orthogonal step is scaled like a step of AdamW (Liu et al. 2025), so both share a learning rate.
"""

from __future__ import annotations

import torch
from torch import Tensor, nn

DECAY = 1e-3
NEWTON_SCHULZ = (3.4445, -4.7750, 2.0315)


def orthogonalised(matrix: Tensor, steps: int = 5) -> Tensor:
    """The nearest matrix with all singular values near one, by a quintic Newton-Schulz iteration."""
    a, b, c = NEWTON_SCHULZ
    x = matrix.T if matrix.shape[0] > matrix.shape[1] else matrix
    x = x / (x.norm() + 1e-9)
    for _ in range(steps):
        gram = x @ x.T
        x = a * x + (b * gram + c * gram @ gram) @ x
    return x.T if matrix.shape[0] > matrix.shape[1] else x


class AdamWithMuon(torch.optim.AdamW):
    """AdamW whose groups marked `orthogonal` take Muon's steps instead."""

    MOMENTUM, SCALE = 0.95, 0.2

    def stop(self) -> None:
        """Forgets where it was heading, not how large gradients are."""
        for state in self.state.values():
            for name in ("momentum", "exp_avg"):
                if name in state:
                    state[name].zero_()

    @torch.no_grad()
    def step(self, closure=None):
        for group in self.param_groups:
            if not group["orthogonal"]:
                continue
            for matrix in group["params"]:
                if matrix.grad is not None:
                    self._orthogonal_step(matrix, group["lr"], group["weight_decay"])
                    matrix.grad = None  # AdamW passes over what has no gradient
        return super().step(closure)

    def _orthogonal_step(self, matrix: Tensor, rate: float, decay: float) -> None:
        state = self.state[matrix]
        if "momentum" not in state:
            state["step"] = torch.zeros(())  # AdamW looks for it when a state is loaded
            state["momentum"] = torch.zeros_like(matrix)
        momentum = state["momentum"].mul_(self.MOMENTUM).add_(matrix.grad)
        direction = orthogonalised(matrix.grad + self.MOMENTUM * momentum)
        matrix.mul_(1.0 - rate * decay)
        matrix.add_(direction, alpha=-rate * self.SCALE * max(matrix.shape) ** 0.5)


def make_optimiser(network: nn.Module, rate: float) -> AdamWithMuon:
    def is_hidden(name: str, value: Tensor) -> bool:
        return value.dim() == 2 and not name.startswith("output")

    named = list(network.named_parameters())
    hidden = [value for name, value in named if is_hidden(name, value)]
    others = [value for name, value in named if not is_hidden(name, value)]
    groups = [{"params": hidden, "orthogonal": True}, {"params": others, "orthogonal": False}]
    return AdamWithMuon(groups, lr=rate, betas=(0.9, 0.98), weight_decay=DECAY)

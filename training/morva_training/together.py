"""Several processes that train one network, each on its own mixtures.

    export MASTER_ADDR=127.0.0.1 MASTER_PORT=29511 WORLD_SIZE=2
    RANK=1 python -m morva_training.train_voice ... & RANK=0 python -m morva_training.train_voice ...

Every process holds the whole network; gradients are averaged before each step, so all of them stay
equal. Without RANK everything here does nothing.
"""

from __future__ import annotations

import os
from collections.abc import Iterable, Iterator
from contextlib import contextmanager

import torch
from torch import Tensor, distributed


@contextmanager
def together() -> Iterator[int]:
    """Meets the other processes, if there are any; the number of this one.

    Who leaves says so: the threads of a group that is left to the end of the process can end it with an abort.
    """
    if "RANK" not in os.environ:
        yield rank()
        return
    distributed.init_process_group("gloo")
    try:
        yield rank()
    finally:
        distributed.destroy_process_group()


def rank() -> int:
    return distributed.get_rank() if distributed.is_initialized() else 0


def from_the_first(values: Tensor) -> Tensor:
    """What the first process has; all of them must ask."""
    if distributed.is_initialized():
        distributed.broadcast(values, 0)
    return values


def any_of_us(flag: bool) -> bool:
    if not distributed.is_initialized():
        return flag
    votes = torch.tensor([float(flag)])
    distributed.all_reduce(votes)
    return votes.item() > 0


def average_gradients(parameters: Iterable[Tensor]) -> None:
    if not distributed.is_initialized():
        return
    gradients = [p.grad for p in parameters if p.grad is not None]
    flat = torch.cat([g.flatten() for g in gradients])
    distributed.all_reduce(flat)
    flat /= distributed.get_world_size()
    for gradient, mean in zip(gradients, flat.split([g.numel() for g in gradients])):
        gradient.copy_(mean.view_as(gradient))

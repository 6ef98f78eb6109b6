"""Gated recurrent layers (`torch.nn.GRU`) over one dimension of a tensor, in a compiled loop where there is a compiler.

The framework's own loop works on single steps and spends its time on what surrounds their small products. On a CPU
`recurrence.cpp` is compiled for this processor when it is first needed, and kept.
"""

from __future__ import annotations

import ctypes
import functools
import hashlib
import os
import platform
import subprocess
import tempfile
from pathlib import Path

import torch
from torch import Tensor, nn

SOURCE = Path(__file__).with_name("recurrence.cpp")
MOST_ROWS = 32768  # that libraries of GPUs take at once
FLAGS = ("-std=c++20", "-O3", "-march=native", "-ffast-math", "-Wno-psabi", "-shared", "-fPIC")


class _Layer(ctypes.Structure):
    _fields_ = [(name, ctypes.c_void_p) for name in "x state in_weights state_weights in_bias state_bias y".split()] + [
        (name, ctypes.c_int64) for name in "steps rows ins hidden x_step x_row y_step y_row backwards".split()
    ]


class _Gradients(ctypes.Structure):
    _fields_ = [(name, ctypes.c_void_p) for name in "y x in_weights state_weights in_bias state_bias".split()]


@functools.cache
def library() -> ctypes.CDLL | None:
    """The compiled loop; None without a compiler."""
    processor = next((line for line in _lines("/proc/cpuinfo") if line.startswith("flags")), platform.processor())
    name = hashlib.sha256(" ".join([SOURCE.read_text(), *FLAGS, processor]).encode()).hexdigest()[:16]
    folder = Path(os.environ.get("XDG_CACHE_HOME", Path.home() / ".cache")) / "morva_training"
    target = folder / f"recurrence-{name}.so"
    if not target.exists():
        folder.mkdir(parents=True, exist_ok=True)
        with tempfile.TemporaryDirectory(dir=folder) as partial:
            made = Path(partial) / "loop.so"
            try:
                subprocess.run(["g++", *FLAGS, str(SOURCE), "-o", str(made)], check=True)
            except FileNotFoundError:
                return None
            made.replace(target)
    return ctypes.CDLL(str(target))


def _lines(file: str) -> list[str]:
    return Path(file).read_text().splitlines() if Path(file).exists() else []


class _Loop(torch.autograd.Function):
    """Of one or two directions, each with the four parameters of a layer; their results are side by side."""

    @staticmethod
    def forward(ctx, x, state, dim, *weights):
        x = x.contiguous()
        y = x.new_empty(*x.shape[:-1], len(weights) // 4 * state.shape[-1])
        ctx.dim, saved = dim, (x, state, y, *weights)
        ctx.save_for_backward(*saved)
        for layer in _layers(saved, dim):
            library().forward(ctypes.byref(layer))
        return y

    @staticmethod
    def backward(ctx, dy):
        dy, (x, state, _, *weights) = dy.contiguous(), ctx.saved_tensors
        dx, gradients = torch.zeros_like(x), [torch.empty_like(w) for w in weights]
        for number, layer in enumerate(_layers(ctx.saved_tensors, ctx.dim)):
            dy_at = dy.data_ptr() + number * state.shape[-1] * dy.element_size()
            own = (g.data_ptr() for g in gradients[4 * number : 4 * number + 4])
            library().backward(ctypes.byref(layer), ctypes.byref(_Gradients(dy_at, dx.data_ptr(), *own)))
        return dx, None, None, *gradients


def _layers(saved: tuple[Tensor, ...], dim: int) -> list[_Layer]:
    """What the loop is told of each direction; the tensors must live as long."""
    x, state, y, *weights = saved
    steps, ins, hidden = x.shape[dim], x.shape[-1], state.shape[-1]
    rows = x.numel() // (steps * ins)
    strides = [s for c in (ins, y.shape[-1]) for s in ((rows * c, c) if dim == 0 else (c, steps * c))]
    layers = []
    for number in range(len(weights) // 4):
        own = (w.data_ptr() for w in weights[4 * number : 4 * number + 4])
        y_at = y.data_ptr() + number * hidden * y.element_size()
        layers.append(_Layer(x.data_ptr(), state.data_ptr(), *own, y_at, steps, rows, ins, hidden, *strides, number))
    return layers


def recurrent(gru: nn.GRU, x: Tensor, dim: int, state: Tensor | None = None) -> Tensor:
    """The results [..., H] or [..., 2 H] of a layer of one or two directions over dimension `dim` of x [..., C], the
    first or the last but one; everything else are rows. `state` [rows, H] is what came before, of one direction.
    """
    dim %= x.dim()
    if x.device.type == "cpu" and library():
        before = x.new_zeros(x[..., 0].numel() // x.shape[dim], gru.hidden_size) if state is None else state
        return _Loop.apply(x, before.contiguous(), dim, *gru.parameters())
    moved = x.movedim(dim, 0)
    rows = moved.flatten(1, -2)
    states = [None] * rows.shape[1] if state is None else state[None].split(MOST_ROWS, 1)
    y = torch.cat([gru(part, before)[0] for part, before in zip(rows.split(MOST_ROWS, 1), states)], 1)
    return y.unflatten(1, moved.shape[1:-1]).movedim(0, dim)

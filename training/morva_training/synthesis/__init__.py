"""Noise that is made, not recorded, and never repeats.

A kind is a function of a random generator, a number of samples and their rate; it gives float32 samples
of any level. `KINDS` says how often each is drawn. What needs recordings (the statistics of a texture,
a crowd's voices) is drawn by the mixer.
"""

from __future__ import annotations

from collections.abc import Callable

import numpy as np

from . import impacts, machines, music, outdoors

Kind = Callable[[np.random.Generator, int, int], np.ndarray]

KINDS: dict[Kind, float] = {
    machines.coloured: 2.0,
    machines.fan: 1.5,
    machines.engine: 1.0,
    machines.tool: 0.7,
    machines.hum: 0.7,
    impacts.keys: 1.5,
    impacts.clatter: 1.5,
    impacts.knocks: 1.2,
    outdoors.rain: 0.7,
    outdoors.fire: 0.8,
    outdoors.wind: 0.8,
    outdoors.water: 0.7,
    outdoors.traffic: 1.5,
    music.music: 1.2,
    music.signals: 0.5,
}

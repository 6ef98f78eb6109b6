"""Things that are hit: modal resonators, excited by contacts, at the times people and objects hit them.

An object is a few decaying modes; every hit excites them differently, so no two sound the same.
"""

from __future__ import annotations

from dataclasses import dataclass

import numpy as np

from .sources import Rng, added, decays, log_uniform, normal


@dataclass(frozen=True)
class Thing:
    """Ranges of an object's modes and of the noise of its contact."""

    lowest_hz: tuple[float, float]
    spread: tuple[float, float]  # the highest mode over the lowest
    modes: tuple[int, int]
    ring: tuple[float, float]  # seconds of the lowest mode to -60 dB
    contact: tuple[float, float]  # seconds of the contact's noise to -60 dB
    noise: tuple[float, float]  # its amplitude over that of the modes


KEY = Thing((180.0, 900.0), (8.0, 25.0), (4, 9), (0.015, 0.06), (0.006, 0.025), (0.5, 2.5))
DISH = Thing((600.0, 2500.0), (4.0, 9.0), (6, 14), (0.08, 0.6), (0.003, 0.01), (0.2, 1.0))
DOOR = Thing((50.0, 180.0), (8.0, 30.0), (8, 14), (0.08, 0.3), (0.02, 0.08), (0.3, 1.5))
WOOD = Thing((120.0, 700.0), (6.0, 15.0), (5, 10), (0.03, 0.15), (0.005, 0.02), (0.3, 1.2))
METAL = Thing((250.0, 1500.0), (6.0, 20.0), (8, 16), (0.2, 0.9), (0.003, 0.02), (0.2, 0.8))
STEP = Thing((60.0, 250.0), (6.0, 20.0), (4, 8), (0.02, 0.08), (0.03, 0.12), (0.5, 2.0))
PLASTIC = Thing((300.0, 1800.0), (5.0, 15.0), (4, 9), (0.01, 0.05), (0.003, 0.015), (0.5, 2.0))


def hits(rng: Rng, thing: Thing, variants: int, rate: int) -> np.ndarray:
    """Different hits [variants, samples] of one object."""
    modes = int(rng.integers(*thing.modes))
    lowest, ring = log_uniform(rng, *thing.lowest_hz), log_uniform(rng, *thing.ring)
    frequency = np.sort(lowest * log_uniform(rng, *thing.spread) ** rng.random(modes))
    frequency[0] = lowest
    frequency = np.minimum(frequency, 0.47 * rate)
    seconds = ring * (lowest / frequency) ** rng.uniform(0.2, 0.8) * rng.uniform(0.6, 1.4, modes)
    count = int(min(0.5, max(seconds.max(), thing.contact[1])) * rate)
    strength = rng.lognormal(0.0, 0.8, (variants, modes)) * (frequency / lowest) ** -rng.uniform(0.0, 1.0)
    sounds = strength.astype(np.float32) @ decays(frequency, seconds, count, rate)
    length = min(count, int(log_uniform(rng, *thing.contact) * rate) + 8)
    burst = normal(rng, (variants, length)) * np.exp(-6.9 * np.arange(length) / length).astype(np.float32)
    burst[:, 1:] += rng.uniform(-0.9, 0.9) * burst[:, :-1]
    sounds[:, :length] += burst * np.float32(rng.uniform(*thing.noise) * np.abs(sounds).max() / 3.0)
    fade = min(count, rate // 200)
    sounds[:, count - fade :] *= np.linspace(1.0, 0.0, fade, dtype=np.float32)
    return sounds / (np.abs(sounds).max() + 1e-9)


def sequence(
    rng: Rng, times: np.ndarray, things: list[np.ndarray], spread_db: float, count: int, rate: int
) -> np.ndarray:
    """Hits at the times (seconds), each of a random variant of a random object and of its own strength."""
    out = np.zeros(count, np.float32)
    for time in times:
        sounds = things[rng.integers(len(things))]
        strength = np.float32(10 ** (rng.normal(0.0, spread_db) / 20))
        added(out, sounds[rng.integers(len(sounds))] * strength, int(time * rate))
    return out


def typing_times(rng: Rng, seconds: float) -> np.ndarray:
    """Words of keys with rests between them; now and then nothing else for a while."""
    pace, times, now = rng.uniform(0.08, 0.25), [], rng.uniform(-0.5, 0.5)
    while now < seconds:
        intervals = rng.lognormal(np.log(pace), 0.4, int(rng.integers(1, 10)))
        times.append(now + np.cumsum(intervals))
        now = times[-1][-1] + rng.exponential(0.4)
    return np.concatenate(times)


def steady_times(rng: Rng, seconds: float, interval: float, jitter: float) -> np.ndarray:
    """Steps, hammering, ticking."""
    number = int(seconds / interval) + 2
    return np.cumsum(interval * (1.0 + jitter * rng.standard_normal(number))) - interval * rng.random() * 2


def scattered_times(rng: Rng, seconds: float, rate_hz: float) -> np.ndarray:
    """Groups of hits, closer and closer where something bounces."""
    starts = rng.uniform(-0.3, seconds, max(1, rng.poisson(seconds * rate_hz)))
    groups = []
    for start in starts:
        number = int(rng.integers(1, 7))
        groups.append(start + np.cumsum(rng.uniform(0.03, 0.3) * rng.uniform(0.5, 1.0) ** np.arange(number)))
    return np.concatenate(groups)


def keys(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Typing: a key goes down and, softer and brighter, up again; sometimes a mouse between."""
    times = typing_times(rng, count / rate)
    down = [hits(rng, KEY, 4, rate) for _ in range(2)]
    up = [hits(rng, PLASTIC, 4, rate)]
    out = sequence(rng, times, down, 3.0, count, rate)
    out += rng.uniform(0.1, 0.6) * sequence(rng, times + rng.normal(0.09, 0.02, len(times)), up, 3.0, count, rate)
    return out


def clatter(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Dishes, cutlery, tools, toys, boxes: several objects hit in groups."""
    kinds = [(DISH,), (METAL,), (WOOD, PLASTIC), (DISH, METAL), (PLASTIC,)][rng.integers(5)]
    things = [hits(rng, kinds[i % len(kinds)], 4, rate) for i in range(3)]
    return sequence(rng, scattered_times(rng, count / rate, rng.uniform(0.5, 3.0)), things, 6.0, count, rate)


def knocks(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Doors, steps, hammers, clocks, knocking: one object, at regular times or few."""
    seconds = count / rate
    thing = [DOOR, STEP, WOOD, METAL, PLASTIC][rng.integers(5)]
    if thing is DOOR:
        times = rng.uniform(0.0, seconds, rng.integers(1, 4))
        times = np.concatenate([times, times + rng.uniform(0.02, 0.15)])
    else:
        times = steady_times(rng, seconds, log_uniform(rng, 0.12, 1.0), rng.uniform(0.01, 0.12))
        times = times[rng.random(len(times)) < rng.uniform(0.5, 1.0)]
    return sequence(rng, times, [hits(rng, thing, 5, rate)], 3.0, count, rate)

"""Music, signals and ringing: notes of one cycle each, chords, drums."""

from __future__ import annotations

import numpy as np

from .sources import Rng, added, cycle_of, decays, log_uniform, normal, played

SCALES = ((0, 2, 4, 5, 7, 9, 11), (0, 2, 3, 5, 7, 8, 10), (0, 3, 5, 7, 10))


def _note(
    rng: Rng, bright: np.ndarray, dull: np.ndarray, hz: float, seconds: float, held: bool, rate: int
) -> np.ndarray:
    """Plucked: bright first, then dull and soft. Held: with a soft start, an end, and vibrato."""
    count = int(seconds * rate)
    time = np.arange(count, dtype=np.float32) / rate
    turn = hz * time
    if held and rng.random() < 0.6:
        speed = rng.uniform(4.0, 7.0)
        turn = turn + hz * rng.uniform(0.001, 0.006) / speed * np.sin(2 * np.pi * speed * time)
    if held:
        edge = rng.uniform(0.01, 0.08)
        return played(bright, turn) * np.minimum(1.0, np.minimum(time, time[::-1]) / edge)
    decay = np.exp(-time * np.float32(rng.uniform(2.0, 8.0)))
    softening = np.minimum(1.0, time[::-1] / 0.01) * decay * np.minimum(1.0, time / 0.002)
    return (played(bright, turn) * decay + played(dull, turn)) * softening


def _pattern(rng: Rng, beats: int) -> list[list[int]]:
    """Steps of a scale per beat: a chord, a melody or both."""
    root = int(rng.integers(7))
    melody = np.cumsum(rng.integers(-2, 3, beats)) + 7
    chord = [root, root + 2, root + 4]
    style = rng.integers(3)
    beat_chord = [chord if style != 0 and beat % 4 == 0 else [] for beat in range(beats)]
    return [c + ([int(m)] if style != 1 and rng.random() < 0.8 else []) for c, m in zip(beat_chord, melody)]


def tune(rng: Rng, count: int, rate: int) -> np.ndarray:
    """An instrument or two, a key and a tempo of its own."""
    out = np.zeros(count, np.float32)
    beat = rng.uniform(0.15, 0.5)
    scale, tonic = SCALES[rng.integers(len(SCALES))], log_uniform(rng, 65.0, 260.0)
    held = bool(rng.random() < 0.5)
    number = np.arange(1, 40)
    bright = cycle_of(rng, number ** -rng.uniform(0.6, 2.0) * rng.lognormal(0.0, 0.5, len(number)))
    dull = cycle_of(rng, number[:6] ** -2.0)
    start = -rng.random() * 2 * beat
    for index, steps in enumerate(_pattern(rng, int(count / rate / beat) + 3)):
        for step in steps:
            hz = tonic * 2.0 ** ((scale[step % len(scale)] + 12 * (step // len(scale))) / 12)
            seconds = min(1.5, beat * (4 if len(steps) > 1 else rng.uniform(0.8, 2.0)))
            if hz < 1600.0:
                note = _note(rng, bright, dull, hz, seconds, held, rate) * np.float32(rng.uniform(0.4, 1.0))
                added(out, note, int((start + index * beat) * rate))
    return out


def drums(rng: Rng, count: int, rate: int) -> np.ndarray:
    """A bar of kick, snare and hats that varies from beat to beat."""
    time = np.arange(rate // 4, dtype=np.float32) / rate
    kick = np.sin(2 * np.pi * rng.uniform(45, 70) * (time + 0.08 * (1 - np.exp(-time * 30)))) * np.exp(-time * 14)
    shell = decays(rng.uniform(160, 260, 2), np.array([0.15, 0.1]), len(time), rate).sum(0)
    out, beat = np.zeros(count, np.float32), rng.uniform(0.1, 0.22)
    chances = rng.random((3, 8)) < np.array([[0.35], [0.25], [0.8]])
    for index in range(int(count / rate / beat) + 2):
        now = int((index - rng.random() * 0.02) * beat * rate)
        noise = normal(rng, len(time))
        sounds = (
            kick,
            shell + noise * np.exp(-time * 25),
            0.4 * np.diff(noise, prepend=noise[:1]) * np.exp(-time * 60),
        )
        for sound, bar in zip(sounds, chances):
            if bar[index % 8]:
                added(out, sound * np.float32(rng.uniform(0.5, 1.0)), now)
    return out


def music(rng: Rng, count: int, rate: int) -> np.ndarray:
    style = rng.random()
    out = tune(rng, count, rate) if style < 0.8 else np.zeros(count, np.float32)
    if style > 0.6:
        out = out + drums(rng, count, rate) * np.float32(rng.uniform(0.3, 1.5))
    return out


def signals(rng: Rng, count: int, rate: int) -> np.ndarray:
    """Beeps, ringing, sirens and keys of a telephone: tones that repeat after a pattern."""
    hz = np.array([log_uniform(rng, 350.0, 4000.0) for _ in range(rng.integers(1, 4))])
    seconds, rest = rng.uniform(0.05, 0.6), rng.uniform(0.03, 1.0)
    sweep = rng.uniform(-0.4, 0.4) if rng.random() < 0.3 else 0.0
    cycle = cycle_of(rng, np.arange(1, 8) ** -rng.uniform(1.0, 3.0))
    time = np.arange(int(seconds * rate), dtype=np.float32) / rate
    together = rng.random() < 0.3
    edge = np.minimum(1.0, np.minimum(time, time[::-1]) / np.float32(rng.uniform(0.003, 0.03)))
    turns = [f * (time + 0.5 * sweep * np.square(time) / seconds) for f in hz]
    tones = [played(cycle, turn) * edge for turn in turns]
    if rng.random() < 0.4:
        tones = [tone * np.exp(-time * np.float32(rng.uniform(1.0, 12.0))) for tone in tones]
    out, now, index = np.zeros(count, np.float32), -rng.random() * rest, 0
    while now < count / rate:
        for tone in tones if together else [tones[index % len(tones)]]:
            added(out, tone, int(now * rate))
        now, index = now + seconds + rest * (1.0 if index % len(tones) == len(tones) - 1 else 0.2), index + 1
    return out

"""What microphones, converters, connections and codecs do to many pieces at once: see `channels`."""

from __future__ import annotations

import math

import torch
from torch import Tensor

from .channels import FULL_SCALE, bands_of_codec
from .drawing import Chance, drawn_through, frames_of, joined, rows_of
from .mixing import Recipe


def _hertz(bins: int, rate: int, chance: Chance) -> Tensor:
    return torch.linspace(0.0, rate / 2, bins, device=chance.device)


def smooth_gains(chance: Chance, pieces: int, bins: int, rate: int, deviation_db: float) -> Tensor:
    """Smooth random equalisers [pieces, bins]: six points, evenly spaced in octaves."""
    points = torch.cumsum(chance.normal(pieces, 6) * deviation_db, 1) * 0.6
    points = points - points.mean(1, keepdim=True)
    position = torch.log2(1 + _hertz(bins, rate, chance) / 200.0) / math.log2(1 + rate / 400.0) * 5
    low = position.long().clamp_max(4)
    part = position - low
    return 10 ** ((points[:, low] * (1 - part) + points[:, low + 1] * part) / 20)


def microphone_gains(chance: Chance, pieces: int, bins: int, rate: int) -> Tensor:
    """A cut of the lows and up to three resonances of capsule and case."""
    hertz = _hertz(bins, rate, chance)
    edge, order = chance.uniform(pieces, 1, low=40.0, high=350.0), 2.0 + 2.0 * chance.happens(0.5, pieces, 1)
    gain = torch.rsqrt(1.0 + (edge / hertz.clamp_min(1.0)) ** order)
    number = chance.below(torch.full((pieces, 1), 4, device=chance.device))
    for index in range(3):
        centre = chance.log_uniform(pieces, 1, low=600.0, high=rate / 2)
        width = centre * chance.uniform(pieces, 1, low=0.05, high=0.4)
        height = (10 ** (chance.uniform(pieces, 1, low=-10.0, high=12.0) / 20) - 1.0) * (number > index)
        gain = gain * (1.0 + height / (1.0 + ((hertz - centre) / width).square()))
    return gain


def low_passes(edge_hz: Tensor, bins: int, rate: int, chance: Chance) -> Tensor:
    """Steep edges [pieces, bins] at frequencies [pieces, 1]."""
    return torch.sigmoid((edge_hz - _hertz(bins, rate, chance)) * (400.0 / rate))


def gains(chance: Chance, pieces: int, bins: int, rate: int, recipe: Recipe, converter_hz: float) -> Tensor:
    """What is on the way of speech and noise alike, [pieces, bins]."""
    gain = smooth_gains(chance, pieces, bins, rate, recipe.equaliser_db)
    if len(rows := rows_of(chance.happens(recipe.microphone_share, pieces))):
        gain[rows] *= microphone_gains(chance, len(rows), bins, rate)
    if len(rows := rows_of(chance.happens(recipe.band_limit_share, pieces))):
        low, high = recipe.band_limit_hz
        gain[rows] *= low_passes(chance.log_uniform(len(rows), 1, low=low, high=high), bins, rate, chance)
    if len(rows := rows_of(chance.happens(recipe.converter_share, pieces))):
        edge = torch.full((len(rows), 1), converter_hz, device=chance.device)
        gain[rows] *= low_passes(edge, bins, rate, chance)
    return gain


def coloured(chance: Chance, pieces: int, count: int, rate: int) -> Tensor:
    """Noise of a random slope that stays."""
    spectra = torch.fft.rfft(chance.normal(pieces, count))
    octaves = torch.log2(_hertz(spectra.shape[1], rate, chance).clamp_min(50.0) / 1000.0)
    return torch.fft.irfft(spectra * 10 ** (chance.uniform(pieces, 1, low=-7.0, high=2.0) * octaves / 20), count)


def changing_gains(chance: Chance, pieces: int, count: int, rate: int, step_share: float, gap_share: float) -> Tensor:
    """[pieces, count]: an automatic gain or a hand at the knob, and lost packets."""
    gain = torch.ones(pieces, count, device=chance.device)
    if len(rows := rows_of(chance.happens(step_share, pieces))):
        gain[rows] *= drawn_through(10 ** (_steps_db(chance, len(rows), count // (rate // 100) + 2) / 20), count)
    if len(rows := rows_of(chance.happens(gap_share, pieces))):
        gain[rows] *= drawn_through(_gaps(chance, len(rows), count // (rate // 200) + 2), count)
    return gain


def _steps_db(chance: Chance, pieces: int, points: int) -> Tensor:
    """One or two changes by up to 12 dB, sudden or slow."""
    time = torch.arange(points, device=chance.device)
    db = torch.zeros(pieces, points, device=chance.device)
    for number in range(2):
        start = chance.uniform(pieces, 1, high=points)
        length = torch.tensor([1.0, 5.0, 50.0], device=chance.device)[
            chance.below(torch.full((pieces, 1), 3, device=chance.device))
        ]
        height = chance.uniform(pieces, 1, low=-12.0, high=12.0)
        if number:
            height = height * chance.happens(0.5, pieces, 1)
        db += height * ((time - start) / length).clamp(0.0, 1.0)
    return db


def _gaps(chance: Chance, pieces: int, points: int) -> Tensor:
    """Lost packets of 10 to 60 ms, some of them in bursts."""
    time = torch.arange(points, device=chance.device)
    gain = torch.ones(pieces, points, device=chance.device)
    bursts = chance.uniform(pieces, 1, low=1.0, high=6.0).floor()
    for burst in range(5):
        start = chance.uniform(pieces, 1, high=points)
        packets = chance.uniform(pieces, 1, low=1.0, high=4.0).floor() * (burst < bursts)
        for packet in range(3):
            length = 2 * chance.uniform(pieces, 1, low=1.0, high=7.0).floor() * (packet < packets)
            gain = gain * ~((time >= start) & (time < start + length))
            start = start + chance.uniform(pieces, 1, low=4.0, high=40.0)
    return gain


def started_and_stopped(chance: Chance, noise: Tensor, rate: int) -> Tensor:
    """A part of each piece, suddenly or not."""
    pieces, count = noise.shape
    length = chance.uniform(pieces, 1, low=0.2, high=0.8) * count
    start = chance.uniform(pieces, 1, low=-0.3, high=0.8) * count
    start = torch.minimum(torch.maximum(start, -0.7 * length), count - 0.3 * length)
    fade = chance.log_uniform(pieces, 1, low=0.005, high=0.5) * rate
    time = torch.arange(count, device=chance.device)
    within = (torch.minimum(time - start, start + length - time) / torch.minimum(fade, length / 2)).clamp(0.0, 1.0)
    return noise * torch.sin(0.5 * math.pi * within)


def heard(chance: Chance, total: Tensor, rate: int, clip_share: float, codec_share: float) -> Tensor:
    """The sums [pieces, n] as they arrive."""
    pieces = len(total)
    peak = total.abs().amax(1, keepdim=True) * chance.uniform(pieces, 1, low=0.3, high=0.9)
    limit = torch.where(chance.happens(clip_share, pieces, 1), peak, FULL_SCALE).clamp_max(FULL_SCALE)
    total = torch.maximum(torch.minimum(total, limit), -limit)
    codec = chance.below(torch.full((pieces,), len(CODECS), device=chance.device))
    coded = chance.happens(codec_share, pieces)
    for number, through in enumerate(CODECS):
        if len(rows := rows_of(coded & (codec == number))):
            coarseness = chance.uniform(len(rows), 1)
            total[rows] = through(total[rows], rate, coarseness).clamp(-FULL_SCALE, FULL_SCALE)
    return total


def companded(samples: Tensor, rate: int, coarseness: Tensor) -> Tensor:
    steps, bend = 127.0 / 4.0**coarseness, 255.0
    level = torch.log1p(bend * (samples.abs() / FULL_SCALE).clamp_max(1.0)) / math.log1p(bend)
    level = torch.round(level * steps) / steps
    return torch.sign(samples) * torch.expm1(level * math.log1p(bend)) / bend * FULL_SCALE


def in_blocks(samples: Tensor, rate: int, coarseness: Tensor) -> Tensor:
    size, count = rate // 250, samples.shape[1]
    blocks = torch.nn.functional.pad(samples, (0, -count % size)).unflatten(1, (-1, size))
    step = blocks.abs().amax(-1, keepdim=True) / (48.0 / 6.0**coarseness)[..., None] + 1.0
    return (torch.round(blocks / step) * step).flatten(1)[:, :count]


def in_bands(samples: Tensor, rate: int, coarseness: Tensor) -> Tensor:
    spectra, window = frames_of(samples, rate // 50)
    edges, widths = (torch.as_tensor(v, device=samples.device) for v in bands_of_codec(rate))
    band = torch.repeat_interleave(torch.arange(len(edges), device=samples.device), widths)
    power = (spectra.real.square() + spectra.imag.square())[..., :-1]
    sums = torch.zeros(*power.shape[:2], len(edges), device=samples.device).index_add_(2, band, power)
    level = (sums / widths).sqrt()
    coarseness = coarseness[..., None]
    slope = torch.linspace(0.5, 1.5, len(edges), device=samples.device)
    loudest = level.amax(-1, keepdim=True)
    step = level * (0.3 + 1.6 * coarseness) * slope + 1e-4 * 10**coarseness * loudest + 1e-3
    step = step[..., band]
    coarse = torch.view_as_complex(
        torch.round(torch.view_as_real(spectra[..., :-1]) / step[..., None]) * step[..., None]
    )
    return joined(torch.nn.functional.pad(coarse, (0, 1)), window, samples.shape[1])


CODECS = (companded, in_blocks, in_bands)

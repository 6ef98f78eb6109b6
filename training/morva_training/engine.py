"""A frame-by-frame reference of the engine in NumPy: what a call hears with a weight file.

Used to score models without the engine and, in the tests, to show that the engine and the
training code agree. It follows the engine's order of operations in single precision, sigmoids in
double. Samples are floats on the 16-bit scale at the model's rate. One object is one stream; not
for use from several threads.
"""

from __future__ import annotations

from collections import deque

import numpy as np
from scipy import fft as sfft

from .convert import layout_of
from .mvw import Weight
from .spectra import (
    ACTIVITY_ENERGY,
    ENERGY_FRAMES,
    FEATURE_OFFSET,
    REFERENCE_AMPLITUDE,
    compress_bands,
    hamming_window,
    vorbis_window,
)

UNSUPPORTED = ("ENABLE_CLIP_FIX", "VOLUME_UP", "ENABLE_THRESH_CUT", "SKIP_FRAME", "ENABLE_BACKGROUND_SPEAKER_FIX")
DELAYS_MS = {  # (model frame, caller's frame) -> silence before the first output
    (20, 10): 10, (20, 15): 15, (20, 20): 10, (20, 30): 10, (20, 32): 18, (20, 40): 10,
    (30, 10): 25, (30, 15): 15, (30, 20): 25, (30, 30): 15, (30, 32): 29, (30, 40): 25,
    (32, 10): 31, (32, 15): 28, (32, 20): 28, (32, 30): 30, (32, 32): 16, (32, 40): 28,
}  # fmt: skip


def sigmoid(values: np.ndarray) -> np.ndarray:
    return (1.0 / (1.0 + np.exp(-values.astype(np.float64)))).astype(np.float32)


def normalised(values: np.ndarray) -> np.ndarray:
    """Zero mean and unit RMS; the small term stands outside the root."""
    mean = np.float32(values.sum(dtype=np.float64)) / np.float32(len(values))
    centred = values - mean
    rms = np.float32(np.sqrt(np.square(centred).sum(dtype=np.float64) / len(values))) + np.float32(1e-6)
    return centred * (np.float32(1.0) / rms)


def combined(rectified: np.ndarray, linear: np.ndarray) -> np.ndarray:
    return np.where(rectified < 0, linear, rectified + linear)


class GatedStep:
    """One frame of the layer-normalised network (version 0.0.6)."""

    def __init__(self, weight: Weight) -> None:
        self.w = weight
        self.state = np.zeros(weight["WeightNonLinear"][-1].shape[0], np.float32)

    def __call__(self, x: np.ndarray) -> np.ndarray:
        w, h = self.w, self.state
        joined = np.concatenate([h, x])
        keep = sigmoid(joined @ w["WeightGRU"] + w["BaesGRU"])
        reset = sigmoid(joined @ w["WeightGRU_reset"] + w["BiasGRU_reset"])
        y = np.concatenate([reset * h, x])
        for i in range(len(w["WeightNonLinear"]) - 1):
            a = normalised(y @ w["WeightNonLinear"][i] + w["BaesNonLinear"][i])
            b = normalised(y @ w["WeightLinear"][i] + w["BaesLinear"][i])
            a = a * w["GainNonLinearNorm"][i] + w["BiasNonLinearNorm"][i]
            b = b * w["GainLinearNorm"][i] + w["BiasLinearNorm"][i]
            y = combined(a, b)
            if i == 0:
                self.state = y = (keep * h + (1 - keep) * y).astype(np.float32)
        return sigmoid(y @ w["WeightNonLinear"][-1] + w["BaesNonLinear"][-1])


class PlainStep:
    """One frame of the network without normalisation (version 0.0.5 and voice activity)."""

    def __init__(self, weight: Weight, voice: bool = False) -> None:
        self.w = weight
        self.voice = voice
        self.state = np.zeros(weight["WeightNonLinear"][-1].shape[0], np.float32)

    def __call__(self, x: np.ndarray) -> np.ndarray:
        w, h = self.w, self.state
        y = np.concatenate([h, x])
        gate = sigmoid(y @ w["WeightGRU"] + w["BaesGRU"])
        layers = len(w["WeightLinear" if self.voice else "WeightNonLinear"])
        for i in range(layers - 1):
            a = y @ w["WeightNonLinear"][i] + w["BaesNonLinear"][i]
            b = y @ w["WeightLinear"][i] + w["BaesLinear"][i]
            y = combined(a, b)
            if i == 0:
                self.state = (gate * y + (1 - gate) * h).astype(np.float32)
        if self.voice:
            return y @ w["WeightLinear"][-1] + w["BaesLinear"][-1]
        return sigmoid(y @ w["WeightNonLinear"][-1] + w["BaesNonLinear"][-1])


class ActiveEnergy:
    """Running mean energy of the active frames, for the level gain."""

    def __init__(self, active_frames: int, threshold: float, initial: float) -> None:
        self.recent: deque[float] = deque([0.0] * ENERGY_FRAMES, ENERGY_FRAMES)
        self.active: deque[float] = deque([initial], active_frames)
        self.threshold = threshold

    def __call__(self, frame: np.ndarray) -> float:
        energy = float(np.square(frame.astype(np.float64)).mean())
        self.recent.append(energy / ENERGY_FRAMES)
        if sum(self.recent) >= self.threshold:
            self.active.append(energy)
        return float(np.float32(sum(self.active) / len(self.active)))


class NoiseModel:
    """A noise model: `hop` cleans one model hop, `process` a caller's frame."""

    def __init__(self, weight: Weight, frame_ms: int = 10) -> None:
        self.weight = weight
        self.layout = layout_of(weight)
        version = bytes(weight["Version"]).decode()
        self._suffix = "_v" + version.replace(".", "_")
        for name in UNSUPPORTED:
            if self._switch(name):
                raise NotImplementedError(f"{name} is not part of this reference")
        self.step = GatedStep(weight) if version == "0.0.6" else PlainStep(weight)
        layout = self.layout
        self.window = vorbis_window(layout.frame)
        self.smoothing = float(self._control("SMOOT_COEF", 1.0))
        self.soft_square = self._switch("SMOOT_RM_MODIFY")
        self.square_high = self._switch("HIGH_FREQ_SMOOT")
        self.low_mask = float(self._control("RM_THRESHOLD", 0.5)) if self._switch("ENABLE_RM_THRESHOLD") else 0.0
        self.reference = float(self._control("RESCALE_REF_AMPL", REFERENCE_AMPLITUDE))
        self.rescale = self._switch("ENABLE_RESCALE", True)
        self.frame_ms = frame_ms
        self.reset()

    def _control(self, name: str, default):
        return self.weight.get(f"CONTROL_MORVA_{name}{self._suffix}", default)

    def _switch(self, name: str, default: bool = False) -> bool:
        value = self._control(name, None)
        return default if value is None else value == b"t"

    def reset(self) -> None:
        layout = self.layout
        threshold = float(self._control("RESCALE_REF_EN", ACTIVITY_ENERGY))
        self.energy = ActiveEnergy(layout.active_frames, threshold, self.reference**2)
        self.context = deque([np.zeros(layout.bands, np.float32)] * layout.preview, layout.preview)
        self.previous = np.zeros(layout.frame // 2 + 1, np.float32)
        self.step.state = np.zeros_like(self.step.state)
        delay = DELAYS_MS.get((layout.frame * 1000 // layout.rate, self.frame_ms), 0)
        self.pending = np.zeros(layout.hop, np.float32)
        self.ready = np.zeros(delay * layout.rate // 1000, np.float32)

    def mask(self, spectrum: np.ndarray, samples: np.ndarray) -> np.ndarray:
        """The mask that is applied to one model frame, frame / 2 + 1 values."""
        layout, w = self.layout, self.weight
        gain = np.float32(1.0)
        if self.rescale:
            mean = self.energy(samples)
            gain = np.float32(self.reference / np.sqrt(mean)) if mean > 1e-6 else gain
        seen = spectrum[layout.first_bin : layout.first_bin + layout.bins]
        power = np.square(np.abs(seen) * gain)
        self.context.append(np.log(compress_bands(power, layout) + np.float32(FEATURE_OFFSET)))
        x = np.concatenate(self.context)
        index = np.arange(len(x))
        x = (x - w["MU"][index % len(w["MU"])]) / w["SD"][index % len(w["SD"])]
        bands = self.step(x)
        full = np.zeros(layout.frame // 2 + 1, np.float32)
        full[layout.first_bin : layout.first_bin + layout.bins] = bands[layout.band_of_bin()]
        return self._shaped(full)

    def _shaped(self, mask: np.ndarray) -> np.ndarray:
        if self.soft_square:
            m = mask.astype(np.float64)
            t = (m - 0.05) / 0.05
            mask = (m / (1 + np.exp(t)) + m * m / (1 + np.exp(-3 * t))).astype(np.float32)
        else:
            mask = mask * mask
        if self.square_high:
            half = len(mask) // 2
            mask[half:] = np.square(mask[half:])
        if self.smoothing != 1.0:
            c = np.float32(self.smoothing)
            mask = (1 - c) * self.previous + c * mask
        if self.low_mask > 0.0:
            low = np.float32(self.low_mask)
            mask = np.where(mask < low, mask * mask / low, mask)
        self.previous = mask
        return mask

    def hop(self, samples: np.ndarray) -> np.ndarray:
        """The windowed, cleaned model frame of `frame` input samples."""
        spectrum = sfft.rfft((samples * self.window).astype(np.float32))
        cleaned = spectrum * self.mask(spectrum, samples)
        return sfft.irfft(cleaned, n=self.layout.frame).astype(np.float32) * self.window

    def process(self, samples: np.ndarray) -> np.ndarray:
        """As many cleaned samples as were given, later by the model's delay."""
        hop = self.layout.hop
        self.pending = np.concatenate([self.pending, samples.astype(np.float32)])
        while len(self.pending) >= 2 * hop:
            frame = self.hop(self.pending[: 2 * hop])
            self.finished(self.pending[:hop], frame)
            self.pending = self.pending[hop:]
        result, self.ready = self.ready[: len(samples)], self.ready[len(samples) :]
        return result

    def finished(self, _input: np.ndarray, frame: np.ndarray) -> np.ndarray:
        """Overlap-adds a model frame; returns the hop of output that is now complete."""
        hop = self.layout.hop
        self.ready = np.concatenate([self.ready, np.zeros(hop, np.float32)])
        self.ready[-2 * hop :] += frame
        return self.ready[-2 * hop : -hop]


class NoiseLevelModel(NoiseModel):
    """A version 0.0.5 model that reports the level in dB of what it removes."""

    def reset(self) -> None:
        super().reset()
        self.power = np.float32(0.0)

    def finished(self, input_: np.ndarray, frame: np.ndarray) -> np.ndarray:
        output = super().finished(input_, frame)
        noise = input_ - output
        energy = np.float32(np.square(noise.astype(np.float64)).mean())
        self.power = self.power * np.float32(0.9) + energy * np.float32(1 - np.float32(0.9))
        return output

    def level(self, samples: np.ndarray) -> float:
        self.process(samples)
        return float(10 * np.log10(self.power + np.float32(1e-6)))


class VoiceModel:
    """The voice-activity model: one score per caller's frame (any length, at the model's rate)."""

    CONTEXT = 4
    SMOOTHING = 0.954992586021436  # 10 ** -0.02
    FLOOR = 10000.0

    def __init__(self, weight: Weight) -> None:
        self.weight = weight
        self.size = int(weight["FrameLength"])
        self.window = hamming_window(self.size)
        self.step = PlainStep(weight, voice=True)
        self.level = 4000000.0
        self.samples = np.zeros(self.size, np.float32)
        self.scale = np.sqrt(weight["SD"] + np.float32(1e-7))
        silent = (np.zeros_like(weight["MU"]) - weight["MU"]) / self.scale
        self.context = deque([silent] * (self.CONTEXT + 1), self.CONTEXT + 1)
        self.points: list[float] = []
        if len(weight.get("Test_MINMAX", ())) >= 2 and len(weight.get("Test_BestF1", ())) >= 1:
            low, high = weight["Test_MINMAX"][:2]
            middle = weight["Test_BestF1"][0]
            self.points = [low, middle, high] if low != middle != high else []

    def logit(self, frame: np.ndarray) -> float:
        energy = float(np.square(frame.astype(np.float64)).mean())
        if energy >= self.FLOOR:
            rise = energy > 2.0 * self.level
            share = self.SMOOTHING if rise else 1 - self.SMOOTHING
            self.level = (1 - share) * self.level + share * energy
        gain = np.float32(2000.0 / (np.sqrt(self.level) + 1e-7))
        self.samples = np.concatenate([self.samples, frame * gain])[-self.size :].astype(np.float32)
        spectrum = sfft.rfft(self.samples * self.window)
        self.context.append((voice_features(spectrum) - self.weight["MU"]) / self.scale)
        return float(self.step(np.concatenate(self.context))[0])

    def score(self, frame: np.ndarray) -> float:
        y = self.logit(frame)
        return calibrated(y, self.points) if self.points else y


def calibrated(y: float, points: list[float]) -> float:
    low, middle, high = points
    score = (y - middle) * 0.5 / (high - middle) + 0.5 if y >= middle else (y - low) * 0.5 / (middle - low)
    return float(np.clip(score, 1e-5, 0.99999))


def pooling_starts(bins: int) -> np.ndarray:
    """First bins of the voice model's bands: single bins, then pairs, fours and so on per octave."""
    extra = 1 if bins % 8 == 1 else 0
    quarter = bins // 4
    starts = list(range(quarter + extra))
    index, width, boundary = quarter + extra, 2, 2 * quarter
    while index < bins:
        if index - extra == boundary:
            width, boundary = 2 * width, 2 * boundary
        starts.append(index)
        index += width
    return np.array(starts)


def voice_features(spectrum: np.ndarray) -> np.ndarray:
    """Log band powers [..., F] of spectra [..., FrameLength / 2 + 1], before standardisation."""
    power = np.square(spectrum.real) + np.square(spectrum.imag)
    starts = pooling_starts(power.shape[-1])
    widths = np.diff(np.append(starts, power.shape[-1]))
    return np.log(np.add.reduceat(power, starts, axis=-1) / widths + 1).astype(np.float32)

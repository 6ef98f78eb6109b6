"""Pictures of ten recordings before and after a model, for docs/examples.

    python bench/quality/spectrograms.py --store STORE --out docs/examples models/c6.xs.f.ca03f4.mvw

Speech and noise are held-out material; the whisper is synthesised by espeak-ng. Prints for every
example the numbers that stand in its title.
"""

from __future__ import annotations

import argparse
import io
import subprocess
import tempfile
from dataclasses import dataclass
from pathlib import Path

import matplotlib
import numpy as np
import soundfile

matplotlib.use("Agg")
import matplotlib.pyplot as plt  # noqa: E402
from PIL import Image  # noqa: E402

import metrics  # noqa: E402
import mixtures  # noqa: E402
import systems  # noqa: E402
from morva_training.corpus import BASE_RATE, Corpus  # noqa: E402
from morva_training.measures import si_sdr  # noqa: E402

SECONDS = 6


@dataclass(frozen=True)
class Example:
    name: str
    noise: str = ""  # category; "" for none, "babble" for talkers
    snr_db: float = 5.0
    voice: str = ""  # "", "whisper" or "shout"


EXAMPLES = (
    Example("typing", "keyboard", 5),
    Example("dog", "dog_bark", 0),
    Example("cafe", "babble", 10),
    Example("fan", "computer_fan", 0),
    Example("street", "traffic", 5),
    Example("music", "music", 5),
    Example("laughter", "human_nonspeech", 5),
    Example("whisper", "air_conditioner", 10, "whisper"),
    Example("shouting", "construction", 10, "shout"),
    Example("clean"),
)


class Material:
    def __init__(self, store: Path, seed: int) -> None:
        self.corpus = Corpus(store)
        self.rng = np.random.default_rng(seed)
        self.count = SECONDS * BASE_RATE

    def fitted(self, samples: np.ndarray) -> np.ndarray:
        return np.tile(samples, -(-self.count // len(samples)))[: self.count]

    def talk(self) -> np.ndarray:
        clips = [c for c in self.corpus.clips("speech", "heldout") if c.length > 3 * BASE_RATE]
        clip = clips[self.rng.integers(len(clips))]
        out = np.zeros(self.count, np.float32)
        start = BASE_RATE
        samples = self.corpus.read(clip)[: self.count - start]
        out[start : start + len(samples)] = samples
        return out

    def shout(self) -> np.ndarray:
        """The held-out recording of acted emotions with the brightest voice."""
        clips = [c for c in self.corpus.clips("speech", "heldout") if "emodb" in c.path]

        def brightness(samples: np.ndarray) -> float:
            power = np.abs(np.fft.rfft(samples)) ** 2
            return float((power * np.arange(len(power))).sum() / power.sum() / len(power))

        loud = max(clips, key=lambda c: brightness(self.corpus.read(c)))
        return self.fitted(np.concatenate([np.zeros(BASE_RATE, np.float32), self.corpus.read(loud)]))

    def whisper(self) -> np.ndarray:
        with tempfile.NamedTemporaryFile(suffix=".wav") as file:
            text = "Nobody in the room should hear what I am telling you now."
            subprocess.run(["espeak-ng", "-v", "en+whisper", "-s", "140", "-w", file.name, text], check=True)
            samples, rate = soundfile.read(file.name, dtype="float32")
        samples = metrics.at_rate(samples, rate, BASE_RATE) * 32768.0
        return self.fitted(np.concatenate([np.zeros(BASE_RATE), samples, np.zeros(BASE_RATE)]).astype(np.float32))

    def disturbance(self, category: str) -> np.ndarray:
        if category == "babble":
            clips = [c for c in self.corpus.clips("speech", "heldout") if c.length > 2 * BASE_RATE]
            chosen = self.rng.choice(len(clips), 6, replace=False)
            voices = [self.fitted(self.corpus.read(clips[i])) for i in chosen]
            return np.sum([mixtures.scaled(v, 1.0) for v in voices], axis=0)
        clips = self.corpus.groups("noise", "heldout")[category]
        return self.fitted(self.corpus.read(max(clips, key=lambda c: c.length)))


def mixture(material: Material, example: Example) -> tuple[np.ndarray, np.ndarray]:
    """Noisy and clean, -1..1."""
    voice = {"": material.talk, "whisper": material.whisper, "shout": material.shout}[example.voice]()
    level = 10 ** ((-14 if example.voice == "shout" else -24) / 20)
    voice = mixtures.scaled(voice, level)
    if not example.noise:
        return voice, voice
    noise = mixtures.scaled(material.disturbance(example.noise), level * 10 ** (-example.snr_db / 20))
    return np.clip(voice + noise, -1, 1).astype(np.float32), voice


def draw(path: Path, title: str, noisy: np.ndarray, result: np.ndarray) -> None:
    figure, axes = plt.subplots(2, 1, figsize=(6.4, 4.2), sharex=True, constrained_layout=True)
    for axis, samples, name in zip(axes, (noisy, result), ("before", "after")):
        floor = np.random.default_rng(0).normal(0, 1e-7, len(samples))  # no logarithm of zero
        axis.specgram(samples + floor, NFFT=1024, Fs=BASE_RATE, noverlap=512, cmap="magma", vmin=-130, vmax=-40)
        axis.set_ylabel(f"{name}, Hz")
        axis.set_ylim(0, 12000)
    axes[0].set_title(title, fontsize=9)
    axes[1].set_xlabel("s")
    buffer = io.BytesIO()
    figure.savefig(buffer, dpi=72)
    plt.close(figure)
    Image.open(buffer).convert("RGB").quantize(48).save(path, optimize=True)


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("weight", type=Path)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--seed", type=int, default=7)
    args = parser.parse_args()
    args.out.mkdir(parents=True, exist_ok=True)
    process = systems.from_weight(args.weight)
    for number, example in enumerate(EXAMPLES):
        noisy, clean = mixture(Material(args.store, args.seed + number), example)
        result = process(noisy, BASE_RATE)
        before, after = si_sdr(clean, noisy), si_sdr(clean, result)
        quality = [metrics.pesq_score(clean, x, BASE_RATE) for x in (noisy, result)]
        pause = metrics.pause_attenuation(clean, noisy, result, BASE_RATE)
        title = f"{example.name}: PESQ {quality[0]:.2f} to {quality[1]:.2f}"
        if example.noise:
            title += f", SI-SDR {before:.1f} to {after:.1f} dB"
            title += f", pauses down {pause:.0f} dB" if np.isfinite(pause) else ""
        else:
            title += f", SI-SDR {after:.1f} dB"
        draw(args.out / f"{example.name}.png", title, noisy, result)
        print(title)


if __name__ == "__main__":
    main()

"""Pictures of recordings before and after a model: ten for docs/examples, or the one in the README.

    python bench/quality/spectrograms.py --store STORE --out docs/examples models/c6.xs.f.ca03f4.mvw
    python bench/quality/spectrograms.py --store STORE --out docs/images --only office models/c6.xs.f.ca03f4.mvw

Speech and noise are held-out material, at the store's rate; the whisper is synthesised by espeak-ng.
Prints for every example the numbers that stand in its title.
"""

from __future__ import annotations

import argparse
import subprocess
import tempfile
from dataclasses import dataclass
from pathlib import Path

import numpy as np
import soundfile

import metrics
import mixtures
import pictures
import systems
from morva_training.corpus import Corpus
from morva_training.measures import si_sdr

SECONDS = 6


@dataclass(frozen=True)
class Example:
    name: str
    noise: str = ""  # category; "" for none, "babble" for talkers
    snr_db: float = 5.0
    voice: str = ""  # "", "whisper" or "shout"
    talker: str = ""  # what the path of the speech holds, and of the noise; any where it is empty
    recording: str = ""


README = Example("office", "keyboard", 5, talker="vctk_p244", recording="livekit")
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
        self.rate = self.corpus.rate
        self.count = SECONDS * self.rate

    def fitted(self, samples: np.ndarray) -> np.ndarray:
        return np.tile(samples, -(-self.count // len(samples)))[: self.count]

    def talk(self, talker: str) -> np.ndarray:
        clips = [c for c in self.corpus.clips("speech", "heldout") if c.length > 3 * self.rate and talker in c.path]
        clip = clips[self.rng.integers(len(clips))]
        out = np.zeros(self.count, np.float32)
        start = self.rate
        samples = self.corpus.read(clip)[: self.count - start]
        out[start : start + len(samples)] = samples
        return out

    def shout(self, _talker: str) -> np.ndarray:
        """The held-out recording of acted emotions with the brightest voice."""
        clips = [c for c in self.corpus.clips("speech", "heldout") if "emodb" in c.path]

        def brightness(samples: np.ndarray) -> float:
            power = np.abs(np.fft.rfft(samples)) ** 2
            return float((power * np.arange(len(power))).sum() / power.sum() / len(power))

        loud = max(clips, key=lambda c: brightness(self.corpus.read(c)))
        return self.fitted(np.concatenate([np.zeros(self.rate, np.float32), self.corpus.read(loud)]))

    def whisper(self, _talker: str) -> np.ndarray:
        with tempfile.NamedTemporaryFile(suffix=".wav") as file:
            text = "Nobody in the room should hear what I am telling you now."
            subprocess.run(["espeak-ng", "-v", "en+whisper", "-s", "140", "-w", file.name, text], check=True)
            samples, rate = soundfile.read(file.name, dtype="float32")
        samples = metrics.at_rate(samples, rate, self.rate) * 32768.0
        return self.fitted(np.concatenate([np.zeros(self.rate), samples, np.zeros(self.rate)]).astype(np.float32))

    def disturbance(self, category: str, recording: str) -> np.ndarray:
        if category == "babble":
            clips = [c for c in self.corpus.clips("speech", "heldout") if c.length > 2 * self.rate]
            chosen = self.rng.choice(len(clips), 6, replace=False)
            voices = [self.fitted(self.corpus.read(clips[i])) for i in chosen]
            return np.sum([mixtures.scaled(v, 1.0, self.rate) for v in voices], axis=0)
        clips = [c for c in self.corpus.groups("noise", "heldout")[category] if recording in c.path]
        return self.fitted(self.corpus.read(max(clips, key=lambda c: c.length)))


def mixture(material: Material, example: Example) -> tuple[np.ndarray, np.ndarray]:
    """Noisy and clean, -1..1."""
    voice = {"": material.talk, "whisper": material.whisper, "shout": material.shout}[example.voice](example.talker)
    level = 10 ** ((-14 if example.voice == "shout" else -24) / 20)
    voice = mixtures.scaled(voice, level, material.rate)
    if not example.noise:
        return voice, voice
    noise = material.disturbance(example.noise, example.recording)
    noise = mixtures.scaled(noise, level * 10 ** (-example.snr_db / 20), material.rate)
    return np.clip(voice + noise, -1, 1).astype(np.float32), voice


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("weight", type=Path)
    parser.add_argument("--store", type=Path, required=True)
    parser.add_argument("--out", type=Path, required=True)
    parser.add_argument("--only", choices=[example.name for example in (*EXAMPLES, README)])
    parser.add_argument("--seed", type=int, default=7)
    args = parser.parse_args()
    args.out.mkdir(parents=True, exist_ok=True)
    process = systems.from_weight(args.weight)
    wanted = [args.only] if args.only else [example.name for example in EXAMPLES]
    for number, example in enumerate((*EXAMPLES, README)):
        if example.name not in wanted:
            continue
        material = Material(args.store, args.seed + number)
        (noisy, clean), rate = mixture(material, example), material.rate
        result = process(noisy, rate, example.name)
        before, after = si_sdr(clean, noisy), si_sdr(clean, result)
        quality = [metrics.pesq_score(clean, x, rate) for x in (noisy, result)]
        pause = metrics.pause_attenuation(clean, noisy, result, rate)
        title = f"{example.name}: PESQ {quality[0]:.2f} to {quality[1]:.2f}"
        if example.noise:
            title += f", SI-SDR {before:.1f} to {after:.1f} dB"
            title += f", pauses down {pause:.0f} dB" if np.isfinite(pause) else ""
        else:
            title += f", SI-SDR {after:.1f} dB"
        size, words = ((10, 6), "") if example is README else ((6.4, 4.2), title)
        pictures.draw(args.out / f"{example.name}.png", {"Before": noisy, "After": result}, rate, size, words)
        print(title)


if __name__ == "__main__":
    main()

"""Open peers, each called as a program that score.py or voice.py can compare.

    python bench/quality/peers.py {rnnoise,webrtc} in.wav out.wav
    python bench/quality/peers.py {silero,ten} in.wav

The first two clean a recording; the others print a row per frame: its start in seconds, its voice
score. Each needs its Python package: pyrnnoise, webrtc-noise-gain, silero-vad (with PyTorch),
ten-vad (with Debian's libc++1).
"""

from __future__ import annotations

import argparse
import ctypes
import importlib.util
from pathlib import Path

import numpy as np
import soundfile

import metrics

FULL_SCALE = 32768


def package_folder(name: str) -> Path:
    """Where a package lies, without running it."""
    spec = importlib.util.find_spec(name)
    if spec is None or spec.origin is None:
        raise SystemExit(f"the Python package {name} is not installed")
    return Path(spec.origin).parent


def int16(samples: np.ndarray) -> np.ndarray:
    return np.clip(np.rint(samples * FULL_SCALE), -32768, 32767).astype(np.int16)


def rnnoise(samples: np.ndarray, rate: int) -> np.ndarray:
    library = ctypes.CDLL(str(next(package_folder("pyrnnoise").glob("librnnoise.so"))))
    floats = np.ctypeslib.ndpointer(np.float32, flags="C_CONTIGUOUS")
    library.rnnoise_create.restype = ctypes.c_void_p
    library.rnnoise_create.argtypes = [ctypes.c_void_p]
    library.rnnoise_process_frame.argtypes = [ctypes.c_void_p, floats, floats]
    state = library.rnnoise_create(None)
    heard = (metrics.at_rate(samples, rate, 48000) * FULL_SCALE).astype(np.float32)
    frames = heard[: len(heard) // 480 * 480].reshape(-1, 480)
    out = np.empty_like(frames)
    for source, target in zip(frames, out):
        library.rnnoise_process_frame(state, target, source)
    return metrics.at_rate(out.reshape(-1) / FULL_SCALE, 48000, rate)


def webrtc(samples: np.ndarray, rate: int) -> np.ndarray:
    """The noise suppression at level 3 of 4, without gain control."""
    from webrtc_noise_gain import AudioProcessor

    processor = AudioProcessor(0, 3)
    heard = int16(metrics.at_rate(samples, rate, 16000))
    frames = heard[: len(heard) // 160 * 160].reshape(-1, 160)
    out = b"".join(bytes(processor.Process10ms(frame.tobytes()).audio) for frame in frames)
    return metrics.at_rate(np.frombuffer(out, np.int16).astype(np.float32) / FULL_SCALE, 16000, rate)


def silero(samples: np.ndarray, rate: int) -> tuple[list[float], float]:
    import torch

    torch.set_num_threads(1)
    model = torch.jit.load(package_folder("silero_vad") / "data" / "silero_vad.jit")
    heard = torch.from_numpy(metrics.at_rate(samples, rate, 16000).astype(np.float32))
    with torch.no_grad():
        return [model(frame, 16000).item() for frame in heard[: len(heard) // 512 * 512].view(-1, 512)], 0.032


def ten(samples: np.ndarray, rate: int) -> tuple[list[float], float]:
    from ten_vad import TenVad

    model = TenVad(160)
    heard = int16(metrics.at_rate(samples, rate, 16000))
    return [model.process(frame)[0] for frame in heard[: len(heard) // 160 * 160].reshape(-1, 160)], 0.01


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("peer", choices=["rnnoise", "webrtc", "silero", "ten"])
    parser.add_argument("source", type=Path)
    parser.add_argument("target", type=Path, nargs="?")
    args = parser.parse_args()
    samples, rate = soundfile.read(args.source, dtype="float32", always_2d=True)
    if args.peer in ("silero", "ten"):
        scores, seconds = (silero if args.peer == "silero" else ten)(samples[:, 0], rate)
        print("time_s,score")
        print("\n".join(f"{i * seconds:.3f},{score:.6f}" for i, score in enumerate(scores)))
        return
    if args.target is None:
        parser.error(f"{args.peer} needs a file to write")
    clean = (rnnoise if args.peer == "rnnoise" else webrtc)(samples[:, 0], rate)
    soundfile.write(args.target, clean, rate, "PCM_16")


if __name__ == "__main__":
    main()

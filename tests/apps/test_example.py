"""The C example cleans a raw stream of any length and leaves a model's faults to the caller."""

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
    sound = (speechlike(rate, 1.1, 3)[:samples, 0] * 32767).astype("<i2")
    done = denoise(model(constant_mask()), rate, sound.tobytes())
    assert (done.returncode, len(done.stdout)) == (0, 2 * samples), done.stderr
    if rate == 16000:  # the identity, late by one hop
        out = np.frombuffer(done.stdout, "<i2").astype(int)
        assert np.all(np.abs(out[160:] - sound[:-160])[:-400] <= 1)


@pytest.mark.parametrize(("rate", "content"), [(22050, None), (16000, b"no model"), (0, None)])
def test_failures_are_told(model, rate, content):
    weight = model(constant_mask())
    if content:
        weight.write_bytes(content)
    done = denoise(weight, rate, bytes(3200))
    assert done.returncode != 0 and done.stderr and not done.stdout

"""morva report in a real browser: every plot is drawn, both sounds load, the console stays silent."""

import json
import re
import shutil
import urllib.parse

import numpy as np
import pytest
import soundfile

from conftest import SOURCE, constant_mask, loudness_voice, noise_level, speechlike
from morva_training.measures import noise_in_pauses, pauses_of_scores

BROWSER, DRIVER = shutil.which("chromium"), shutil.which("chromedriver")

# What is to be seen: of each visible plot the number of colours; how long the player plays.
SEEN = """
const plots = [...document.querySelectorAll("canvas")].filter((canvas) => canvas.clientWidth > 0);
const colours = (canvas) => {
  const { data } = canvas.getContext("2d").getImageData(0, 0, canvas.width, canvas.height);
  return new Set(new Uint32Array(data.buffer)).size;
};
return {
  ink: Object.fromEntries(plots.map((canvas) => [canvas.id, colours(canvas)])),
  seconds: Number(document.getElementById("position").max),
  drawn: document.body.dataset.drawn,
  text: document.body.innerText,
};
"""


@pytest.fixture(scope="module")
def look():
    """Opens a page and tells what is seen and heard."""
    if not (BROWSER and DRIVER):
        pytest.skip("chromium is not installed")
    from selenium import webdriver

    options = webdriver.ChromeOptions()
    options.binary_location = BROWSER
    flags = ["headless", "no-sandbox", "disable-gpu", "disable-dev-shm-usage", "disable-background-networking"]
    for flag in [*flags, "window-size=1100,1300"]:
        options.add_argument("--" + flag)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
    driver = webdriver.Chrome(service=webdriver.chrome.service.Service(DRIVER), options=options)

    def run(page):
        driver.get("file://" + urllib.parse.quote(str(page)))
        seen = driver.execute_script(SEEN)
        assert driver.get_log("browser") == [] and seen["drawn"] == "yes"
        return seen | {"title": driver.title}

    yield run
    driver.quit()


def test_all_plots_are_drawn_and_the_sound_plays(look, morva, model, recording, tmp_path):
    sound = speechlike(48000, 3.0, seed=5)[:, 0]
    sound[:24000] = 0
    source = recording(sound, 48000, 'a <b> & "c" <!--<script> äö.wav')
    others = ["--vad-model", model(loudness_voice(), "v.mvw"), "--level-model", model(noise_level(), "l.mvw")]
    page, options = tmp_path / "page.html", ["--model", model(constant_mask(0)), "--max-seconds", 2]
    morva("report", source, page, *options, *others)
    assert not re.search(r"""(?:src|href)=["'](?!data:)|https?:""", page.read_text())
    seen = look(page)
    assert set(seen["ink"]) == {"wave-before", "wave-after", "spectrum-before", "spectrum-after", "score", "level"}
    assert min(seen["ink"].values()) > 1
    # The mask is 0: what is left is black, the sound before is not.
    before, after = seen["ink"]["spectrum-before"], seen["ink"]["spectrum-after"]
    assert before > 50 and after < before / 2
    assert seen["seconds"] == pytest.approx(2.0)
    assert seen["title"] == source.name
    assert source.name in seen["text"] and "Noise in pauses" in seen["text"]


def test_noise_in_pauses_reads_the_same_as_in_the_demo(look, morva, tmp_path):
    noisy, cleaned, scores = SOURCE / "examples/audio/noisy.flac", tmp_path / "cleaned.wav", tmp_path / "scores.csv"
    morva("denoise", noisy, "-o", cleaned)
    morva("vad", noisy, "--format", "csv", "-o", scores)
    morva("report", noisy, tmp_path / "page.html")
    pauses = pauses_of_scores(np.loadtxt(scores, delimiter=",", skiprows=1, usecols=1))
    before, after = noise_in_pauses(soundfile.read(noisy)[0], soundfile.read(cleaned)[0], pauses, 48000)
    assert f"\n{before - after:.0f} dB quieter" in look(tmp_path / "page.html")["text"]


@pytest.mark.parametrize("samples", [0, 1, 100, 22050])
def test_a_page_of_little_sound_without_voice_and_level_models(look, morva, model, recording, tmp_path, samples):
    source, page = recording(np.full((samples, 2), 0.5), 22050), tmp_path / "page.html"
    said = morva("report", source, page, "--model", model(constant_mask()), "--models", tmp_path).stderr
    seen = look(page)
    for text in ("Voice score left out", "Noise level left out", "averaged"):
        assert text in said and text in seen["text"]
    assert set(seen["ink"]) == {"wave-before", "wave-after", "spectrum-before", "spectrum-after"}


def data_of(page):
    return json.loads(re.search(r'<script type="application/json"[^>]*>(.*?)</script>', page.read_text(), re.DOTALL)[1])


def test_one_model_for_two_purposes_and_two_of_one_name(morva, model, recording, tmp_path):
    (tmp_path / "other").mkdir()
    level, namesake = model(noise_level(), "level.mvw"), model(noise_level(1), "other/level.mvw")
    source, page = recording(speechlike(16000, 0.5, seed=1), 16000), tmp_path / "page.html"
    for other, heard in [(level, True), (namesake, False)]:
        morva("report", source, page, "--model", level, "--level-model", other, "--models", tmp_path)
        assert (data_of(page)["levels"][-1] > -60) is heard

"""morva report in a real browser: every plot is drawn, both sounds play, the console stays silent."""

import base64
import io
import json
import re
import shutil
import urllib.parse

import numpy as np
import pytest
import soundfile

from conftest import speechlike
from weights import constant_mask, loudness_voice, noise_level

BROWSER, DRIVER = shutil.which("chromium"), shutil.which("chromedriver")
needs_browser = pytest.mark.skipif(not (BROWSER and DRIVER), reason="chromium is not installed")

# Share of a canvas's columns in which something is drawn, and the number of colours.
INKED = """
const canvas = document.getElementById(arguments[0]);
const pixels = canvas.getContext("2d").getImageData(0, 0, canvas.width, canvas.height).data;
const colours = new Set(), columns = new Set();
for (let at = 0; at < pixels.length; at += 4) {
  if (pixels[at + 3] === 0) continue;
  columns.add(at / 4 % canvas.width);
  colours.add(pixels.slice(at, at + 3).join());
}
return [columns.size / canvas.width, colours.size];
"""
PLAY = """
const [name, done] = arguments, audio = document.getElementById(name);
audio.addEventListener("timeupdate", () => audio.currentTime > 0 && done([audio.duration, audio.error]));
audio.muted = true;
audio.play().catch((error) => done(String(error)));
"""


@pytest.fixture(scope="module")
def browser():
    from selenium import webdriver
    from selenium.webdriver.chrome.service import Service

    options = webdriver.ChromeOptions()
    options.binary_location = BROWSER
    flags = ["headless", "no-sandbox", "disable-gpu", "disable-dev-shm-usage", "disable-background-networking"]
    for flag in [*flags, "window-size=1100,1300", "autoplay-policy=no-user-gesture-required"]:
        options.add_argument("--" + flag)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
    driver = webdriver.Chrome(service=Service(DRIVER), options=options)
    yield driver
    driver.quit()


@pytest.fixture
def opened(browser, tmp_path):
    def get():
        browser.get("file://" + urllib.parse.quote(str(tmp_path / "page.html")))
        assert browser.find_element("tag name", "body").get_attribute("data-drawn") == "yes"
        return browser

    yield get
    assert browser.get_log("browser") == []


def text_of(browser, name):
    return browser.execute_script("return document.getElementById(arguments[0]).textContent", name)


@needs_browser
def test_all_plots_are_drawn_and_both_sounds_play(opened, morva, model, recording, tmp_path):
    sound = speechlike(48000, 2.0, seed=5)[:, 0]
    sound[:24000] = 0
    source = recording(sound, 48000, 'a <b> & "c" </script> äö.wav')
    others = ["--vad-model", model(loudness_voice(), "v.mvw"), "--level-model", model(noise_level(), "l.mvw")]
    morva("report", source, tmp_path / "page.html", "--model", model(constant_mask(mask=0)), *others)
    browser = opened()
    inked = {}
    for name in ("wave-before", "wave-after", "spectrum-before", "spectrum-after", "score", "level"):
        inked[name] = share, colours = browser.execute_script(INKED, name)
        assert share > 0.9, f"{name} is drawn over {share:.0%} of its width"
        assert colours > (50 if name == "spectrum-before" else 1), name
    # The mask is 0: what is left is black, the sound before is not.
    assert inked["spectrum-after"][1] < inked["spectrum-before"][1] / 2
    for name in ("before", "after"):
        duration, error = browser.execute_async_script(PLAY, name)
        assert (round(duration, 2), error) == (2.0, None)
    assert text_of(browser, "title") == browser.title == source.name
    assert "Noise reduction" in text_of(browser, "summary")
    browser.set_window_size(600, 900)  # drawn anew for a narrow window
    browser.set_window_size(1100, 1300)


@needs_browser
@pytest.mark.parametrize("samples", [0, 1, 100, 22050])
def test_a_page_of_little_sound_without_voice_and_level_models(opened, morva, model, recording, tmp_path, samples):
    source = recording(np.full((samples, 2), 0.5), 22050)
    options = ("--model", model(constant_mask()), "--models", tmp_path)
    done = morva("report", source, tmp_path / "page.html", *options)
    browser = opened()
    for text in ("Voice score left out", "Noise level left out", "averaged"):
        assert text in done.stderr and text in text_of(browser, "notes")
    for name, shown in [("voice", False), ("noise", False), ("wave-after", True)]:
        assert browser.find_element("id", name).is_displayed() is shown


def data_of(page):
    return json.loads(re.search(r'<script type="application/json"[^>]*>(.*?)</script>', page.read_text(), re.DOTALL)[1])


def test_the_page_is_self_contained_and_holds_the_first_seconds(morva, model, recording, tmp_path):
    sound = speechlike(16000, 1.5, seed=1)[:, 0]
    options = ("--model", model(constant_mask()), "--models", tmp_path, "--max-seconds", 1)
    done = morva("report", recording(sound, 16000, subtype="FLOAT"), tmp_path / "page.html", *options)
    assert "Only the first 1 s are shown" in done.stderr
    page = (tmp_path / "page.html").read_text()
    assert not re.search(r"""(?:src|href)=["'](?!data:)""", page)
    assert "http" not in page.replace("http-equiv", "")
    data = data_of(tmp_path / "page.html")
    for name in ("before", "after"):
        samples, rate = soundfile.read(io.BytesIO(base64.b64decode(data[name])))
        assert rate == 16000
        assert np.abs(samples - sound[:16000])[:-400].max() <= 2**-16 + 2**-18, name


def test_one_model_for_two_purposes_and_two_of_one_name(morva, model, recording, tmp_path):
    (tmp_path / "other").mkdir()
    level, namesake = model(noise_level(), "level.mvw"), model(noise_level(1), "other/level.mvw")
    source, page = recording(speechlike(16000, 0.5, seed=1), 16000), tmp_path / "page.html"
    for other, heard in [(level, True), (namesake, False)]:
        morva("report", source, page, "--model", level, "--level-model", other, "--models", tmp_path)
        assert (data_of(page)["levels"][-1] > -60) is heard

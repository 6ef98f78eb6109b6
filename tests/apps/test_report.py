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

from conftest import constant_mask, loudness_voice, noise_level, speechlike

BROWSER, DRIVER = shutil.which("chromium"), shutil.which("chromedriver")

# What is to be seen and heard: of each visible plot the share of columns in which something is drawn and the colours.
SEEN = """
const ink = {}, done = arguments[0];
for (const canvas of document.querySelectorAll("canvas")) {
  if (canvas.clientWidth === 0) continue;
  const pixels = canvas.getContext("2d").getImageData(0, 0, canvas.width, canvas.height).data;
  const colours = new Set(), columns = new Set();
  for (let at = 0; at < pixels.length; at += 4) {
    if (pixels[at + 3] === 0) continue;
    columns.add(at / 4 % canvas.width);
    colours.add(pixels.slice(at, at + 3).join());
  }
  ink[canvas.id] = [columns.size / canvas.width, colours.size];
}
const lengths = [...document.querySelectorAll("audio")].map((audio) => new Promise((played, fails) => {
  if (!(audio.duration > 1)) return played(0);
  audio.addEventListener("timeupdate", () => audio.currentTime > 0 && played(audio.duration));
  audio.muted = true;
  audio.play().catch(fails);
}));
const drawn = document.body.dataset.drawn;
Promise.all(lengths).then((seconds) => done({ ink, seconds, drawn, text: document.body.innerText }), (e) => done(`${e}`));
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
    for flag in [*flags, "window-size=1100,1300", "autoplay-policy=no-user-gesture-required"]:
        options.add_argument("--" + flag)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
    driver = webdriver.Chrome(service=webdriver.chrome.service.Service(DRIVER), options=options)

    def run(page):
        driver.get("file://" + urllib.parse.quote(str(page)))
        seen = driver.execute_async_script(SEEN)
        driver.set_window_size(600, 900)  # drawn anew for a narrow window
        driver.set_window_size(1100, 1300)
        assert driver.get_log("browser") == [] and seen["drawn"] == "yes"
        return seen | {"title": driver.title}

    yield run
    driver.quit()


def test_all_plots_are_drawn_and_both_sounds_play(look, morva, model, recording, tmp_path):
    sound = speechlike(48000, 2.0, seed=5)[:, 0]
    sound[:24000] = 0
    source = recording(sound, 48000, 'a <b> & "c" <!--<script> äö.wav')
    others = ["--vad-model", model(loudness_voice(), "v.mvw"), "--level-model", model(noise_level(), "l.mvw")]
    morva("report", source, tmp_path / "page.html", "--model", model(constant_mask(0)), *others)
    seen = look(tmp_path / "page.html")
    assert set(seen["ink"]) == {"wave-before", "wave-after", "spectrum-before", "spectrum-after", "score", "level"}
    assert min(share for share, _ in seen["ink"].values()) > 0.9
    # The mask is 0: what is left is black, the sound before is not.
    before, after = seen["ink"]["spectrum-before"][1], seen["ink"]["spectrum-after"][1]
    assert before > 50 and after < before / 2
    assert seen["seconds"] == pytest.approx([2.0, 2.0])
    assert seen["title"] == source.name
    assert source.name in seen["text"] and "Noise reduction" in seen["text"]


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


def test_the_page_is_self_contained_and_holds_the_first_seconds(morva, model, recording, tmp_path):
    sound, page = speechlike(16000, 1.5, seed=1)[:, 0], tmp_path / "page.html"
    options = ("--model", model(constant_mask()), "--models", tmp_path, "--max-seconds", 1)
    done = morva("report", recording(sound, 16000, subtype="FLOAT"), page, *options)
    assert "Only the first 1 s are shown" in done.stderr
    assert not re.search(r"""(?:src|href)=["'](?!data:)|https?:""", page.read_text())
    for name in ("before", "after"):
        samples, rate = soundfile.read(io.BytesIO(base64.b64decode(data_of(page)[name])))
        assert rate == 16000
        assert np.abs(samples - sound[:16000])[:-400].max() <= 2**-16 + 2**-18, name


def test_one_model_for_two_purposes_and_two_of_one_name(morva, model, recording, tmp_path):
    (tmp_path / "other").mkdir()
    level, namesake = model(noise_level(), "level.mvw"), model(noise_level(1), "other/level.mvw")
    source, page = recording(speechlike(16000, 0.5, seed=1), 16000), tmp_path / "page.html"
    for other, heard in [(level, True), (namesake, False)]:
        morva("report", source, page, "--model", level, "--level-model", other, "--models", tmp_path)
        assert (data_of(page)["levels"][-1] > -60) is heard

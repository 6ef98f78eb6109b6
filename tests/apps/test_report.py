"""morva report in a real browser: every plot is drawn, both sounds play, the console stays silent."""

import shutil
import urllib.parse

import numpy as np
import pytest
import soundfile

from conftest import speechlike
from weights import constant_mask, loudness_voice

BROWSER, DRIVER = shutil.which("chromium"), shutil.which("chromedriver")
needs_browser = pytest.mark.skipif(not (BROWSER and DRIVER), reason="chromium is not installed")

# Share of a canvas's columns in which something else than its background is drawn.
INKED = """
const canvas = document.getElementById(arguments[0]);
const copy = Object.assign(document.createElement("canvas"), { width: canvas.width, height: canvas.height });
const pen = copy.getContext("2d", { willReadFrequently: true });
pen.drawImage(canvas, 0, 0);
const pixels = pen.getImageData(0, 0, canvas.width, canvas.height).data;
const colours = new Set();
let inked = 0;
for (let x = 0; x < canvas.width; ++x) {
  let drawn = false;
  for (let y = 0; y < canvas.height; ++y) {
    const at = 4 * (y * canvas.width + x);
    if (pixels[at + 3] > 0) { drawn = true; colours.add(pixels.slice(at, at + 3).join()); }
  }
  inked += drawn;
}
return [inked / canvas.width, colours.size];
"""


@pytest.fixture(scope="module")
def browser(tmp_path_factory):
    from selenium import webdriver
    from selenium.webdriver.chrome.options import Options
    from selenium.webdriver.chrome.service import Service

    options = Options()
    options.binary_location = BROWSER
    profile = tmp_path_factory.mktemp("profile")
    for flag in (
        "headless",
        "no-sandbox",
        "disable-gpu",
        "disable-quic",
        "no-first-run",
        "disable-dev-shm-usage",
        "disable-background-networking",
        "disable-component-update",
        "disable-sync",
        "window-size=1100,1300",
        "autoplay-policy=no-user-gesture-required",
        f"user-data-dir={profile}",
    ):
        options.add_argument("--" + flag)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
    driver = webdriver.Chrome(service=Service(DRIVER), options=options)
    yield driver
    driver.quit()


def opened(browser, page):
    browser.get("file://" + urllib.parse.quote(str(page)))
    assert browser.find_element("tag name", "body").get_attribute("data-drawn") == "yes"
    assert browser.get_log("browser") == []
    return browser


def text_of(browser, name):
    return browser.execute_script("return document.getElementById(arguments[0]).textContent", name)


def plays(browser, name):
    return browser.execute_async_script(
        """
        const [name, done] = arguments, audio = document.getElementById(name);
        audio.addEventListener("timeupdate", () => audio.currentTime > 0 && done([audio.duration, audio.error]));
        audio.muted = true;
        audio.play().catch((error) => done(String(error)));""",
        name,
    )


@pytest.fixture
def full_page(morva, model, recording, tmp_path):
    sound = speechlike(48000, 2.0, seed=5)[:, 0]
    sound[: 48000 // 2] = 0
    source = recording(sound, 48000, 'a <b> & "c" </script> äö.wav')
    morva(
        "report",
        source,
        tmp_path / "page.html",
        "--model",
        model(constant_mask(16000, 20, 0.0)),
        "--vad-model",
        model(loudness_voice(), "voice.mvw"),
        "--level-model",
        model(constant_mask(16000, 20, 0.0, "0.0.5"), "level.mvw"),
    )
    return tmp_path / "page.html", source


@needs_browser
def test_all_plots_are_drawn_and_both_sounds_play(browser, full_page):
    page, source = full_page
    opened(browser, page)
    for name in ("wave-before", "wave-after", "spectrum-before", "spectrum-after", "score", "level"):
        share, colours = browser.execute_script(INKED, name)
        assert share > 0.9, f"{name} is drawn over {share:.0%} of its width"
        assert colours > (50 if name == "spectrum-before" else 1), name
    # The mask is 0: what is left is black, the sound before is not.
    assert browser.execute_script(INKED, "spectrum-after")[1] < browser.execute_script(INKED, "spectrum-before")[1] / 2
    for name in ("before", "after"):
        duration, error = plays(browser, name)
        assert (round(duration, 2), error) == (2.0, None)
    assert text_of(browser, "title") == source.name
    assert "Noise reduction" in text_of(browser, "summary")
    assert browser.get_log("browser") == []
    browser.set_window_size(600, 900)  # drawn anew for a narrow window
    browser.set_window_size(1100, 1300)
    assert browser.get_log("browser") == []


@needs_browser
def test_a_page_without_voice_and_level_models(browser, morva, model, recording, tmp_path):
    source = recording(speechlike(22050, 1.0, seed=5, channels=2), 22050)
    done = morva("report", source, tmp_path / "page.html", "--model", model(constant_mask(16000)), "--models", tmp_path)
    assert "Voice score left out" in done.stderr and "Noise level left out" in done.stderr
    opened(browser, tmp_path / "page.html")
    assert "Voice score left out" in text_of(browser, "notes")
    assert "averaged" in text_of(browser, "notes")
    for name, shown in [("voice", False), ("noise", False), ("wave-after", True)]:
        assert browser.find_element("id", name).is_displayed() is shown


@needs_browser
@pytest.mark.parametrize("samples", [0, 1, 100])
def test_hardly_any_sound(browser, morva, model, recording, tmp_path, samples):
    source = recording(np.full(samples, 0.5), 8000)
    morva("report", source, tmp_path / "page.html", "--model", model(constant_mask(8000)), "--models", tmp_path)
    opened(browser, tmp_path / "page.html")


def test_the_page_is_self_contained_and_holds_the_sound(morva, model, recording, tmp_path):
    import base64
    import io
    import json
    import re

    sound = speechlike(16000, 0.5, seed=1)[:, 0]
    morva(
        "report",
        recording(sound, 16000),
        tmp_path / "page.html",
        "--model",
        model(constant_mask(16000)),
        "--models",
        tmp_path,
    )
    page = (tmp_path / "page.html").read_text()
    assert not re.search(r"""(?:src|href)=["'](?!data:)""", page)
    assert "http" not in re.sub(r"http-equiv", "", page)
    data = json.loads(re.search(r'<script type="application/json"[^>]*>(.*?)</script>', page, re.DOTALL)[1])
    for name in ("before", "after"):
        samples, rate = soundfile.read(io.BytesIO(base64.b64decode(data[name])))
        assert rate == 16000
        assert np.abs(samples - sound).max() < 2 / 32768, name


def test_only_the_first_seconds_of_a_long_file(morva, model, recording, tmp_path):
    source = recording(np.zeros(16000 * 3), 16000)
    done = morva(
        "report",
        source,
        tmp_path / "p.html",
        "--model",
        model(constant_mask(16000)),
        "--max-seconds",
        1,
        "--models",
        tmp_path,
    )
    assert "first 1 s" in done.stderr


@pytest.mark.parametrize(
    ("arguments", "text"),
    [
        (["in.wav", "in.wav"], "is the input"),
        (["in.wav", "no/page.html"], "cannot be written"),
        (["none.wav", "p.html"], "no such file"),
        (["in.wav", "p.html", "--vad-model", "none.mvw"], "none.mvw"),
    ],
)
def test_errors(morva, model, recording, tmp_path, arguments, text):
    recording(np.zeros(1600), 16000)
    done = morva("report", *arguments, "--model", model(constant_mask(16000)), cwd=tmp_path, fails=True)
    assert text in done.stderr


def test_one_model_in_two_roles(morva, model, recording, tmp_path):
    """The same file as cleaner and as level model, and two files of one name."""
    source = recording(speechlike(16000, 0.5, seed=1), 16000)
    level = model(constant_mask(16000, 20, 0.0, "0.0.5"), "level.mvw")
    (tmp_path / "other").mkdir()
    namesake = model(constant_mask(16000, 30, 0.0, "0.0.5"), "other/level.mvw")
    for role in (level, namesake):
        done = morva("report", source, tmp_path / "p.html", "--model", level, "--level-model", role, "--models", tmp_path)
        assert "Noise level" not in done.stderr
        assert "Median noise level" in (tmp_path / "p.html").read_text()

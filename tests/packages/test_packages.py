"""What scripts/package made, used as people outside of the project use it: each cleans a recording as MORVA_COMMAND
(build/release/morva) does. What was not made, and targets that nothing runs here (scripts/run_on), are skipped.
"""

import json
import os
import platform
import re
import shutil
import subprocess
import sys
import tarfile
import tempfile
import zipfile
from pathlib import Path

import numpy as np
import pytest
import soundfile

ROOT = Path(__file__).resolve().parents[2]
PACKAGES = ROOT / "build/packages"
HOST = f"{sys.platform}-{'arm64' if platform.machine() in ('aarch64', 'arm64') else 'x64'}"
WHEELS = {"linux-x64": "manylinux_2_28_x86_64", "linux-arm64": "manylinux_2_28_aarch64", "win32-x64": "win_amd64"}
WHEELS |= {"darwin-x64": "macosx_11_0_x86_64", "darwin-arm64": "macosx_11_0_arm64"}
SYSTEM_LIBRARIES = r"(?i)(kernel32|ntdll|ucrtbase|msvcrt|bcrypt|advapi32|api-ms-win-[a-z0-9-]+)\.dll"
COMMAND = Path(os.environ.get("MORVA_COMMAND", ROOT / "build/release/morva"))
targets = pytest.mark.parametrize("target", dict.fromkeys((HOST, "linux-arm64", "win32-x64")))


def run(*command, **environment):
    with tempfile.TemporaryFile("w+") as said:  # the script runtime dislikes Wine's pipes
        done = subprocess.run([*map(str, command)], stdout=said, stderr=said, env=os.environ | environment)
        said.seek(0)
        text = said.read()
    assert done.returncode == 0, text
    return text


def package(*patterns):
    found = [file for pattern in filter(None, patterns) for file in PACKAGES.glob(pattern)]
    return found[0] if found else pytest.skip(f"no {patterns[0]} was made")


def runner(target, program):
    """The command that runs a program of a target; "node" and "python" are the target's own."""
    if target == HOST:
        return [{"node": "node", "python": sys.executable}.get(program, program)]
    if (target, program) == ("win32-x64", "python") or not (ROOT / ".deps/runtimes" / target).exists():
        pytest.skip(f"nothing runs {program} of {target} here")
    return [ROOT / "scripts/run_on", target, program]


@pytest.fixture(scope="module")
def recording(tmp_path_factory):
    """A noisy recording, and what the command makes of it; machines without it bring the result along. At the full
    model's rate no delay is a part of a sample."""
    noisy, clean = tmp_path_factory.mktemp("sound") / "noisy.wav", PACKAGES / "clean.wav"
    soundfile.write(noisy, soundfile.read(ROOT / "examples/audio/noisy.flac", 144000)[0], 48000, subtype="PCM_16")
    if COMMAND.exists():
        run(COMMAND, "denoise", "-q", noisy, clean)
    return noisy, soundfile.read(clean)[0]


def assert_same(path, wanted):
    np.testing.assert_allclose(soundfile.read(path)[0], wanted, rtol=0, atol=1e-4)


def assert_licences(names):
    licences = {Path(name).name for name in names if Path(name).name.startswith("LICENSE")}
    assert {"LICENSE", "LICENSE.Highway.txt", "LICENSE.DUCC.txt"} <= licences and not [
        each for each in licences if "MKL" in each
    ]


@targets
def test_npm(target, recording, tmp_path):
    tarball = package("quorral_valto-*.tgz")
    with tarfile.open(tarball) as archive:
        sizes = {member.name: member.size for member in archive.getmembers()}
        assert "scripts" not in json.load(archive.extractfile("package/package.json"))
    modules = {name for name in sizes if name.endswith(".node")}
    own = f"package/prebuilds/quorral_valto.{target}.node"
    if own not in modules:
        pytest.skip(f"made without {target}")
    assert sum(size for name, size in sizes.items() if name not in modules - {own}) < 10_000_000
    assert_licences(sizes)
    node = runner(target, "node")
    (tmp_path / "package.json").write_text("{}")
    options = ["--prefix", tmp_path, "--ignore-scripts", "--offline", "--no-audit", "--no-fund"]
    run(shutil.which("npm"), "install", *options, tarball)
    example = shutil.copy(ROOT / "examples/node/denoise.mjs", tmp_path)
    run(*node, example, recording[0], tmp_path / "clean.wav")
    assert_same(tmp_path / "clean.wav", recording[1])


@targets
def test_wheel(target, recording, tmp_path):
    wheel = package(f"morva-*-{WHEELS[target]}.whl", "morva-*-linux_x86_64.whl" if target == HOST else "")
    names = zipfile.ZipFile(wheel).namelist()
    assert_licences(names)
    foreign = ["--only-binary=:all:", "--python-version=3.11", f"--platform={WHEELS[target]}"]
    foreign += [f"--platform={WHEELS[target].replace('_2_28', '2014')}"]
    options = ["--no-deps"] if target == HOST else foreign
    run(sys.executable, "-m", "pip", "install", "--target", tmp_path, *options, wheel)
    if target == "win32-x64" and shutil.which("objdump"):
        imported = re.findall(r"DLL Name: (.*)", run("objdump", "-p", tmp_path / "morva/_bundled/morva.dll"))
        assert imported and all(re.fullmatch(SYSTEM_LIBRARIES, each) for each in imported), imported
    if "manylinux" in wheel.name:
        audit = run(sys.executable, "-m", "auditwheel", "show", wheel)
        assert int(re.search(r'platform tag:\s+"manylinux_2_(\d+)_', audit)[1]) <= 28, audit
    call = "import sys, morva; morva.denoise_file(*sys.argv[1:])"
    run(*runner(target, "python"), "-c", call, recording[0], tmp_path / "clean.wav", PYTHONPATH=str(tmp_path))
    assert_same(tmp_path / "clean.wav", recording[1])


@pytest.fixture
def prefix(target, tmp_path):
    archive = package(f"morva-*-{target}.zip" if target == "win32-x64" else f"morva-*-{target}.tar.gz")
    shutil.unpack_archive(archive, tmp_path)
    return next(tmp_path.iterdir())


@targets
def test_archive(target, prefix, recording, tmp_path):
    assert_licences(prefix.rglob("LICENSE*"))
    suffix = ".exe" if target == "win32-x64" else ""
    program = runner(target, prefix / f"bin/morva{suffix}")
    cross = [f"-DCMAKE_TOOLCHAIN_FILE={ROOT / 'cmake/cross.cmake'}", f"-DMORVA_TARGET={target}"]
    cross, compiler = ([], "cc") if target == HOST else (cross, ROOT / f".deps/cross/{target}/tools/clang")
    config = f"-Dmorva_DIR={prefix / 'lib/cmake/morva'}"
    run("cmake", "-S", ROOT / "examples/cmake", "-B", tmp_path / "build", "-G", "Ninja", config, *cross)
    run("cmake", "--build", tmp_path / "build")
    places = {"WINEPATH": str(prefix / "bin")}
    assert "hiss lowered" in run(*runner(target, tmp_path / f"build/hush{suffix}"), **places)

    packages = {"PKG_CONFIG_LIBDIR": str(prefix / "lib/pkgconfig")}
    flags = run("pkg-config", "--cflags", "--libs", "morva", **packages).split()
    version = run("pkg-config", "--modversion", "morva", **packages)
    source = tmp_path / "version.c"
    source.write_text(
        '#include <stdio.h>\n#include "morva-ext.h"\nint main(void) { return puts(MorvaExt_Version()) < 0; }\n'
    )
    run(compiler, source, "-o", tmp_path / f"version{suffix}", *flags, f"-Wl,-rpath,{prefix / 'lib'}")
    assert run(*runner(target, tmp_path / f"version{suffix}"), **places) == version

    drive = "Z:" if target == "win32-x64" != HOST else ""  # a slash begins an option
    files = [f"{drive}{each}" for each in (recording[0], tmp_path / "clean.wav")]
    run(*program, "denoise", "-q", *files)
    assert_same(tmp_path / "clean.wav", recording[1])


@pytest.mark.parametrize("target", ["linux-x64"])
def test_every_command_and_option_stands_in_the_man_page_and_is_completed(prefix):
    page = (prefix / "share/man/man1/morva.1").read_text().replace("\\-", "-")
    completion = prefix / "share/bash-completion/completions/morva"
    run("bash", "-n", completion)
    told = run(prefix / "bin/morva", "--help").partition("Subcommands")[2]
    commands = re.findall(r"^ +([a-z]+) ", told, re.M)
    assert commands
    for command in commands:
        assert f".B {command}\n" in page
        options = re.findall(r"^ .*(--[a-z-]+)", run(prefix / "bin/morva", command, "--help"), re.M)
        assert not [each for each in (command, *options) if each not in page or each not in completion.read_text()]


def test_debian_package_is_clean_and_its_plugins_work(tmp_path):
    deb = package("morva_*.deb")
    run("lintian", "--allow-root", "--fail-on", "error,warning", deb)
    run("dpkg-deb", "-x", deb, tmp_path)
    assert re.search(r"libgstreamer1\.0-0.*libsndfile1", run("dpkg-deb", "-f", deb, "Depends"))
    assert "[libmorva.so.1]" in run("readelf", "-d", tmp_path / "usr/lib/libmorva.so")
    usr, sounds = tmp_path / "usr", [tmp_path / name for name in ("in.wav", "ladspa.wav", "lv2.wav", "gst.f32")]
    run("sox", ROOT / "examples/audio/noisy.flac", sounds[0], "trim", "0", "1")
    plugin = ["ladspa", "-l", "libmorva_ladspa", "morva_mono", "100", "0"]
    run("sox", *sounds[:2], *plugin, LADSPA_PATH=str(usr / "lib/ladspa"))
    run("lv2apply", "-i", sounds[0], "-o", sounds[2], "urn:morva:mono", LV2_PATH=str(usr / "lib/lv2"))
    elements = f"audiotestsrc num-buffers=9 ! audioconvert ! morvadenoise ! filesink location={sounds[3]}"
    folders = {
        "GST_PLUGIN_PATH": str(next(usr.glob("lib/*/gstreamer-1.0"))),
        "GST_REGISTRY": str(tmp_path / "registry"),
    }
    run("gst-launch-1.0", "-q", *elements.split(), **folders)
    assert min(each.stat().st_size for each in sounds) > 30000

#!/usr/bin/env bash
# usage: install_test.sh BUILD_DIR SOURCE_DIR - installs into an empty folder and uses what lies there as
# people outside the project do: CMake package, pkg-config, command line, man page, completion.
set -euo pipefail
build=$1 source=$2
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
fail() { printf 'FAILED: %s\n' "$*" >&2 && exit 1; }

cmake --install "$build" --prefix "$work/first" >/dev/null
mv "$work/first" "$work/moved" # nothing may depend on the place
prefix=$work/moved
readelf -d "$prefix"/lib*/libmorva.so | grep -q 'SONAME.*libmorva\.so\.1\]' || fail "SONAME"

echo "-- find_package"
cmake -S "$source/examples/cmake" -B "$work/user" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" >"$work/log" ||
    fail "$(cat "$work/log")"
cmake --build "$work/user" >"$work/log" || fail "$(cat "$work/log")"
"$work/user/hush" | tee "$work/said" | grep 'hiss lowered' || fail "$(cat "$work/said")"
lowered=$(sed -n 's/.*lowered by \([0-9.]*\) dB.*/\1/p' "$work/said")
# What lies above the model's band is lost beyond the limit of 20 dB.
awk "BEGIN { exit !($lowered > 6 && $lowered < 23) }" || fail "lowered by $lowered dB with a limit of 20"

echo "-- pkg-config"
PKG_CONFIG_PATH=$(echo "$prefix"/lib*/pkgconfig)
export PKG_CONFIG_PATH
# shellcheck disable=SC2046
cc -std=c11 -D_POSIX_C_SOURCE=200809L "$source/examples/c/denoise.c" -o "$work/denoise" \
    $(pkg-config --cflags --libs morva)
models=$(pkg-config --variable=modelsdir morva)
clean() { LD_LIBRARY_PATH=$(echo "$prefix"/lib*) "$work/denoise" "$models/c6.xs.f.ca03f4.mvw" "$1"; }
for size in 0 2 96002; do # no whole number of frames
    [ "$(head -c $size /dev/urandom | clean 48000 2>"$work/log" | wc -c)" = $size ] || fail "C example: $(cat "$work/log")"
done
! clean 22050 </dev/null 2>"$work/log" || fail "the C example takes any rate"

echo "-- command line"
"$prefix/bin/morva" --version | grep -qx "$(pkg-config --modversion morva)" || fail "versions differ"
"$prefix/bin/morva" denoise -q "$source/examples/audio/noisy.flac" "$work/clean.wav" # finds its models

# Every option that the program has stands in the man page and is completed, and no other.
# shellcheck source=/dev/null
source "$prefix/share/bash-completion/completions/morva"
completed() { # words of the command line; the last one is being completed
    COMP_WORDS=("$@") COMP_CWORD=$(($# - 1)) COMPREPLY=()
    _morva
    printf '%s\n' "${COMPREPLY[@]}" | sort
}
page=$(sed 's/\\-/-/g' "$prefix/share/man/man1/morva.1")
commands=$("$prefix/bin/morva" --help | sed -n '/^Subcommands/,$s/^  \([a-z]*\) .*/\1/p')
[ "$(completed morva '' | grep -v '^-')" = "$(sort <<<"$commands")" ] || fail "completion of commands"
for command in $commands; do
    options=$("$prefix/bin/morva" "$command" --help | grep -oE '^ .*--[a-z-]+' | grep -oE -- '--[a-z-]+' | sort)
    [ "$(completed morva "$command" --)" = "$options" ] || fail "completion of $command: $options"
    for option in $options; do
        grep -qF -- "$option" <<<"$page" || fail "the man page lacks $option"
    done
    grep -qx ".B $command" <<<"$page" || fail "the man page lacks $command"
done
if command -v man >/dev/null; then
    warnings=$(MANWIDTH=80 man --warnings -E UTF-8 -l -Tutf8 -Z "$prefix/share/man/man1/morva.1" 2>&1 >/dev/null)
    [ -z "$warnings" ] || fail "man page: $warnings"
fi
echo "installed, moved and used"

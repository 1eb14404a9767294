#!/usr/bin/env bash
# Builds the plugin and the command-line tool, then shows a short session on the
# built-in profiles.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/setup.sh
cmake -S . -B build -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build -j"$(nproc)" --target tintwell_cli >/dev/null

run() {
  printf '\n$ tintwell %s\n' "$*"
  ./build/bin/tintwell "$@"
}
run info srgb
run convert srgb lab 255 255 255  255 0 0  0 128 255
run convert srgb cmyk 255 255 255  255 0 0  40 40 40
run --json convert lab srgb 50 20 -30
run gamut cmyk 50 80 -80
run tags srgb
run tag srgb wtpt
run tag srgb desc

# Profiles made through the plugin, then found again by the search in a colour
# directory of their own.
made=$(mktemp -d)
trap 'rm -rf "$made"' EXIT
run link "$made/srgb-to-cmyk.icc" srgb cmyk --intent 1
run blank "$made/blank.icc"
mkdir -p "$made/icc"
cp "$made/srgb-to-cmyk.icc" "$made/blank.icc" "$made/icc/"
XDG_DATA_HOME=$made run search --class link

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

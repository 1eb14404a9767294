#!/usr/bin/env bash
# Builds the plugin and the command-line tool, then shows a short session.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/setup.sh
cmake -S . -B build -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build -j"$(nproc)" --target tintwell_plugin tintwell_cli >/dev/null
set -x
./build/bin/tintwell list

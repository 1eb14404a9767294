#!/usr/bin/env bash
# Installs every Debian package the project needs. Idempotent and quiet when all is present.
#   scripts/setup.sh            the Linux build, tests, benchmarks and fuzzing
#   scripts/setup.sh --windows  also the MinGW-w64 cross compilers, 32-bit g++ and Wine
set -euo pipefail

packages=(
  build-essential cmake pkg-config
  clang libclang-rt-14-dev           # libFuzzer and the sanitizer runtimes
  liblcms2-dev libffi-dev libpng-dev libjpeg62-turbo-dev libtiff-dev
  libgtest-dev libgmock-dev googletest libbenchmark-dev
  icc-profiles-free colord-data libgs-common argyll
)
case "${1:-}" in
  --windows)
    packages+=(g++-mingw-w64-i686 g++-mingw-w64-x86-64 g++-multilib wine64 binutils-mingw-w64-x86-64) ;;
  "") ;;
  *) echo "usage: $0 [--windows]" >&2; exit 2 ;;
esac

missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed' || missing+=("$p")
done
[ ${#missing[@]} -eq 0 ] && exit 0

echo "setup: installing ${missing[*]}" >&2
export DEBIAN_FRONTEND=noninteractive
apt-get update -qq >/dev/null
apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null

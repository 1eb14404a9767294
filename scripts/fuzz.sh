#!/usr/bin/env bash
# Builds the libFuzzer targets with clang in build-fuzz/ and runs each one, seeded with
# the real profiles on this machine and the saved regressions.
#   scripts/fuzz.sh            5 minutes per target
#   scripts/fuzz.sh --smoke    about 30 seconds in all (CI)
#   scripts/fuzz.sh --time N   N seconds per target
# A crash is copied to fuzz/regressions/<target>-<hash> (replayed by the test suite)
# and the script fails.
set -euo pipefail
cd "$(dirname "$0")/.."

targets=(icc_container_fuzz)
seconds=300
case "${1:-}" in
  --smoke) seconds=$((30 / ${#targets[@]})) ;;
  --time) seconds=${2:?--time needs a number of seconds} ;;
  "") ;;
  *) echo "usage: $0 [--smoke | --time SECONDS]" >&2; exit 2 ;;
esac

cmake -S . -B build-fuzz -DTINTWELL_FUZZ=ON -DCMAKE_CXX_COMPILER=clang++ -DCMAKE_C_COMPILER=clang \
  -DTINTWELL_TESTS=OFF -DTINTWELL_BENCH=OFF -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build build-fuzz -j2 --target "${targets[@]}"

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
mkdir -p "$work/seeds"
n=0
while IFS= read -r -d '' f; do
  cp "$f" "$work/seeds/seed-$n"
  n=$((n + 1))
done < <(find /usr/share/color/icc /usr/share/color/argyll/ref -type f \( -iname '*.icc' -o -iname '*.icm' \) -print0 2>/dev/null)
cp fuzz/regressions/* "$work/seeds/" 2>/dev/null || true

status=0
for t in "${targets[@]}"; do
  corpus="$work/corpus-$t"
  artifacts="$work/artifacts-$t"
  mkdir -p "$corpus" "$artifacts"
  echo "== $t: $seconds s, $n seed profiles"
  if ! ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=halt_on_error=1:print_stacktrace=1 \
      "build-fuzz/bin/$t" "$corpus" "$work/seeds" -max_total_time="$seconds" -max_len=65536 \
      -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 -artifact_prefix="$artifacts/"; then
    status=1
  fi
  for crash in "$artifacts"/*; do
    [ -e "$crash" ] || continue
    name="fuzz/regressions/$t-$(sha1sum "$crash" | cut -c1-12)"
    cp "$crash" "$name"
    echo "saved $name"
    status=1
  done
done
exit $status

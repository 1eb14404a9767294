#!/usr/bin/env bash
# Builds the libFuzzer targets with clang in $FUZZ_BUILD (default build-fuzz/), runs
# each target once over its saved regressions (fuzz/regressions/<target>/), then
# fuzzes it, seeded with those regressions (and, for the container, the real profiles
# on this machine).
#   scripts/fuzz.sh            5 minutes per target
#   scripts/fuzz.sh --smoke    about a minute in all (CI)
#   scripts/fuzz.sh --time N   N seconds per target
# A crash is copied to fuzz/regressions/<target>/crash-<hash> (rename it to say what it
# holds; every later run replays it) and the script fails.
set -euo pipefail
cd "$(dirname "$0")/.."

targets=(icc_container_fuzz tool_input_fuzz transform_fuzz bitmap_fuzz device_link_fuzz tag_codec_fuzz named_color_fuzz lut_fuzz image_profile_fuzz)
build=${FUZZ_BUILD:-build-fuzz}
seconds=300
case "${1:-}" in
  --smoke) seconds=$((50 / ${#targets[@]})) ;;
  --time) seconds=${2:?--time needs a number of seconds} ;;
  "") ;;
  *) echo "usage: $0 [--smoke | --time SECONDS]" >&2; exit 2 ;;
esac

cmake -S . -B "$build" -DTINTWELL_FUZZ=ON -DCMAKE_CXX_COMPILER=clang++ -DCMAKE_C_COMPILER=clang \
  -DTINTWELL_TESTS=OFF -DTINTWELL_BENCH=OFF -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build "$build" -j2 --target "${targets[@]}"

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
mkdir -p "$work/profiles"
n=0
while IFS= read -r -d '' f; do
  cp "$f" "$work/profiles/seed-$n"
  n=$((n + 1))
done < <(find /usr/share/color/icc /usr/share/color/argyll/ref -type f \( -iname '*.icc' -o -iname '*.icm' \) -print0 2>/dev/null)
export ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=halt_on_error=1:print_stacktrace=1

status=0
for t in "${targets[@]}"; do
  corpus="$work/corpus-$t"
  artifacts="$work/artifacts-$t"
  saved="fuzz/regressions/$t"
  mkdir -p "$corpus" "$artifacts"
  seeds=()
  [ -d "$saved" ] && seeds+=("$saved")
  [ "$t" = icc_container_fuzz ] && seeds+=("$work/profiles")
  regressions=()
  [ -d "$saved" ] && mapfile -t regressions < <(find "$saved" -type f | sort)
  echo "== $t: ${#regressions[@]} regressions, then $seconds s"
  # libFuzzer runs files named on its command line once each.
  if [ ${#regressions[@]} -gt 0 ] && ! "$build/bin/$t" "${regressions[@]}" >"$work/replay-$t.log" 2>&1; then
    tail -n 40 "$work/replay-$t.log"
    echo "$t: a saved regression fails" >&2
    status=1
  fi
  if ! "$build/bin/$t" "$corpus" "${seeds[@]}" -max_total_time="$seconds" -max_len=65536 \
      -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 -artifact_prefix="$artifacts/"; then
    status=1
  fi
  for crash in "$artifacts"/*; do
    [ -e "$crash" ] || continue
    mkdir -p "$saved"
    name="$saved/crash-$(sha1sum "$crash" | cut -c1-12)"
    cp "$crash" "$name"
    echo "saved $name"
    status=1
  done
done
exit $status

#!/usr/bin/env bash
# The plugin on its real target: builds tintwell.dll for 32- and 64-bit Windows with
# MinGW-w64 (build-win32/, build-win64/), checks that each exports REALPluginMain alone
# and imports only system DLLs, holds the stand-in Win32 headers against the SDK's, and
# runs one scripted session with the 64-bit DLL under Wine and with the Linux plugin on
# the stand-in layer, whose reports must agree.
#   scripts/windows.sh            all of it (CI)
#   scripts/windows.sh --build    the two DLLs only
# Wine's prefix is kept in build-win64/wineprefix: only the first run pays for it.
set -euo pipefail
cd "$(dirname "$0")/.."

only_build=0
case "${1:-}" in
  --build) only_build=1 ;;
  -h | --help) sed -n '2,9p' "$0" | sed 's/^# \{0,1\}//'; exit 0 ;;
  "") ;;
  *) echo "usage: $0 [--build]" >&2; exit 2 ;;
esac

bash scripts/setup.sh --windows
status=0
fail() {
  echo "windows: $*" >&2
  status=1
}
seconds() { date +%s.%N; }
elapsed() { awk -v a="$1" -v b="$(seconds)" 'BEGIN { printf "%.1f", b - a }'; }

# --- the two DLLs -------------------------------------------------------------------
declare -A dll
for target in i686:win32 x86_64:win64; do
  arch=${target%%:*} build=build-${target##*:}
  tests=OFF
  [ "$arch" = x86_64 ] && tests=ON # the test host for Wine
  toolchain=()
  [ -f "$build/CMakeCache.txt" ] || toolchain=(-DCMAKE_TOOLCHAIN_FILE="cmake/toolchains/$arch-w64-mingw32.cmake")
  cmake -S . -B "$build" "${toolchain[@]}" -DCMAKE_BUILD_TYPE=Release -DTINTWELL_TESTS=$tests >/dev/null
  start=$(seconds)
  cmake --build "$build" -j2 --target tintwell_plugin >/dev/null
  echo "windows: $build/lib/tintwell.dll built in $(elapsed "$start") s"
  dll[$arch]=$build/lib/tintwell.dll
done

# --- export and import tables -------------------------------------------------------
allowed_imports="gdi32.dll kernel32.dll msvcrt.dll mscms.dll"
for arch in i686 x86_64; do
  table=$(x86_64-w64-mingw32-objdump -p "${dll[$arch]}")
  exports=$(awk '/\[Ordinal\/Name Pointer\] Table/ { on = 1; next } on && /^\t\[/ { print $NF } on && /^$/ { on = 0 }' <<<"$table" | paste -sd' ')
  imports=$(awk '/DLL Name:/ { print tolower($3) }' <<<"$table" | sort -u | paste -sd' ')
  echo "windows: $arch exports: $exports; imports: $imports"
  [ "$exports" = REALPluginMain ] || fail "$arch: exports '$exports', not REALPluginMain alone"
  for i in $imports; do
    [[ " $allowed_imports " == *" $i "* ]] || fail "$arch: imports $i, not a system DLL"
  done
done
[ $only_build = 1 ] && exit $status

# --- the stand-in headers against the SDK's -----------------------------------------
start=$(seconds)
python3 tests/windows/header_check.py || fail "the stand-in headers differ from the SDK's"
echo "windows: header check took $(elapsed "$start") s"

# The check itself must see planted differences: a constant's type and value, a field's
# type, a function's parameter, and a name the SDK lacks.
planted=$(mktemp -d)
trap 'rm -rf "$planted"' EXIT
cp platform/win32/include/*.h "$planted/"
sed -i -e 's/^#define GENERIC_WRITE 0x40000000$/#define GENERIC_WRITE 0x40000000u/' \
  -e 's/^#define ERROR_FILE_EXISTS 80$/#define ERROR_FILE_EXISTS 81/' \
  -e 's/^  LONG biWidth;/  DWORD biWidth;/' \
  -e 's/LPDWORD lpNumberOfBytesWritten, LPOVERLAPPED lpOverlapped);/LPDWORD lpNumberOfBytesWritten, void* lpOverlapped);/' \
  "$planted/windows.h"
printf '#ifndef PLANTED_H\n#define PLANTED_H\n#include "windows.h"\nBOOL WINAPI PlantedCall(HANDLE h);\n#endif\n' >"$planted/zz_planted.h"
sed -i 's/#include "windows.h"/#include "windows.h"\n#include "zz_planted.h"/' "$planted/icm.h"
if report=$(python3 tests/windows/header_check.py --include "$planted" 2>&1); then
  fail "the header check passes headers with planted differences"
fi
for key in "const.GENERIC_WRITE.type" "const.ERROR_FILE_EXISTS.value" "record.tagBITMAPINFOHEADER.biWidth.type" \
  "function.WriteFile" "missing.PlantedCall"; do
  [ "$(grep -c "^linux64/mingw64 $key:.*MISMATCH" <<<"$report")" = 1 ] || fail "the header check misses $key"
done

# --- the same session under Wine and on Linux ---------------------------------------
wine=$(command -v wine64 || true)
[ -z "$wine" ] && [ -x /usr/lib/wine/wine64 ] && wine=/usr/lib/wine/wine64
if [ -z "$wine" ]; then
  echo "windows: wine64 is not installed; the Wine check is skipped"
  exit $status
fi
cmake --build build-win64 -j2 --target wine_host >/dev/null
cmake -S . -B build -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build -j2 --target cross_check_linux tintwell_plugin >/dev/null

export WINEPREFIX=$PWD/build-win64/wineprefix WINEDEBUG=-all WINEDLLOVERRIDES="mscoree,mshtml="
unset DISPLAY WAYLAND_DISPLAY
start=$(seconds)
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  "$wine" wineboot -i >/dev/null 2>&1 || fail "wineboot failed"
  echo "windows: Wine prefix made in $(elapsed "$start") s"
fi
colors=$WINEPREFIX/drive_c/windows/system32/spool/drivers/color
mkdir -p "$colors"
cp /usr/share/color/icc/sRGB.icc /usr/share/color/icc/LCMSLABI.ICM "$colors/"
run=$(mktemp -d)
trap 'rm -rf "$planted" "$run"' EXIT
cp build-win64/bin/wine_host.exe "${dll[x86_64]}" "$run/"
colordir='C:\windows\system32\spool\drivers\color'
start=$(seconds)
if ! "$wine" "$run/wine_host.exe" "Z:${run//\//\\}\\tintwell.dll" "$colordir\\sRGB.icc" "$colordir\\LCMSLABI.ICM" \
    >"$run/wine.txt" 2>"$run/wine.err"; then
  cat "$run/wine.err" >&2
  fail "the session under Wine failed"
fi
echo "windows: Wine session took $(elapsed "$start") s"
./build/bin/cross_check_linux build/lib/libtintwell.so /usr/share/color/icc/sRGB.icc \
  /usr/share/color/icc/LCMSLABI.ICM >"$run/linux.txt" || fail "the session on Linux failed"
python3 tests/windows/cross_check.py "$run/linux.txt" "$run/wine.txt" || fail "Wine and Linux disagree"
# The comparison must see a Lab figure two steps off and a changed header field.
awk '$1 == "lab" && $2 == 255 && $3 == 0 { $6 = sprintf("%.4f", $6 + 0.006) } { print }' \
  "$run/linux.txt" >"$run/lab-off.txt"
sed 's/^srgb TagCount .*/srgb TagCount 99/' "$run/linux.txt" >"$run/header-off.txt"
for doctored in lab-off header-off; do
  if python3 tests/windows/cross_check.py "$run/$doctored.txt" "$run/wine.txt" 2>/dev/null; then
    fail "the comparison accepts a report with a $doctored change"
  fi
done
# Wait for Wine's server to end, so that nothing of this run outlives it.
wineserver=$(dirname "$(readlink -f "$wine")")/wineserver
[ -x "$wineserver" ] && "$wineserver" -w
exit $status

#!/usr/bin/env bash
# Checks that the same commit gives the same bytes: builds the Windows DLLs and programs of the last commit in a folder of
# another name, without a compiler cache, packs the zip from them, and compares files and zip byte for byte with those of
# build/. Where these are not of that commit (the working tree differs from it, or they are not built), it builds them a
# second time in another folder. check-reproducible.sh [PRESET...], both widths by default. Fails when a file differs, and
# says where.
set -euo pipefail
cd "$(dirname "$0")/.."
presets=("$@")
[ $# -gt 0 ] || presets=(windows-x64 windows-x86)
files=(ZKUsbMonitor.dll ZKUsbMonitorSimulated.dll zkusb.exe zkusb_typelib.exe)

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
# A compiler that remembers would only give the same object twice.
unset CMAKE_CXX_COMPILER_LAUNCHER CMAKE_C_COMPILER_LAUNCHER
export CCACHE_DISABLE=1
SOURCE_DATE_EPOCH=$(git log -1 --format=%ct)
export SOURCE_DATE_EPOCH

targets=(ZKUsbMonitor ZKUsbMonitorSimulated zkusb zkusb_typelib zkusb_manifests)
build_copy() { # FOLDER PRESET
  [ -d "$1" ] || git clone -q . "$1"
  if ! (cd "$1" && cmake --preset "$2" -DZKUSB_BUILD_TESTS=OFF && cmake --build --preset "$2" --target "${targets[@]}") \
    >"$work/log" 2>&1; then
    tail -40 "$work/log"
    exit 1
  fi
}
pack() { # FOLDER OUTPUT
  (cd "$1" && scripts/package.sh --no-build "$2") >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }
}

first=.
[ -z "$(git status --porcelain)" ] || first=$work/first
for preset in "${presets[@]}"; do
  cmake --build --preset "$preset" --target "${targets[@]}" >/dev/null 2>&1 || first=$work/first
done
second="$work/the second one/deeper"
differences=0
compare() { # FILE FILE
  if cmp "$1" "$2"; then sha256sum "$1"; else differences=$((differences + 1)); fi
}
for preset in "${presets[@]}"; do
  if [ "$first" != . ]; then
    build_copy "$first" "$preset"
    sleep 2  # files are stamped in seconds
  fi
  build_copy "$second" "$preset"
  for file in "${files[@]}"; do compare "$first/build/$preset/$file" "$second/build/$preset/$file"; done
done
# A zip has all widths that are built: those of build/ must be those that were built again.
widths=$(find "$first/build" -mindepth 2 -maxdepth 2 -path '*/windows-*/ZKUsbMonitor.dll' | wc -l)
if [ "$widths" -eq ${#presets[@]} ]; then
  pack "$first" "$work/first zip"
  pack "$second" "$work/second zip"
  compare "$work/first zip/"*.zip "$work/second zip/"*.zip
else
  echo "skipped: the zip is compared where all built widths are"
fi
if [ "$differences" -gt 0 ]; then
  echo "$differences files differ"
  exit 1
fi
echo "no difference"

#!/usr/bin/env bash
# Checks that the same commit gives the same bytes: builds the Windows DLLs and programs of the last commit in a folder of
# another name, without a compiler cache, and compares them byte for byte with those in build/. Where these are not of
# that commit (the working tree differs from it, or they are not built), it builds them a second time in another folder.
# check-reproducible.sh [PRESET...], both widths by default. Fails when a file differs, and says where.
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

build_copy() { # FOLDER PRESET
  [ -d "$1" ] || git clone -q . "$1"
  if ! (cd "$1" && cmake --preset "$2" -DZKUSB_BUILD_TESTS=OFF &&
    cmake --build --preset "$2" --target ZKUsbMonitor ZKUsbMonitorSimulated zkusb zkusb_typelib) >"$work/log" 2>&1; then
    tail -40 "$work/log"
    exit 1
  fi
}

differences=0
for preset in "${presets[@]}"; do
  first=build/$preset
  if [ -n "$(git status --porcelain)" ] || ! cmake --build --preset "$preset" --target ZKUsbMonitor \
    ZKUsbMonitorSimulated zkusb zkusb_typelib >/dev/null 2>&1; then
    build_copy "$work/first" "$preset"
    first=$work/first/build/$preset
    sleep 2  # files are stamped in seconds
  fi
  build_copy "$work/the second one/deeper" "$preset"
  for file in "${files[@]}"; do
    if cmp "$first/$file" "$work/the second one/deeper/build/$preset/$file"; then
      sha256sum "$first/$file"
    else
      differences=$((differences + 1))
    fi
  done
done
if [ "$differences" -gt 0 ]; then
  echo "$differences files differ"
  exit 1
fi
echo "no difference"

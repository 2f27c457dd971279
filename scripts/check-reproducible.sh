#!/usr/bin/env bash
# Builds the Windows DLLs and programs of the last commit twice, in folders of different names and at different times,
# and compares them byte for byte: check-reproducible.sh [PRESET...], both widths by default. Takes some minutes, so
# ./test leaves it out. Fails when a file differs, and says where.
set -euo pipefail
cd "$(dirname "$0")/.."
presets=("$@")
[ $# -gt 0 ] || presets=(windows-x64 windows-x86)
files=(ZKUsbMonitor.dll ZKUsbMonitorSimulated.dll zkusb.exe zkusb_typelib.exe)

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
# A compiler that remembers would only give the same object twice.
export CCACHE_DISABLE=1
differences=0
for preset in "${presets[@]}"; do
  for copy in "$work/first" "$work/the second one/deeper"; do
    [ -d "$copy" ] || git clone -q . "$copy"
    if ! (cd "$copy" && cmake --preset "$preset" -DZKUSB_BUILD_TESTS=OFF &&
      cmake --build --preset "$preset" --target ZKUsbMonitor ZKUsbMonitorSimulated zkusb zkusb_typelib) >"$work/log" 2>&1; then
      tail -40 "$work/log"
      exit 1
    fi
    # Files are stamped in seconds.
    sleep 2
  done
  for file in "${files[@]}"; do
    if cmp "$work/first/build/$preset/$file" "$work/the second one/deeper/build/$preset/$file"; then
      (cd "$work/first/build" && sha256sum "$preset/$file")
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

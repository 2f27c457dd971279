#!/usr/bin/env bash
# A stranger's way: the zip, unpacked in an empty folder, and nothing else. What README shows is compiled and run, each
# sample is built with its own CMake file and run over a simulated PC into which a stick is plugged.
#
#   zip_test.sh RUN CXX CC CLOSE_WINDOW WORK          RUN runs a Windows program
set -euo pipefail
run=$1 cxx=$2 cc=$3 close_window=$4 work=$5
source=$(cd "$(dirname "$0")/../.." && pwd)
failed=0
expect() {
  if [ "$2" = "$3" ]; then
    echo "ok: $1"
  else
    failed=1
    printf 'FAILED: %s\n--- expected\n%s\n--- found\n%s\n' "$1" "$2" "$3"
  fi
}

rm -rf "$work"
mkdir -p "$work/an empty folder"
# Twice, in folders of their own: the same bytes.
first=$("$source/scripts/package.sh" --no-build "$work")
again=$("$source/scripts/package.sh" --no-build "$work/again")
grep -v '^[0-9a-f]\{64\} ' <<<"$first" || true
expect "the same bytes" "$(tail -1 <<<"$first")" "$(tail -1 <<<"$again")"
cd "$work/an empty folder"
cmake -E tar xf "$work"/zkusb-monitor-*-windows.zip
zip=$(echo zkusb-monitor-*-windows)
(cd "$zip" && sha256sum --quiet -c SHA256SUMS)
expect "nothing without a checksum" "$(cd "$zip" && find . -type f ! -name SHA256SUMS | wc -l)" \
  "$(wc -l <"$zip/SHA256SUMS")"
for file in x64/ZKUsbMonitor.dll x64/ZKUsbMonitorSimulated.dll x64/zkusb.exe x64/ZKUsbMonitor.Assembly.manifest \
  x64/simulated/ZKUsbMonitor.Assembly.manifest x64/zkusb_monitor.tlb include/zkusb_monitor.h include/zkusb_monitor_c.h \
  include/zkusb_monitor.idl symbols/x64/ZKUsbMonitor.map machines/dell-precision.json docs/contract.md NOTICES.txt \
  LICENSE.txt README.md lib/cmake/ZKUsbMonitor/ZKUsbMonitorConfig.cmake; do
  [ -s "$zip/$file" ] || { failed=1; echo "FAILED: the zip has no $file"; }
done

# What README shows is the sample, and its commands work.
expect "README shows the sample" "$(cat "$zip/samples/sticks/sticks.cpp")" \
  "$(awk '/^    \/\/ Prints each USB stick/ { on = 1 } on && /^[^ ]/ { exit } on { sub(/^    /, ""); print }' "$zip/README.md" |
    sed -e :a -e '/^\n*$/{$d;N;ba' -e '}')"
export ZKUSB_MACHINE ZKUSB_SCRIPT
ZKUSB_MACHINE=$("$run" winepath -w "$PWD/$zip/machines/dell-precision.json" | tr -d '\r')
ZKUSB_SCRIPT=$("$run" winepath -w "$PWD/$zip/machines/scripts/stick-comes-and-goes.json" | tr -d '\r')
there='there: SanDisk Extreme (D:), serial AA010603160707470215, port 1-3'
stick='Kingston DataTraveler 3.0 (F:), serial 60A44C413FD1B2A1C9A60135, port 1-2'
by_hand=$PWD/by-hand
mkdir "$by_hand"
cp "$zip/samples/sticks/sticks.cpp" "$by_hand"
command=$(sed -n 's/^    \(x86_64-w64-mingw32-g++ .*\)/\1/p' "$zip/README.md")
[ -n "$command" ] || { failed=1; echo "FAILED: README shows no command"; }
(cd "$by_hand" && ln -s "../$zip" zkusb-monitor && bash -c "$command")
cp "$zip/x64/ZKUsbMonitorSimulated.dll" "$zip/x64/simulated/ZKUsbMonitor.Assembly.manifest" "$by_hand"
expect "sticks, by README's command" "$there"$'\n'"attached: $stick" \
  "$("$run" "$by_hand/sticks.exe" 3 2>/dev/null | tr -d '\r')"
rm "$by_hand/ZKUsbMonitor.Assembly.manifest"
expect "sticks without the component" 'no events: 0x80040154' "$("$run" "$by_hand/sticks.exe" 3 2>&1 | tr -d '\r' | grep -o 'no events.*')"

for sample in sticks letters window; do
  cp -r "$zip/samples/$sample" "$sample"
  if ! { cmake -S "$sample" -B "$sample/build" -G Ninja -DCMAKE_BUILD_TYPE=Release -DCMAKE_SYSTEM_NAME=Windows \
    -DCMAKE_C_COMPILER="$cc" -DCMAKE_CXX_COMPILER="$cxx" -DCMAKE_RC_COMPILER="${cxx%-g++*}-windres" \
    -DCMAKE_CXX_FLAGS='-Wall -Wextra -Werror' -DCMAKE_C_FLAGS='-Wall -Wextra -Werror' \
    -DCMAKE_PREFIX_PATH="$PWD/$zip" -DZKUSB_MONITOR_SIMULATED=ON && cmake --build "$sample/build"; } >log 2>&1; then
    failed=1
    echo "FAILED: $sample does not build"
    tail -20 log
  fi
done
expect "sticks" "$there"$'\n'"attached: $stick"$'\n'"removed: $stick" \
  "$("$run" "$PWD/sticks/build/sticks.exe" 9 2>/dev/null | tr -d '\r')"
expect "letters" 'D:\ SanDisk , Extreme         , AA010603160707470215'$'\n''3 USB devices' \
  "$("$run" "$PWD/letters/build/letters.exe" 2>/dev/null | tr -d '\r')"
expect "window" 'rows: 3, then 4; ended with 0' \
  "$("$run" "$close_window" "window/build/window.exe" 2>/dev/null | tr -d '\r')"
exit "$failed"

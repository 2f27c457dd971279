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
# Twice, in folders of their own: the same bytes. The second is packed while the first is tried.
"$source/scripts/package.sh" --no-build "$work/again" >"$work/again.log" 2>&1 &
again=$!
first=$("$source/scripts/package.sh" --no-build "$work")
grep -v '^[0-9a-f]\{64\} ' <<<"$first" || true
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
# The zip's own script: the stick comes later, when a slow machine has shown the PC, and goes earlier.
sed 's/"at": 1000/"at": 2000/; s/"at": 6000/"at": 4500/' "$zip/machines/scripts/stick-comes-and-goes.json" >stick.json
expect "the script of the zip" 2 "$(grep -cE '"at": (2000|4500)' stick.json)"
ZKUSB_SCRIPT=$("$run" winepath -w "$PWD/stick.json" | tr -d '\r')
there='there: SanDisk Extreme (D:), serial AA010603160707470215, port 1-3'
stick='Kingston DataTraveler 3.0 (F:), serial 60A44C413FD1B2A1C9A60135, port 1-2'
by_hand=$PWD/by-hand
mkdir "$by_hand"
cp "$zip/samples/sticks/sticks.cpp" "$by_hand"
command=$(sed -n 's/^    \(x86_64-w64-mingw32-g++ .*\)/\1/p' "$zip/README.md")
[ -n "$command" ] || { failed=1; echo "FAILED: README shows no command"; }
(cd "$by_hand" && ln -s "../$zip" zkusb-monitor && bash -c "$command")
cp "$zip/x64/ZKUsbMonitorSimulated.dll" "$zip/x64/simulated/ZKUsbMonitor.Assembly.manifest" "$by_hand"
output() { # NAME COMMAND: what a program prints, in NAME.out; it runs meanwhile
  local name=$1
  shift
  { "$run" "$@" 2>&1 | tr -d '\r' >"$work/$name.out"; } || true
}
# The 20 lines of README, run as they stand there.
output by-hand "$by_hand/sticks.exe" 4 &
# Without manifest and DLL.
mkdir alone && cp "$by_hand/sticks.exe" alone
output alone "$PWD/alone/sticks.exe" 2 &

build_sample() {
  cp -r "$zip/samples/$1" "$1"
  cmake -S "$1" -B "$1/build" -G Ninja -DCMAKE_BUILD_TYPE=Release -DCMAKE_SYSTEM_NAME=Windows \
    -DCMAKE_C_COMPILER="$cc" -DCMAKE_CXX_COMPILER="$cxx" -DCMAKE_RC_COMPILER="${cxx%-g++*}-windres" \
    -DCMAKE_CXX_FLAGS='-Wall -Wextra -Werror' -DCMAKE_C_FLAGS='-Wall -Wextra -Werror' \
    -DCMAKE_PREFIX_PATH="$PWD/$zip" -DZKUSB_MONITOR_SIMULATED=ON && cmake --build "$1/build"
}
for sample in sticks letters window; do
  { build_sample "$sample" >"$work/$sample.log" 2>&1 && touch "$work/$sample.built"; } || true &
done
wait
for sample in sticks letters window; do
  [ -f "$work/$sample.built" ] && continue
  failed=1
  echo "FAILED: $sample does not build"
  tail -20 "$work/$sample.log"
done
output sticks "$PWD/sticks/build/sticks.exe" 6 &
output letters "$PWD/letters/build/letters.exe" &
output window "$close_window" "window/build/window.exe" &
wait
found() { grep -avE '^([0-9a-f]{4}:)+(err|fixme|warn):' "$work/$1.out" || true; }
expect "sticks, by README's command" "$there"$'\n'"attached: $stick" "$(found by-hand | head -2)"
expect "sticks without the component" 'no events: 0x80040154' "$(found alone | grep -o 'no events.*')"
expect "sticks" "$there"$'\n'"attached: $stick"$'\n'"removed: $stick" "$(found sticks)"
expect "letters" 'D:\ SanDisk , Extreme         , AA010603160707470215'$'\n''3 USB devices' "$(found letters)"
expect "window" 'rows: 3, then 4; ended with 0' "$(found window)"
expect "the same bytes" "$(tail -1 <<<"$first")" "$(tail -1 "$work/again.log")"
exit "$failed"

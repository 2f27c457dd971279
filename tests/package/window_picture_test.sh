#!/usr/bin/env bash
# The sample window as a person sees it: on a virtual screen, before and after a stick is plugged in. Counts the rows
# of its list; the pictures stay for whoever wants to look. Ends with 77, and says why, where it cannot be.
#
#   window_picture_test.sh CXX BUILD WORK
set -euo pipefail
cxx=$1 build=$2 work=$3
source=$(cd "$(dirname "$0")/../.." && pwd)
skip() {
  echo "skipped: the picture of the window: $1"
  exit 77
}
for program in Xvfb:xvfb import:imagemagick convert:imagemagick wine:wine; do
  command -v "${program%:*}" >/dev/null || skip "there is no ${program%:*} (package ${program#*:})"
done
rm -rf "$work"
mkdir -p "$work/program"
cd "$work/program"
cp "$build/ZKUsbMonitorSimulated.dll" "$build/simulated/ZKUsbMonitor.Assembly.manifest" .
"$cxx" "$source/samples/window/window.cpp" -I "$source/include" -static -mwindows -lole32 -loleaut32 -luuid -lcomctl32 \
  -o window.exe
# The stick comes when the first picture has been taken, and stays.
sed -n '1,/"unplug"/{/"unplug"/!p}' "$source/machines/scripts/stick-comes-and-goes.json" |
  sed 's/"at": 1000/"at": 20000/; $s/,$//' >script.json
printf '  ]\n}\n' >>script.json

# A Wine of its own: that of the other tests has no screen.
. "$source/scripts/wine.sh"
export WINEPREFIX=$work/prefix
Xvfb -displayfd 3 -screen 0 1024x600x24 3>"$work/display" 2>/dev/null &
screen=$!
finish() {
  timeout 60 wineserver -k || true
  kill "$screen" || true
}
trap finish EXIT
for _ in $(seq 100); do [ -s "$work/display" ] && break || sleep 0.1; done
DISPLAY=:$(cat "$work/display")
export DISPLAY
timeout 300 wineboot -i >"$work/log" 2>&1 || skip "Wine does not start on a virtual screen"
ZKUSB_MACHINE=$(winepath -w "$source/machines/dell-precision.json" 2>/dev/null)
ZKUSB_SCRIPT=$(winepath -w "$PWD/script.json" 2>/dev/null)
export ZKUSB_MACHINE ZKUSB_SCRIPT
wine window.exe >"$work/log" 2>&1 &

# The rows of the list: lines of dark points in the column of the ports, whose digits do not reach into the next line.
rows() {
  convert "$1" -crop 60x250+678+41 +repage -colorspace gray -threshold 60% -negate txt:- |
    awk -F'[ ,:]' 'NR > 1 && /white|#FFFFFF/ { row[$2] = 1 }
                   END { for (y = 0; y < 250; y++) if (row[y] && !row[y - 1]) n++; print n + 0 }'
}
picture() { # NAME ROWS: at last so many
  local found=
  for _ in $(seq 60); do
    sleep 1
    import -window root "$work/$1.png"
    found=$(rows "$work/$1.png")
    [ "$found" != "$2" ] || break
  done
  [ "$found" = "$2" ] || { echo "FAILED: $1: $found rows, expected $2"; exit 1; }
}
picture before 3
picture after 4
echo "ok: $work/before.png, $work/after.png"

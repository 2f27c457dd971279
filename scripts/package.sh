#!/usr/bin/env bash
# Makes build/zkusb-monitor-VERSION-windows.zip, what users get: package.sh [--no-build] [OUTPUT FOLDER]. Builds both
# widths first, unless it is told not to; a width that was not built is left out then, aloud. The same commit gives the
# same bytes: files are stamped with the commit's time, or with SOURCE_DATE_EPOCH.
set -euo pipefail
cd "$(dirname "$0")/.."
build=1
if [ "${1:-}" = --no-build ]; then
  build=0
  shift
fi
out=${1:-build}
mkdir -p "$out"
out=$(cd "$out" && pwd)
targets=(ZKUsbMonitor ZKUsbMonitorSimulated zkusb zkusb_typelib zkusb_manifests)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
stage=$work/stage
widths=0
version=
for preset in windows-x64 windows-x86; do
  if [ "$build" -eq 1 ]; then
    { cmake --preset "$preset" && cmake --build --preset "$preset" --target "${targets[@]}"; } >"$work/log" 2>&1 || {
      tail -40 "$work/log"
      exit 1
    }
  else
    missing=
    for file in ZKUsbMonitor.dll ZKUsbMonitorSimulated.dll zkusb.exe zkusb_typelib.exe generated/version.txt \
      ZKUsbMonitor.Assembly.manifest simulated/ZKUsbMonitor.Assembly.manifest; do
      [ -f "build/$preset/$file" ] || missing=$file
    done
    if [ -n "$missing" ]; then
      echo "left out: $preset, which is not built: there is no $missing"
      continue
    fi
  fi
  cmake --install "build/$preset" --component zkusb --prefix "$stage" >/dev/null
  version=$(cat "build/$preset/generated/version.txt")
  widths=$((widths + 1))
done
[ "$widths" -gt 0 ] || { echo "nothing is built"; exit 1; }
# The linker writes down where it read the list of exports. Nothing else may say where this was built.
find "$stage/symbols" -name '*.map' -exec sed -i 's|^LOAD /.*/module/exports.def$|LOAD module/exports.def|' {} +
if grep -rlF "$PWD/" "$stage"; then
  echo "names the folder that it was built in"
  exit 1
fi

(cd "$stage" && find . -type f ! -name SHA256SUMS -printf '%P\0' | LC_ALL=C sort -z | xargs -0 sha256sum >SHA256SUMS)
epoch=${SOURCE_DATE_EPOCH:-$(git log -1 --format=%ct 2>/dev/null || echo 1577836800)}
find "$stage" -type f -exec chmod 644 {} + -exec touch -d "@$epoch" {} +
find "$stage" -type d -exec chmod 755 {} + -exec touch -d "@$epoch" {} +
export TZ=UTC SOURCE_DATE_EPOCH=$epoch ZKUSB_STAGE=$stage ZKUSB_VERSION=$version
cpack -G ZIP --config packaging/cpack.cmake -B "$work/packed" >"$work/log" 2>&1 || {
  cat "$work/log"
  exit 1
}
zip=zkusb-monitor-$version-windows.zip
# cpack takes files in the order in which the file system names them, which is not the same everywhere.
mkdir "$work/unpacked"
(cd "$work/unpacked" && cmake -E tar xf "$work/packed/$zip")
rm -f "$out/$zip"
perl scripts/sorted_zip.pl "$work/unpacked" "$epoch" "$out/$zip"
(cd "$out" && sha256sum "$zip")

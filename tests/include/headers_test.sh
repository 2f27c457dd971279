#!/usr/bin/env bash
# The headers that programs include, alone in a folder, through each compiler a program may have.
#
#   headers_test.sh CXX CC WORK [all]
#
# Without "all" each header goes once through each compiler, in the oldest standard that it is for and in the newest.
set -euo pipefail
cxx=$1 cc=$2 work=$3 extent=${4:-}
here=$(cd "$(dirname "$0")" && pwd)
# All that this depends on. What passed is not compiled again before something of it changes.
inputs=$(cat "$here"/../../include/zkusb_monitor*.h "$here"/*.* "$here"/compilers/* | sha256sum; "$cxx" --version)
if [ "$(cat "$work/passed" 2>/dev/null)" = "$inputs" ]; then
  echo "passed, and nothing has changed since"
  exit 0
fi
rm -rf "$work"
mkdir -p "$work"
cp "$here"/../../include/zkusb_monitor*.h "$work"
warnings=(-Wall -Wextra -Wpedantic -Werror)
count=0

# Compilers run side by side; each leaves a file that says how it went.
start() {
  local wanted=$1 what=$2 number
  shift 2
  number=$((count += 1))
  while [ "$(jobs -rp | wc -l)" -ge "$(nproc)" ]; do wait -n || true; done
  {
    local code=0
    "$@" >"$work/log$number" 2>&1 || code=$?
    if [ "$wanted" = taken ] && [ "$code" -ne 0 ] || [ "$wanted" = refused ] && [ "$code" -eq 0 ]; then
      echo "FAILED: $what was not $wanted: $*"
      head -20 "$work/log$number"
    fi >"$work/failed$number"
    touch "$work/done$number"
  } &
}
check() { start taken "$@"; }
refuse() { start refused "$@"; }

standards=(11 20)
[ "$extent" != all ] || standards=(11 17 20)
for standard in "${standards[@]}"; do
  check "C++$standard" "$cxx" -std=c++$standard "${warnings[@]}" -I "$work" "$here/uses_cpp.cpp" \
    -o "$work/cpp$standard.exe" -lole32 -loleaut32 -luuid
  check "C++$standard, the helpers" "$cxx" -std=c++$standard "${warnings[@]}" -I "$work" -fsyntax-only -x c++ \
    "$work/zkusb_monitor_watcher.h" -Wno-pragma-once-outside-header
done
if [ "$extent" = all ]; then
  check "C++17, little of windows.h" "$cxx" -std=c++17 -DWIN32_LEAN_AND_MEAN -DNOMINMAX -DUNICODE "${warnings[@]}" \
    -I "$work" -fsyntax-only "$here/uses_cpp.cpp"
  check "gnu17" "$cc" -std=gnu17 "${warnings[@]}" -I "$work" "$here/uses_c.c" -o "$work/gnu17.exe" -lole32
fi
# Two files of one program may both include it.
echo '#include <zkusb_monitor.h>' >"$work/second.cpp"
check "two files" "$cxx" -std=c++11 "${warnings[@]}" -I "$work" "$here/uses_cpp.cpp" "$work/second.cpp" \
  -o "$work/two.exe" -lole32 -loleaut32 -luuid
check "C99" "$cc" -std=c99 "${warnings[@]}" -I "$work" "$here/uses_c.c" -o "$work/c99.exe" -lole32
echo '#include <zkusb_monitor.h>' >"$work/wrong.c"
refuse "the C++ header in C" "$cc" -I "$work" -fsyntax-only "$work/wrong.c"
echo '#include <zkusb_monitor_c.h>' >"$work/wrong.cpp"
refuse "the C header in C++" "$cxx" -I "$work" -fsyntax-only "$work/wrong.cpp"

if command -v clang++-14 >/dev/null; then
  check "clang in its Microsoft mode" clang++-14 --target=x86_64-pc-windows-msvc -fms-extensions -fms-compatibility \
    -nostdinc -std=c++14 "${warnings[@]}" -Wno-language-extension-token -isystem "$here/compilers" -I "$work" -fsyntax-only "$here/uses_cpp.cpp"
  folders=()
  while read -r folder; do folders+=(-isystem "$folder"); done < <("$cxx" -E -v -x c++ /dev/null 2>&1 |
    sed -n '/^#include </,/^End/s/^ //p' | grep -vE '/gcc/[^/]*/[^/]*/include(-fixed)?$')  # its built-in functions
  check "clang for MinGW, with its declspecs" clang++-14 --target=x86_64-pc-windows-gnu -fms-extensions -nostdlibinc \
    -std=c++17 "${warnings[@]}" "${folders[@]}" -I "$work" -fsyntax-only "$here/uses_cpp.cpp"
else
  echo "skipped: clang in its Microsoft mode: there is no clang++-14"
fi
wait
failed=$(find "$work" -name 'failed*' -size +0 | wc -l) done=$(find "$work" -name 'done*' | wc -l)
cat "$work"/failed*
echo "headers: $((done - failed)) passed, $failed failed"
[ "$failed" -eq 0 ] && [ "$done" -eq "$count" ] && [ "$count" -ge 8 ]
echo "$inputs" >"$work/passed"

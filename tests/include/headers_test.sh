#!/usr/bin/env bash
# The headers that programs include, alone in a folder, through each compiler a program may have.
#
#   headers_test.sh CXX CC WORK
set -euo pipefail
cxx=$1 cc=$2 work=$3
here=$(cd "$(dirname "$0")" && pwd)
rm -rf "$work"
mkdir -p "$work"
cp "$here"/../../include/zkusb_monitor*.h "$work"
warnings=(-Wall -Wextra -Wpedantic -Werror)
failed=0 passed=0

check() {
  local what=$1
  shift
  if "$@" >"$work/log" 2>&1; then
    passed=$((passed + 1))
  else
    failed=$((failed + 1))
    echo "FAILED: $what: $*"
    head -20 "$work/log"
  fi
}
refuse() {
  local what=$1
  shift
  if "$@" >"$work/log" 2>&1; then
    failed=$((failed + 1))
    echo "FAILED: $what was taken: $*"
  else
    passed=$((passed + 1))
  fi
}

for standard in 11 17 20; do
  check "C++$standard" "$cxx" -std=c++$standard "${warnings[@]}" -I "$work" "$here/uses_cpp.cpp" \
    -o "$work/cpp$standard.exe" -lole32 -loleaut32 -luuid
  check "C++$standard, the helpers" "$cxx" -std=c++$standard "${warnings[@]}" -I "$work" -fsyntax-only -x c++ \
    "$work/zkusb_monitor_watcher.h" -Wno-pragma-once-outside-header
done
check "C++17, little of windows.h" "$cxx" -std=c++17 -DWIN32_LEAN_AND_MEAN -DNOMINMAX -DUNICODE "${warnings[@]}" \
  -I "$work" -fsyntax-only "$here/uses_cpp.cpp"
# Two files of one program may both include it.
echo '#include <zkusb_monitor.h>' >"$work/second.cpp"
check "two files" "$cxx" -std=c++11 "${warnings[@]}" -I "$work" "$here/uses_cpp.cpp" "$work/second.cpp" \
  -o "$work/two.exe" -lole32 -loleaut32 -luuid
for standard in c99 gnu17; do
  check "$standard" "$cc" -std=$standard "${warnings[@]}" -I "$work" "$here/uses_c.c" -o "$work/$standard.exe" -lole32
done
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
echo "headers: $passed passed, $failed failed"
[ "$failed" -eq 0 ] && [ "$passed" -ge 12 ]

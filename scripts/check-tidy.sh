#!/usr/bin/env bash
# Runs clang-tidy with the checks of .clang-tidy: check-tidy.sh [--all]. By default over what differs from the commit
# before the last one, uncommitted changes included; with --all over every source file of the component, the simulation,
# the recorder and the client. Tests are left out, since macros of the test library make up most of what would be found
# there, and so is what only a Windows compiler reads.
#
# All of them are read as unity builds read them, a dozen files at once: each header once for a dozen, which takes a
# fraction of the time.
set -euo pipefail
cd "$(dirname "$0")/.."

left_out='^(tests|bench|fuzz|samples|platform/windows|simulation/(windows|abi)|tools/type_library)/|windows_pc\.cpp$'
sources() { git ls-files '*.cpp' | grep -vE "$left_out"; }

unity=OFF options=(--quiet)
if [ "${1:-}" = --all ]; then
  unity=ON
  options+=(--checks=-bugprone-suspicious-include)  # which a unity build is made of
else
  base=HEAD~1
  git rev-parse -q --verify "$base" >/dev/null || base=HEAD
  # A header stands for the source file of its name.
  files=$(git diff --name-only --diff-filter=d "$base" -- '*.h' '*.cpp' | sed 's/\.h$/.cpp/' | sort -u |
    grep -Fxf <(sources) || true)
  [ -n "$files" ] || { echo "no source file changed"; exit 0; }
fi

# The compile commands, and the files that the build makes.
build=build/tidy-${unity,,}
cmake --preset debug -B "$build" -DCMAKE_UNITY_BUILD=$unity -DCMAKE_UNITY_BUILD_BATCH_SIZE=12 -DZKUSB_BUILD_TESTS=OFF >/dev/null
ninja -C "$build" -t targets all | sed -n 's/^\([^ ]*\.inc\): CUSTOM_COMMAND$/\1/p' | xargs -r ninja -C "$build" >/dev/null
if [ $unity = ON ]; then
  files=$(find "$build" -name 'unity_*.cxx')
  # Every source file stands in one of them, or the check would pass over it.
  missing=$(sources | grep -vFxf <(sed -n "s|^#include \"$PWD/\(.*\)\"|\1|p" $files) || true)
  [ -z "$missing" ] || { echo "in no target: $missing"; exit 1; }
fi
# shellcheck disable=SC2086
printf '%s\n' $files | xargs -P"$(nproc)" -n1 clang-tidy-14 -p "$build" "${options[@]}" 2>/dev/null
if [ $unity = ON ]; then count=$(sources | wc -l); else count=$(wc -w <<<"$files"); fi
echo "$count files, nothing found"

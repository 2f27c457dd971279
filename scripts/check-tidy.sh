#!/usr/bin/env bash
# Runs clang-tidy with the checks of .clang-tidy: check-tidy.sh [--all]. By default over what differs from the commit
# before the last one, uncommitted changes included; with --all over every source file of the component, the simulation
# and the tools. Tests are left out, since macros of the test library make up most of what would be found there, and so
# is what only a Windows compiler reads.
set -euo pipefail
cd "$(dirname "$0")/.."

sources() {
  git ls-files '*.cpp' | grep -vE '^(tests|bench|fuzz|samples|platform/windows|simulation/(windows|abi)|tools/type_library)/|windows_pc\.cpp$'
}
if [ "${1:-}" = --all ]; then
  files=$(sources)
else
  base=HEAD~1
  git rev-parse -q --verify "$base" >/dev/null || base=HEAD
  # A header stands for the source file of its name.
  files=$(git diff --name-only --diff-filter=d "$base" -- '*.h' '*.cpp' | sed 's/\.h$/.cpp/' | sort -u |
    grep -Fxf <(sources) || true)
fi
[ -n "$files" ] || { echo "no source file changed"; exit 0; }

# The compile commands, one for each file, and the files that the build makes.
cmake --preset debug -DCMAKE_UNITY_BUILD=OFF >/dev/null
ninja -C build/debug -t targets all | sed -n 's/^\([^ ]*\.inc\): CUSTOM_COMMAND$/\1/p' |
  xargs -r ninja -C build/debug >/dev/null
# shellcheck disable=SC2086
printf '%s\n' $files | xargs -P"$(nproc)" -n1 clang-tidy-14 -p build/debug --quiet 2>/dev/null
echo "$(wc -w <<<"$files") files, nothing found"

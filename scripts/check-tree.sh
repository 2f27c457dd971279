#!/usr/bin/env bash
# Rules about the files themselves. Prints each breach and fails when there is one.
set -euo pipefail
cd "$(dirname "$0")/.."
breaches=0
breach() {
  echo "  $1"
  breaches=$((breaches + 1))
}

# The files of the project: those git knows or would take; in an export without git, all but build/.
files() {
  git ls-files -co --exclude-standard -- "$@" 2>/dev/null || find . -path ./build -prune -o -type f -print
}

# A test that no program contains would pass for ever.
while read -r test; do
  list=$(dirname "$test")/CMakeLists.txt
  grep -qw -- "$(basename "$test")" "$list" 2>/dev/null || grep -rqw -- "$(basename "$test")" tests --include=CMakeLists.txt ||
    breach "$test stands in no target"
done < <(files 'tests/*_test.cpp')

# Windows headers have their place. Those of the system begin alike, whatever their spelling.
while read -r file; do
  breach "$file includes a Windows header"
done < <(files '*.h' '*.cpp' | grep -vE '^(platform/windows/|platform/com\.h|include/|samples/|tests/windows/|tests/include/|tests/package/)' |
  xargs -r grep -liE '#include *<((win|usb|ole|shell|sh|comdef|com?base|obj|oa?idl|ocidl|unkn)[a-z0-9]*|setupapi|cfgmgr32|ntdd[a-z]*|devguid|devpkey|devpropdef|dbt|regstr|initguid|guiddef|process|io|tchar|basetsd)\.h>' || true)

# Only platform, module and the client's start-up may know which system they run on.
while read -r file; do
  breach "$file asks for _WIN32"
done < <(files '*.h' '*.cpp' | grep -vE '^(platform/|module/|tools/zkusb/main\.cpp|tests/)' |
  xargs -r grep -lE '\b_WIN(32|64)' || true)

# The component depends on the standard library alone.
while read -r file; do
  breach "$file includes a library's header"
done < <(files 'tree/*' 'devinfo/*' 'com/*' 'monitor/*' 'module/*' |
  xargs -r grep -lE '#include <(nlohmann|CLI|gtest|gmock|benchmark)' || true)

while read -r file; do
  lines=$(wc -l <"$file")
  [ "$lines" -le 500 ] || breach "$file has $lines lines (500 at most)"
done < <(files '*.h' '*.cpp')

if ! files '*.h' '*.cpp' | xargs -r clang-format-14 --dry-run -Werror 2>build-format.log; then
  breach "clang-format finds: $(grep -c 'error:' build-format.log) places, first: $(head -1 build-format.log)"
fi
rm -f build-format.log

[ "$breaches" -eq 0 ] || { echo "$breaches breaches"; exit 1; }
echo "  no breach"

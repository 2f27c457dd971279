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

# The order of the rooms: the table of docs/architecture.md says what each may include. Every include between two rooms
# is looked up there; a folder that stands in no row is a breach too.
while read -r line; do
  breach "$line"
done < <(files '*.h' '*.cpp' | xargs -r grep -HoE '^ *# *include "[^"]+"' | awk -F'|' '
  function room(path, dir) {
    dir = path
    while (sub(/\/[^\/]*$/, "", dir)) if ((dir "/") in row) return dir "/"
    return ""
  }
  FNR == NR {
    if ($2 ~ /^ `[a-z_\/]+\/` $/) {
      name = $2; gsub(/[ `]/, "", name); row[name] = ++rows
      if ($5 ~ /everything/) any[name] = 1
      if ($5 ~ /everything but `tests/) but_tests[name] = 1
      count = split($5, allowed, "`")
      for (i = 2; i <= count; i += 2) {
        may[name, allowed[i]] = 1
        # Down the tower: what a room includes stands in an earlier row. The seam is one room with what carries it out.
        if (!(allowed[i] in row) && !(name == "platform/" || name in any))
          print "docs/architecture.md: " name " may include " allowed[i] ", which stands above it"
      }
    }
    next
  }
  {
    colon = index($0, ":"); from = substr($0, 1, colon - 1); sub(/^\.\//, "", from)
    target = $0; sub(/^[^"]*"/, "", target); sub(/"$/, "", target)
    if (target !~ /\//) next  # a file that the build makes
    a = room(from); b = room(target)
    if (a == "") { print from " stands in no room of docs/architecture.md"; next }
    if (a == b || b == "") next
    if ((a in any) && !((a in but_tests) && b ~ /^tests\//)) next
    if (!((a, b) in may)) print from " includes " target ": " a " may not include " b
  }
  END { if (rows < 10) print "docs/architecture.md: the table of rooms is not there" }' docs/architecture.md - | sort -u)

# A test that no program contains would pass for ever.
while read -r test; do
  list=$(dirname "$test")/CMakeLists.txt
  grep -qw -- "$(basename "$test")" "$list" 2>/dev/null || grep -rqw -- "$(basename "$test")" tests --include=CMakeLists.txt ||
    breach "$test stands in no target"
done < <(files 'tests/*_test.cpp')

# Windows headers have their place. Those of the system begin alike, whatever their spelling.
while read -r file; do
  breach "$file includes a Windows header"
done < <(files '*.h' '*.cpp' | grep -vE '^(platform/windows/|platform/com\.h|simulation/(windows|abi)/|include/|samples/|tests/windows/|tests/include/|tests/package/)' |
  xargs -r grep -liE '#include *<((win|usb|ole|shell|sh|comdef|com?base|obj|oa?idl|ocidl|unkn)[a-z0-9]*|setupapi|cfgmgr32|ntdd[a-z]*|devguid|devpkey|devpropdef|dbt|regstr|initguid|guiddef|process|io|tchar|basetsd)\.h>' || true)

# The PC in the system's own ABI checks what platform/ declares, so it must not use it.
while read -r line; do
  breach "$line: this PC is there to check what platform/ declares"
done < <(files 'simulation/abi/*' | xargs -r grep -E '#include "platform/' | grep -v '"platform/text\.h"' || true)

# Only platform, module and the client's start-up may know which system they run on.
while read -r file; do
  breach "$file asks for _WIN32"
done < <(files '*.h' '*.cpp' | grep -vE '^(platform/|simulation/|module/|tools/zkusb/main\.cpp|tests/)' |
  xargs -r grep -lE '\b_WIN(32|64)' || true)

# The component depends on the standard library alone.
while read -r file; do
  breach "$file includes a library's header"
done < <(files 'records/*' 'tree/*' 'devinfo/*' 'com/*' 'monitor/*' 'module/*' |
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

#!/usr/bin/env bash
# Runs page_test.mjs: page_test.sh ZKUSB SOURCE OUTPUT. Ends with 77, and says why, where there is no browser to
# run it in.
set -euo pipefail
zkusb=$1 source=$2 output=$3
skip() {
  echo "skipped: $1"
  exit 77
}
command -v chromium >/dev/null || command -v chromium-browser >/dev/null || skip "there is no Chromium (package chromium)"
command -v node >/dev/null || skip "there is no Node.js (package nodejs)"
modules=$output/modules
mkdir -p "$modules"
here=$source/tests/tools/page
# Fetched once for each lockfile, and then without a network.
if ! cmp -s "$here/package-lock.json" "$modules/fetched"; then
  command -v npm >/dev/null || skip "there is no npm (package npm)"
  cp "$here/package.json" "$here/package-lock.json" "$modules"
  (cd "$modules" && npm ci --ignore-scripts --no-audit --no-fund) >"$output/npm.log" 2>&1 ||
    skip "the driver of the browser cannot be fetched: $(tail -1 "$output/npm.log")"
  cp "$here/package-lock.json" "$modules/fetched"
fi
exec node "$here/page_test.mjs" "$modules" "$zkusb" "$source" "$output/pages"

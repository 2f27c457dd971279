#!/usr/bin/env bash
# Runs one Windows program under Wine: windows-run.sh PROGRAM [ARGUMENT...]. What CTest puts in front of
# the programs of the windows presets.
set -euo pipefail
. "$(dirname "${BASH_SOURCE[0]}")/wine.sh"
# Several programs may find no prefix at once.
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  mkdir -p "$wine_home"
  exec 9>"$wine_home/lock"
  flock 9
  [ -f "$WINEPREFIX/system.reg" ] || make_wine_prefix >/dev/null 2>&1 9>&-
  exec 9>&-
fi
# What the program starts of Wine's own services keeps its output open for a minute. So it writes to files, and whoever
# reads the output of this script waits for nobody else.
out=$(mktemp)
err=$(mktemp)
trap 'rm -f "$out" "$err"' EXIT
wine "$@" >"$out" 2>"$err" &
program=$!
tail -n +1 -s 0.1 -f --pid=$program "$out" &
tail -n +1 -s 0.1 -f --pid=$program "$err" >&2 &
code=0
wait "$program" || code=$?
wait
exit "$code"

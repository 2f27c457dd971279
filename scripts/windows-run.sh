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
exec wine "$@"

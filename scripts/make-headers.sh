#!/usr/bin/env bash
# Makes the headers in include/ and docs/identifiers.md anew from the IDL; with --check it says instead whether they are what it would make.
set -euo pipefail
cd "$(dirname "$0")/.."
status=0
for kind in cpp:include/zkusb_monitor.h c:include/zkusb_monitor_c.h ids:docs/identifiers.md; do
  file=${kind#*:}
  if [ "${1:-}" = --check ]; then
    perl com/idl/make_headers.pl com/zkusb_monitor.idl "${kind%%:*}" | diff -u "$file" - || status=1
  else
    perl com/idl/make_headers.pl com/zkusb_monitor.idl "${kind%%:*}" >"$file"
  fi
done
[ "$status" -eq 0 ] || echo "that is not what the IDL says: run scripts/make-headers.sh"
exit "$status"

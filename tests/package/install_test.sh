#!/usr/bin/env bash
# What `cmake --install` lays out works where it lies: the client, its manual page and its completion.
#
#   install_test.sh BUILD WORK
set -euo pipefail
build=$1 work=$2
rm -rf "$work"
# Elsewhere than it was built for, as packagers do.
DESTDIR=$work/root cmake --install "$build" --prefix /usr >"$work.log" 2>&1 || { cat "$work.log"; exit 1; }
cd "$work/root/usr"
expect() { [ "$2" = "$3" ] || { printf 'FAILED: %s\n--- expected\n%s\n--- found\n%s\n' "$@"; exit 1; }; }
# Only what was installed may be found.
expect "zkusb D:" "$("$build/bin/zkusb" D:)" "$(env -u LD_LIBRARY_PATH bin/zkusb D:)"
expect "the manual page" "$(bin/zkusb --man-page)" "$(cat share/man/man1/zkusb.1)"
expect "the completion" find "$(bash -c '. share/bash-completion/completions/zkusb
  COMP_WORDS=(zkusb fi) COMP_CWORD=1; _zkusb; echo "${COMPREPLY[@]}"')"
if readelf -d bin/zkusb | grep RUNPATH | grep -v 'ORIGIN\]'; then echo "FAILED: it looks for libraries elsewhere"; exit 1; fi
echo "ok: client, manual page, completion"

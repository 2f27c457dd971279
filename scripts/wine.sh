# Sourced by the scripts that run Windows programs: where Wine keeps what it needs, outside of the
# checkout, and how a program is run. What is downloaded stays for the next time, so that a machine that
# is set up needs no network.

wine_home=${XDG_CACHE_HOME:-$HOME/.cache}/zkusbmonitor-wine

# One prefix per checkout: two of them under test at once must not see each other's registry.
wine_checkout=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd -P)
export WINEPREFIX="$wine_home/prefix-$(cksum <<<"$wine_checkout" | cut -d' ' -f1)"
export WINEARCH=win64 WINEDEBUG=${WINEDEBUG:--all}
# No question to install add-ons, no menu entries in the home folder, no display.
export WINEDLLOVERRIDES=${ZKUSB_WINE_OVERRIDES:-'mscoree=;mshtml=;winemenubuilder.exe='}
unset DISPLAY WAYLAND_DISPLAY

wine_version=$(dpkg-query -W -f='${Version}' libwine 2>/dev/null || true)
# The DLLs for 32-bit programs: those of the 32-bit package of the very same version.
wine_32_folder=$wine_home/libwine-i386-$wine_version
wine_32_dlls=$wine_32_folder/usr/lib/i386-linux-gnu/wine
[ ! -d "$wine_32_dlls" ] || export WINEDLLPATH=$wine_32_dlls

# Fetches the 32-bit DLLs with a configuration of apt that names their architecture, beside that of the
# machine, which stays as it is. False, with a line of the reason, where they cannot be had.
fetch_wine_32() {
  [ ! -d "$wine_32_dlls" ] || return 0
  [ -n "$wine_version" ] || { echo "libwine is not installed"; return 1; }
  mkdir -p "$wine_home"
  local work
  work=$(mktemp -d "$wine_home/fetch-XXXXXX")
  if fetch_wine_32_into "$work" >"$work/log" 2>&1; then
    rm -rf "$wine_32_folder"
    mv "$work/unpacked" "$wine_32_folder"
    rm -rf "$work"
    export WINEDLLPATH=$wine_32_dlls
  else
    echo "the package libwine:i386=$wine_version cannot be had: $(grep -a '^E:' "$work/log" | tail -1)"
    rm -rf "$work"
    return 1
  fi
}

fetch_wine_32_into() (
  cd "$1"
  mkdir -p lists/partial cache/archives/partial
  cat >apt.conf <<CONF
APT::Architectures { "$(dpkg --print-architecture)"; "i386"; };
APT::Sandbox::User "root";
Dir::State "$1";
Dir::State::status "$(apt-config shell status Dir::State::status/f | sed "s/^status='\(.*\)'$/\1/")";
Dir::Cache "$1/cache";
CONF
  export APT_CONFIG=$1/apt.conf
  # One source of several may be out of order and the package still there.
  timeout 300 apt-get update -qq || true
  timeout 600 apt-get download -qq "libwine:i386=$wine_version" || return 1
  timeout 120 dpkg -x libwine_*.deb unpacked
)

# Makes the prefix anew and leaves its server running, so that a program starts in a moment.
make_wine_prefix() {
  [ ! -d "$WINEPREFIX" ] || stop_wine
  rm -rf "$WINEPREFIX"
  mkdir -p "$WINEPREFIX"
  # The server that the first program would start ends with the last one, and refuses a second.
  timeout 30 wineserver -p || return 1
  timeout 180 wineboot -i || return 1
  # Windows that no display has to show.
  timeout 60 wine reg add 'HKCU\Software\Wine\Drivers' /v Graphics /d null /f || return 1
  # A program that crashes ends, and waits for no debugger.
  timeout 60 wine reg add 'HKLM\Software\Microsoft\Windows NT\CurrentVersion\AeDebug' /v Debugger /d 'cmd /c exit' /f || return 1
  # The desktop that is there already has looked for a display, and would refuse every window.
  stop_wine
  timeout 30 wineserver -p || return 1
  # Wine's services keep the output of the program that started them open: not one that is read.
  timeout 60 wine cmd /c exit >/dev/null 2>&1
}

# Ends the programs of this prefix and its server.
stop_wine() {
  timeout 30 wineserver -k || true
  timeout 30 wineserver -w || true
}

#!/usr/bin/env bash
# The class library for .NET: packed with the DLLs of this build, its sample published from that package alone, and run
# over a simulated PC into which a stick is plugged. What the machine lacks is skipped, aloud.
#
#   dotnet_test.sh RUN WORK          RUN runs a Windows program
set -euo pipefail
run=$1 work=$2
source=$(cd "$(dirname "$0")/../.." && pwd)
skip() {
  echo "skipped: .NET: $1"
  exit 77
}
command -v dotnet >/dev/null || skip "there is no dotnet command"
export DOTNET_CLI_TELEMETRY_OPTOUT=1 DOTNET_NOLOGO=1 DOTNET_CLI_HOME=$work/home

# Packs the class library and publishes its sample from the package. What the network brought is kept: the next run works
# without one. The package under test is not.
pack_and_publish() {
  find "$work" -mindepth 1 -maxdepth 1 ! -name home ! -name packages -exec rm -rf {} +
  rm -rf "$work/packages/zkusbmonitor.interop"
  mkdir -p "$work/native/x64" "$work/feed"
  cp -r "$source/dotnet/ZKUsbMonitor.Interop" "$work/library"
  cp -r "$source/samples/dotnet" "$work/sample"
  cp "$source/packaging/NOTICES.txt" "$work/native"
  cp "$source/build/windows-x64/ZKUsbMonitor.dll" "$work/native/x64"
  if [ -f "$source/build/windows-x86/ZKUsbMonitor.dll" ]; then
    mkdir "$work/native/x86"
    cp "$source/build/windows-x86/ZKUsbMonitor.dll" "$work/native/x86"
  else
    echo "without the 32-bit DLL: windows-x86 is not built"
  fi
  cd "$work"

  # Restoring needs packages of the run-time, once; compiling what is restored must work.
  restore() { # PROJECT OPTION...: first from what is here
    dotnet restore "$@" --source "$work/feed" >log 2>&1 || dotnet restore "$@" >log 2>&1
  }
  restore library -p:NativeFolder="$work/native" || skip "the reference assemblies cannot be restored: $(grep -m1 error log)"
  dotnet pack library --no-restore -c Release -p:Version="$(cat "$source/build/windows-x64/generated/version.txt")" \
    -p:NativeFolder="$work/native" -o feed >log 2>&1 || { tail -20 log; exit 1; }
  cmake -E tar tf feed/*.nupkg | sed 's/.* //' >names
  for name in runtimes/win-x64/native/ZKUsbMonitor.dll lib/net8.0/ZKUsbMonitor.Interop.dll NOTICES.txt; do
    grep -qx "$name" names || { echo "FAILED: the package has no $name"; exit 1; }
  done
  if [ -d native/x86 ] && ! grep -qx runtimes/win-x86/native/ZKUsbMonitor.dll names; then
    echo "FAILED: the package has no 32-bit DLL"
    exit 1
  fi

  # Its packages lie in a folder of their own: this one may not be the one that an earlier run left in the user's.
  restore sample -r win-x64 -p:RestoreAdditionalProjectSources="$work/feed" --packages "$work/packages" ||
    skip "the run-time for win-x64 cannot be restored: $(grep -m1 error log)"
  dotnet publish sample --no-restore -c Release -r win-x64 --self-contained -p:RestorePackagesPath="$work/packages" \
    -p:RestoreAdditionalProjectSources="$work/feed" -o out >log 2>&1 || { tail -20 log; exit 1; }
  [ -f out/ZKUsbMonitor.dll ] || { echo "FAILED: the DLL of the package is not beside the program"; exit 1; }
}

mkdir -p "$work"
# All that this depends on but the DLL. What is compiled is not compiled again before something of it changes.
inputs=$(cd "$source" && find dotnet samples/dotnet tests/package -type f ! -path '*/obj/*' ! -path '*/bin/*' -print0 |
  LC_ALL=C sort -z | xargs -0 sha256sum | sha256sum
  dotnet --version
  find "$source"/build/windows-x*/ -maxdepth 1 -name ZKUsbMonitor.dll)
if [ -f "$work/out/sticks.exe" ] && [ "$(cat "$work/published" 2>/dev/null)" = "$inputs" ]; then
  echo "the sample is the one that was published: nothing has changed since"
  cd "$work"
  cp "$source/build/windows-x64/ZKUsbMonitor.dll" out
else
  pack_and_publish
fi
cp "$source/build/windows-x64/ZKUsbMonitorSimulated.dll" out
ZKUSB_MACHINE=$("$run" winepath -w "$source/machines/dell-precision.json" | tr -d '\r')
ZKUSB_SCRIPT=$("$run" winepath -w "$source/machines/scripts/stick-comes-and-goes.json" | tr -d '\r')
export ZKUSB_MACHINE ZKUSB_SCRIPT
# Libraries of .NET name mscoree.dll.
export ZKUSB_WINE_OVERRIDES='mshtml=;winemenubuilder.exe=;winedbg.exe='
stick='Kingston DataTraveler 3.0 (F:), serial 60A44C413FD1B2A1C9A60135'
expected='there: SanDisk Extreme (D:), serial AA010603160707470215'$'\n'"attached: $stick"$'\n'"removed: $stick"
found=$(timeout 120 "$run" "$work/out/sticks.exe" 9 ZKUsbMonitorSimulated.dll 2>&1 | tr -d '\r') || true
[ "$found" = "$expected" ] || { printf 'FAILED: expected\n%s\nfound\n%s\n' "$expected" "$found"; exit 1; }
echo "$inputs" >"$work/published"
echo "ok: the package, and its sample"

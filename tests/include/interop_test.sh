#!/usr/bin/env bash
# The definitions for .NET against the header for C++: interfaces with their identifiers, and methods slot by slot.
set -euo pipefail
cd "$(dirname "$0")/../.."
# Parent has no name there, and the sink is asked for as a dispatch interface.
cpp() {
  sed -nE 's/^MIDL_INTERFACE\("([^"]*)"\) (\w+) .*/\2 \1/p; s/^  virtual HRESULT STDMETHODCALLTYPE (\w+)\(.*/  \1/p' \
    include/zkusb_monitor.h | sed 's/get_Parent/NotForUse/' |
    sed -E '/^IZKUMDeviceEvent /{s/.*/IZKDeviceEventCallBack 8C4D3DF5-889F-434C-BA1C-22F23FD7CB1B/}'
}
interop() {
  tr -d '\r' <dotnet/ZKUsbMonitor.Interop/Interfaces.cs |
    sed -nE 's/.*Guid\("([^"]*)"\).*/\1/; t keep; s/^public interface (\w+).*/\1/; t name; s/^    (\[[^]]*\] *)?[A-Za-z?]+ (\w+)\(.*\);$/  \2/p; b; :keep h; b; :name G; s/\n/ /; p'
}
lines=$(cpp | wc -l)
[ "$lines" -eq $((13 + 50)) ] || { echo "the header has $lines interfaces and methods"; exit 1; }
diff <(cpp) <(interop)
echo "ok: $lines interfaces and methods"

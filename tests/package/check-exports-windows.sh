#!/usr/bin/env bash
# The Windows twin of check-exports.sh: checks that the DLL exports its
# interface and no internals. A DLL exports exactly what carries
# __declspec(dllexport) (the export macro), so every name in its export table
# must belong to an exported class or to one of the interface's namespaces.
#
#     check-exports-windows.sh path/to/DorvanNebiConnector.dll
set -euo pipefail
library=$1
objdump=${OBJDUMP:-x86_64-w64-mingw32-objdump}
cxxfilt=${CXXFILT:-x86_64-w64-mingw32-c++filt}

interface='^(BackupRestoreComponent|DorvanNebiConnector|DorvanNebiConnectorComponent|DorvanNebiLoginComponent|DorvanNebiServicesComponent|DorvanNebiServiceInfo|DorvanNebiResource|DorvanNebiHTTPS[A-Za-z]*|DorvanNebiConnectorContext|DorvanNebiConnectorTypes)::'
interface_util='^DorvanNebiConnectorUtil::(GetLocalhostPort|MakeLocalhostURI|SendHTTPRequest|MakeCloudURI)\('

# The names of the export table ("[Ordinal/Name Pointer] Table"), demangled.
exported=$("$objdump" -p "$library" |
    sed -n '/\[Ordinal\/Name Pointer\] Table/,/^$/p' |
    awk '/^\t\[/ { print $NF }' | "$cxxfilt")
count=$(printf '%s\n' "$exported" | grep -c . || true)
if [ "$count" -eq 0 ]; then
    echo "$library exports nothing (or is no DLL)" >&2
    exit 1
fi
strays=$(printf '%s\n' "$exported" | grep -Ev "$interface" | grep -Ev "$interface_util" |
    grep -Ev '^(typeinfo|typeinfo name|vtable|VTT) for ' || true)

if [ -n "$strays" ]; then
    echo "symbols exported that are not part of the interface:" >&2
    printf '%s\n' "$strays" >&2
    exit 1
fi
for required in 'DorvanNebiConnectorContext::InitializeDorvanNebiConnector()' \
                'DorvanNebiConnectorContext::UninitializeDorvanNebiConnector()' \
                'DorvanNebiConnector::GetInstance()'; do
    if ! printf '%s\n' "$exported" | grep -qF "$required"; then
        echo "the interface function $required is not exported" >&2
        exit 1
    fi
done
echo "exported symbols: $count, all of them the interface"

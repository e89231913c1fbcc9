#!/usr/bin/env bash
# Checks that the shared library exports its interface and no internals: every
# function it defines for the outside world belongs to an exported class or
# to one of the interface's namespaces. Template code of the libraries it uses
# (weak and unique symbols) does not count.
#
#     check-exports.sh path/to/libDorvanNebiConnector.so
set -euo pipefail
library=$1

interface='^(BackupRestoreComponent|DorvanNebiConnector|DorvanNebiConnectorComponent|DorvanNebiLoginComponent|DorvanNebiServicesComponent|DorvanNebiServiceInfo|DorvanNebiResource|DorvanNebiHTTPS[A-Za-z]*|DorvanNebiConnectorContext|DorvanNebiConnectorTypes)::'
interface_util='^DorvanNebiConnectorUtil::(GetLocalhostPort|MakeLocalhostURI|SendHTTPRequest|MakeCloudURI)\('

exported=$(nm -D --defined-only -C "$library" | awk '$2 == "T" || $2 == "B" || $2 == "D" || $2 == "R" { $1 = ""; $2 = ""; sub(/^  /, ""); print }')
count=$(printf '%s\n' "$exported" | grep -c . || true)
strays=$(printf '%s\n' "$exported" | grep -Ev "$interface" | grep -Ev "$interface_util" | grep -Ev '^(typeinfo|vtable|VTT) ' || true)

if [ -n "$strays" ]; then
    echo "symbols exported that are not part of the interface:" >&2
    printf '%s\n' "$strays" >&2
    exit 1
fi
for required in 'DorvanNebiConnectorContext::InitializeDorvanNebiConnector()' 'DorvanNebiConnector::GetInstance()'; do
    if ! printf '%s\n' "$exported" | grep -qF "$required"; then
        echo "the interface function $required is not exported" >&2
        exit 1
    fi
done
echo "exported symbols: $count, all of them the interface"

#!/usr/bin/env bash
# Proves the Windows dependency prefix and cmake/mingw-w64-x86_64.cmake work:
# builds scripts/windows/smoke (wxWidgets base, POCO Net/NetSSL/Crypto/Util,
# OpenSSL, JsonCpp, Boost.Asio/Signals2, GoogleTest) for Windows and runs its
# tests under Wine through ctest.
#
#   bash scripts/windows/smoke.sh
#
# Run-time DLLs: the smoke project copies every DLL of <prefix>/bin beside
# smoke.exe after linking (see smoke/CMakeLists.txt), so no WINEPATH is set.
#
# Environment:
#   WINEPREFIX  Wine prefix to use (default <cache root>/wineprefix, created
#               when missing); note that `wineserver -k` at the end stops every
#               Wine process of that prefix.
#   WINEDEBUG   Wine's debug channels (default -all: quiet).
set -euo pipefail

SCRIPT_DIR=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
REPO_ROOT=$(cd "$SCRIPT_DIR/../.." && pwd)

log() { printf '[smoke %(%H:%M:%S)T] %s\n' -1 "$*" >&2; }

# 1. The dependency prefix (returns at once when cached).
PREFIX=$(bash "$SCRIPT_DIR/build-deps.sh" | tail -n 1)
[[ -f $PREFIX/.complete ]] || { log "build-deps.sh gave no complete prefix"; exit 1; }
CACHE_ROOT=$(dirname "$PREFIX")
log "prefix: $PREFIX"

# 2. Configure and build the smoke project (build tree outside the repository).
BUILD=$CACHE_ROOT/smoke-build
# --fresh: the prefix path changes with the recipe, and CMake caches where it
# found each package.
cmake --fresh -S "$SCRIPT_DIR/smoke" -B "$BUILD" -G Ninja \
    -DCMAKE_TOOLCHAIN_FILE="$REPO_ROOT/cmake/mingw-w64-x86_64.cmake" \
    -DDORVAN_WINDOWS_PREFIX="$PREFIX" \
    -DCMAKE_BUILD_TYPE=Release >&2
cmake --build "$BUILD" -j 2 >&2

# 3. Wine: a prefix of our own, a persistent wineserver and Wine's background
#    services started before ctest, all with standard streams detached:
#    otherwise those long-lived processes inherit ctest's output pipe and ctest
#    waits for them forever.
export WINEPREFIX=${WINEPREFIX:-$CACHE_ROOT/wineprefix}
export WINEDEBUG=${WINEDEBUG:--all}
export WINEDLLOVERRIDES=${WINEDLLOVERRIDES:-mscoree,mshtml=}   # no Mono/Gecko install prompts
if [[ ! -f $WINEPREFIX/system.reg ]]; then
    log "creating the Wine prefix $WINEPREFIX"
    mkdir -p "$WINEPREFIX"
    wineboot -i </dev/null >/dev/null 2>&1
    wineserver -w </dev/null >/dev/null 2>&1
fi
stop_wine() { wineserver -k </dev/null >/dev/null 2>&1 || true; }
trap stop_wine EXIT
wineserver -p </dev/null >/dev/null 2>&1
wine cmd /c exit </dev/null >/dev/null 2>&1

# 4. Run the tests (.exe files start through CMAKE_CROSSCOMPILING_EMULATOR=wine).
log "running the tests under Wine"
if ctest --test-dir "$BUILD" --output-on-failure --timeout 120 >&2; then
    echo "smoke: PASS"
else
    echo "smoke: FAIL"
    exit 1
fi

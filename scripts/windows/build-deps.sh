#!/usr/bin/env bash
# Builds the Windows (x86_64, mingw-w64) dependency prefix of DorvanNebiConnector
# from version-pinned Debian 12 source packages, or reuses a cached one.
#
#   prefix=$(bash scripts/windows/build-deps.sh)
#
# Prints the prefix path as the last (and only) line on stdout; progress goes
# to stderr, the build tools' own output to log files (kept in the prefix,
# under build-logs/, and shown in part when a step fails).
#
# The prefix lives outside the repository, in
#   ${DORVAN_WINDOWS_CACHE:-${XDG_CACHE_HOME:-$HOME/.cache}/dorvan-nebi-windows}/<hash>
# where <hash> covers this script, scripts/windows/patches/** , the pinned
# versions and the cross-compiler packages' versions. A complete build writes
# <prefix>/.complete last; a prefix without it (an interrupted build) is wiped
# and rebuilt. Downloaded source packages are kept in <cache>/sources/, so a
# rebuild after a recipe change does not download them again.
#
# Layout of the prefix:
#   bin/          all run-time DLLs (OpenSSL, POCO, wxWidgets, JsonCpp and the
#                 mingw-w64 runtime), openssl.exe, wx-config
#   lib/          import libraries (*.dll.a), static GoogleTest, lib/cmake/
#                 (GTest, jsoncpp), lib/wx/ (wx-config data, wx/setup.h)
#   cmake/        POCO's CMake package files (POCO's Windows layout)
#   include/      headers; include/boost is a link to /usr/include/boost
#   build-logs/   logs of the build
#
# Patches to third-party sources: scripts/windows/patches/<source package>/*.patch
# (source package names as below: openssl, poco, wxwidgets3.2, libjsoncpp,
# googletest), applied with `patch -p1` in name order after the Debian patches
# chosen below; each begins with a line saying why.
#
# Use the prefix with cmake/mingw-w64-x86_64.cmake (see that file).
#
# Environment:
#   DORVAN_WINDOWS_CACHE  cache root (default above)
#   DORVAN_WINDOWS_JOBS   parallel compile jobs (default 2)
set -euo pipefail

# Everything below writes to stderr; stdout (fd 3) only gets the prefix path.
exec 3>&1 1>&2

SCRIPT_DIR=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
PATCH_DIR="$SCRIPT_DIR/patches"
TRIPLET=x86_64-w64-mingw32
JOBS=${DORVAN_WINDOWS_JOBS:-2}
NICE=(nice -n 10)

# --- Pinned Debian 12 (bookworm) source packages -----------------------------
# Versions listed by `apt-cache showsrc` for bookworm. OpenSSL: the bookworm
# point-release version; the newer bookworm-security revision's
# debian.tar.xz was not downloadable (404) when this was written.
OPENSSL_VERSION=3.0.20-1~deb12u2
POCO_VERSION=1.11.0-3+deb12u1
WX_VERSION=3.2.2+dfsg-2
JSONCPP_VERSION=1.9.5-4
GTEST_VERSION=1.12.1-0.2
SOURCES=(
    "openssl=$OPENSSL_VERSION"
    "poco=$POCO_VERSION"
    "wxwidgets3.2=$WX_VERSION"
    "libjsoncpp=$JSONCPP_VERSION"
    "googletest=$GTEST_VERSION"
)

# Debian's own patches (debian/patches of each source package) that we apply.
# OpenSSL: the upstream fixes Debian carries (a config race fix and security
# fixes with their tests). Left out: debian-targets, man-section, no-symbolic,
# pic, c_rehash-compat, the ktls Configure change, Remove-the-provider-section
# and Fix-tests-for-new-default-security-level (Debian packaging, Linux only,
# or openssl.cnf/test changes that do not apply to this build).
DEBIAN_PATCHES_openssl=(
    conf-Serialize-allocation-free-of-ssl_names.patch
    Reject-oversized-inputs-in-ASN1_mbstring_ncopy.patch
    cms-kek_unwrap_key-Fix-out-of-bounds-read-in-check-byte-v.patch
    cms-kek_unwrap_key-test-for-fix-out-of-bounds-read-in-che.patch
    Avoid-length-truncation-in-ASN1_STRING_set.patch
    CMS-Produce-error-when-AEAD-algorithms-are-used-in-envelo.patch
    Reject-potentially-forged-encrypted-CMS-AuthEnvelopedData.patch
    Add-tests-for-CVE-2026-34182.patch
    Fix-potential-NULL-dereference-processing-CMS-PasswordRec.patch
    Test-for-CVE-2026-42766.patch
    Match-the-local-q-DHX-parameter-against-the-peer-s-q.patch
    Apply-the-buffered-IV-on-the-AES-OCB-EVP_Cipher-path.patch
    Fix-handling-of-empty-ciphertext-messages-in-AES-SIV.patch
    Fix-possible-use-after-free-in-OpenSSL-PKCS7_verify.patch
    Test-for-CVE-2026-45447-UAF-in-PKCS7_verify.patch
)
# POCO: only the security fix. The others disable tests, add GNU Hurd/armel
# support, move libraries to Debian's multiarch folder or disable the CMake
# package installation (which we need).
DEBIAN_PATCHES_poco=(
    CVE-2023-52389.patch
)
# wxWidgets: none (reproducible docs, a Linux ABI warning, X11/GTK fixes).
DEBIAN_PATCHES_wxwidgets3_2=()
# JsonCpp has none.
DEBIAN_PATCHES_libjsoncpp=()
# GoogleTest: none. 0001 fixes GTEST_HAS_PTHREAD for pthread builds, but
# upstream already disables pthreads on MinGW consistently; 0005/0006 only
# change how Debian splits the CMake packages.
DEBIAN_PATCHES_googletest=()

# --- Build-machine packages ---------------------------------------------------
HOST_PACKAGES=(
    gcc-mingw-w64-x86-64-posix   # C cross compiler (posix threads runtime)
    g++-mingw-w64-x86-64-posix   # C++ cross compiler: std::thread/std::mutex need the posix flavour
    binutils-mingw-w64-x86-64    # windres, windmc (POCO's message files), ar, dlltool
    mingw-w64-tools              # x86_64-w64-mingw32-pkg-config, used by wxWidgets' configure
    wine                         # the `wine` command: runs the .exe files (tests, CMake emulator)
    wine64                       # the 64-bit Wine loader behind `wine`
    dpkg-dev                     # dpkg-source: unpacks and checks the Debian source packages
    bzip2                        # POCO's orig tarball is .tar.bz2
    xz-utils                     # wxWidgets' orig tarball and the debian/ tarballs are .tar.xz
    patch                        # applies Debian's and our patches
    cmake                        # POCO, JsonCpp, GoogleTest (and the project) build with CMake
    ninja-build                  # generator for the CMake builds
    make                         # OpenSSL and wxWidgets build with make
    perl                         # OpenSSL's Configure
    libboost-dev                 # Boost headers (header-only use: Asio, Signals2, PropertyTree)
    debian-archive-keyring       # verifies the Release files of the source package lists
)

log() { printf '[build-deps %(%H:%M:%S)T] %s\n' -1 "$*" >&2; }
die() { log "ERROR: $*"; exit 1; }

# The cross builds must not see the caller's Linux build settings.
unset CC CXX CPP CFLAGS CXXFLAGS CPPFLAGS LDFLAGS LIBS AR RANLIB RC \
      PKG_CONFIG_PATH CMAKE_PREFIX_PATH CMAKE_TOOLCHAIN_FILE CMAKE_GENERATOR \
      CMAKE_BUILD_TYPE MAKEFLAGS MFLAGS MAKELEVEL DESTDIR

install_host_packages() {
    local missing=() p
    for p in "${HOST_PACKAGES[@]}"; do
        if [[ $(dpkg-query -W -f='${db:Status-Status}' "$p" 2>/dev/null) != installed ]]; then
            missing+=("$p")
        fi
    done
    ((${#missing[@]} == 0)) && return 0
    ((EUID == 0)) || die "missing packages (run as root to install them): ${missing[*]}"
    log "installing Debian packages: ${missing[*]}"
    apt-get update -q >&2
    DEBIAN_FRONTEND=noninteractive apt-get install -y -q --no-install-recommends "${missing[@]}" >&2
}

# Hash of everything that decides the prefix's content.
recipe_hash() {
    {
        printf 'source %s\n' "${SOURCES[@]}"
        dpkg-query -W -f='tool ${Package}=${Version}\n' \
            gcc-mingw-w64-x86-64-posix g++-mingw-w64-x86-64-posix \
            binutils-mingw-w64-x86-64 mingw-w64-x86-64-dev
        (cd "$SCRIPT_DIR" && find build-deps.sh patches -type f -print0 2>/dev/null |
            LC_ALL=C sort -z | xargs -0 sha256sum)
    } | sha256sum | cut -c1-16
}

# --- Source packages -----------------------------------------------------------
# A private APT configuration: deb-src entries copied from the system's
# entries for deb.debian.org, with lists and caches under the cache root. The
# system's own apt configuration and state are left untouched.
write_source_list() {
    local out=$1 entries
    # One line per entry: URI<TAB>suite<TAB>components<TAB>keyring
    entries=$(
        {
            for f in /etc/apt/sources.list.d/*.sources; do
                [[ -f $f ]] || continue
                awk -v RS= -F'\n' '
                    {
                        delete v; key = ""
                        for (i = 1; i <= NF; i++) {
                            line = $i
                            if (line ~ /^#/) continue
                            if (line ~ /^[ \t]/) { if (key != "signed-by") v[key] = v[key] " " line; continue }
                            if (match(line, /^[A-Za-z-]+:/)) {
                                key = tolower(substr(line, 1, RLENGTH - 1))
                                v[key] = substr(line, RLENGTH + 1)
                            }
                        }
                        if (tolower(v["enabled"]) ~ /no/) next
                        if (v["types"] !~ /(^|[ \t])deb(-src)?([ \t]|$)/) next
                        kr = v["signed-by"]; gsub(/^[ \t]+|[ \t]+$/, "", kr)
                        if (kr !~ /^\//) kr = "/usr/share/keyrings/debian-archive-keyring.gpg"
                        comps = v["components"]; gsub(/^[ \t]+|[ \t]+$/, "", comps)
                        n = split(v["uris"], uris, /[ \t]+/); m = split(v["suites"], suites, /[ \t]+/)
                        for (a = 1; a <= n; a++) for (b = 1; b <= m; b++)
                            if (uris[a] ~ /deb\.debian\.org/ && suites[b] != "")
                                printf "%s\t%s\t%s\t%s\n", uris[a], suites[b], comps, kr
                    }' "$f"
            done
            for f in /etc/apt/sources.list /etc/apt/sources.list.d/*.list; do
                [[ -f $f ]] || continue
                awk '
                    $1 != "deb" && $1 != "deb-src" { next }
                    {
                        kr = "/usr/share/keyrings/debian-archive-keyring.gpg"; i = 2
                        if ($2 ~ /^\[/) {
                            for (; i <= NF; i++) {
                                if ($i ~ /signed-by=/) { kr = $i; sub(/.*signed-by=/, "", kr); sub(/\]$/, "", kr) }
                                if ($i ~ /\]$/) { i++; break }
                            }
                        }
                        uri = $i; suite = $(i + 1); comps = ""
                        for (j = i + 2; j <= NF; j++) comps = comps (comps == "" ? "" : " ") $j
                        if (uri ~ /deb\.debian\.org/) printf "%s\t%s\t%s\t%s\n", uri, suite, comps, kr
                    }' "$f"
            done
        } | LC_ALL=C sort -u
    )
    if [[ -z $entries ]]; then
        log "no deb.debian.org entry in the system's APT sources; using Debian 12 defaults"
        entries=$(printf '%s\t%s\t%s\t%s\n' \
            http://deb.debian.org/debian bookworm main /usr/share/keyrings/debian-archive-keyring.gpg \
            http://deb.debian.org/debian bookworm-updates main /usr/share/keyrings/debian-archive-keyring.gpg \
            http://deb.debian.org/debian-security bookworm-security main /usr/share/keyrings/debian-archive-keyring.gpg)
    fi
    while IFS=$'\t' read -r uri suite comps kr; do
        printf 'Types: deb-src\nURIs: %s\nSuites: %s\nComponents: %s\nSigned-By: %s\n\n' \
            "$uri" "$suite" "$comps" "$kr"
    done <<<"$entries" >"$out"
}

APT_READY=
apt_private() {
    local apt_dir=$CACHE_ROOT/apt
    APT_OPTS=(
        -o "Dir::Etc::sourcelist=$apt_dir/sources.sources"
        -o "Dir::Etc::sourceparts=$apt_dir/sources.list.d"
        -o "Dir::State::Lists=$apt_dir/lists"
        -o "Dir::Cache=$apt_dir/cache"
    )
    [[ -n $APT_READY ]] && return 0
    mkdir -p "$apt_dir/sources.list.d" "$apt_dir/lists/partial" "$apt_dir/cache/archives/partial"
    write_source_list "$apt_dir/sources.sources"
    log "updating the private source package lists ($apt_dir)"
    apt-get "${APT_OPTS[@]}" update -q >"$apt_dir/update.log" 2>&1 ||
        { tail -n 20 "$apt_dir/update.log" >&2; die "apt-get update of the source lists failed"; }
    APT_READY=1
}

# Downloads <package>=<version> into $SRC_CACHE unless already there.
fetch_source() {
    local pkg=${1%%=*} ver=${1#*=} dsc tmp
    dsc="$SRC_CACHE/${pkg}_${ver#*:}.dsc"
    [[ -f $dsc ]] && return 0
    apt_private
    if ! apt-cache "${APT_OPTS[@]}" showsrc "$pkg" 2>/dev/null |
            awk '/^Version:/ {print $2}' | grep -qxF "$ver"; then
        die "$pkg $ver is not listed by apt-cache showsrc; available: $(apt-cache "${APT_OPTS[@]}" showsrc "$pkg" 2>/dev/null | awk '/^Version:/ {printf "%s ", $2}')"
    fi
    log "downloading source package $pkg $ver"
    tmp=$(mktemp -d "$SRC_CACHE/.download.XXXXXX")
    # apt drops privileges to _apt for downloads: let it write there.
    if ((EUID == 0)) && getent passwd _apt >/dev/null; then chown _apt "$tmp"; fi
    (cd "$tmp" && apt-get "${APT_OPTS[@]}" source --download-only -q "$pkg=$ver") \
        >"$tmp.log" 2>&1 || { tail -n 20 "$tmp.log" >&2; die "download of $pkg $ver failed"; }
    # The .dsc is moved last: its presence means the download is complete.
    find "$tmp" -maxdepth 1 -type f ! -name '*.dsc' -exec mv -f {} "$SRC_CACHE/" \;
    mv -f "$tmp"/*.dsc "$SRC_CACHE/"
    rm -rf "$tmp" "$tmp.log"
}

# Unpacks a source package into $BUILD_DIR/<package>, then applies the
# selected Debian patches and our patches from scripts/windows/patches/<package>.
unpack_source() {
    local pkg=${1%%=*} ver=${1#*=} dir=$BUILD_DIR/${1%%=*} var p
    log "unpacking $pkg $ver"
    dpkg-source --skip-patches -x "$SRC_CACHE/${pkg}_${ver#*:}.dsc" "$dir" \
        >"$LOG_DIR/unpack-$pkg.log" 2>&1 || { tail -n 20 "$LOG_DIR/unpack-$pkg.log" >&2; die "unpacking $pkg failed"; }
    var="DEBIAN_PATCHES_${pkg//[.-]/_}[@]"
    for p in "${!var}"; do
        log "  Debian patch $p"
        patch -d "$dir" -p1 --forward --batch --no-backup-if-mismatch -s <"$dir/debian/patches/$p" \
            >>"$LOG_DIR/unpack-$pkg.log" 2>&1 || die "Debian patch $p does not apply to $pkg"
    done
    if [[ -d $PATCH_DIR/$pkg ]]; then
        for p in "$PATCH_DIR/$pkg"/*.patch; do
            [[ -f $p ]] || continue
            log "  patch ${p#"$SCRIPT_DIR"/}"
            patch -d "$dir" -p1 --forward --batch --no-backup-if-mismatch -s <"$p" \
                >>"$LOG_DIR/unpack-$pkg.log" 2>&1 || die "patch $p does not apply to $pkg"
        done
    fi
}

# Runs a build step in a subshell, its output in $LOG_DIR/<name>.log. (Not
# inside `if`: bash ignores `set -e` in functions called from a condition.)
step() {
    local name=$1 start=$SECONDS rc
    shift
    log "$name ..."
    set +e
    (set -e; "$@") >"$LOG_DIR/$name.log" 2>&1
    rc=$?
    set -e
    if ((rc != 0)); then
        tail -n 40 "$LOG_DIR/$name.log" >&2
        die "$name failed (full log: $LOG_DIR/$name.log)"
    fi
    log "$name done ($((SECONDS - start)) s)"
}

# --- The builds -----------------------------------------------------------------
CROSS_DEFINES="-D_WIN32_WINNT=0x0A00"   # Windows 10, as in cmake/mingw-w64-x86_64.cmake

build_openssl() {
    cd "$BUILD_DIR/openssl"
    # OPENSSLDIR, ENGINESDIR and MODULESDIR are derived from --prefix and end up
    # as (meaningless on Windows) strings in the DLLs; the default and base
    # providers are built in, so nothing is loaded from there.
    "${NICE[@]}" ./Configure mingw64 --cross-compile-prefix=$TRIPLET- \
        CC=gcc-posix CXX=g++-posix \
        shared no-tests --prefix="$PREFIX" --libdir=lib $CROSS_DEFINES
    "${NICE[@]}" make -j"$JOBS"
    make install_sw
    # Only the DLLs are to be linked: drop the static archives.
    rm -f "$PREFIX/lib/libcrypto.a" "$PREFIX/lib/libssl.a"
}

write_cmake_toolchain() {
    # Minimal toolchain for the dependencies themselves (the project's
    # cmake/mingw-w64-x86_64.cmake adds consumer settings on top of this).
    cat >"$BUILD_DIR/toolchain.cmake" <<EOF
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR x86_64)
set(CMAKE_C_COMPILER $TRIPLET-gcc-posix)
set(CMAKE_CXX_COMPILER $TRIPLET-g++-posix)
set(CMAKE_RC_COMPILER $TRIPLET-windres)
set(CMAKE_MC_COMPILER $TRIPLET-windmc)
set(CMAKE_C_FLAGS_INIT "$CROSS_DEFINES")
set(CMAKE_CXX_FLAGS_INIT "$CROSS_DEFINES")
set(CMAKE_FIND_ROOT_PATH "$PREFIX" /usr/$TRIPLET)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
EOF
}

cmake_build() {   # cmake_build <source dir> <build dir> <cmake options...>
    local src=$1 bld=$2
    shift 2
    cmake -S "$src" -B "$bld" -G Ninja \
        -DCMAKE_TOOLCHAIN_FILE="$BUILD_DIR/toolchain.cmake" \
        -DCMAKE_BUILD_TYPE=Release -DCMAKE_INSTALL_PREFIX="$PREFIX" "$@"
    "${NICE[@]}" cmake --build "$bld" -j "$JOBS"
    cmake --install "$bld"
}

build_poco() {
    # Foundation, Net, Util (without XML/JSON), Crypto and NetSSL (OpenSSL;
    # Debian's source has no NetSSL_Win) as DLLs; bundled PCRE and zlib.
    cmake_build "$BUILD_DIR/poco" "$BUILD_DIR/poco-build" \
        -DBUILD_SHARED_LIBS=ON -DENABLE_TESTS=OFF -DPOCO_UNBUNDLED=OFF \
        -DOPENSSL_ROOT_DIR="$PREFIX" -DFORCE_OPENSSL=ON \
        -DENABLE_FOUNDATION=ON -DENABLE_NET=ON -DENABLE_UTIL=ON \
        -DENABLE_CRYPTO=ON -DENABLE_NETSSL=ON -DENABLE_NETSSL_WIN=OFF \
        -DENABLE_XML=OFF -DENABLE_JSON=OFF -DENABLE_ENCODINGS=OFF \
        -DENABLE_ENCODINGS_COMPILER=OFF -DENABLE_MONGODB=OFF -DENABLE_REDIS=OFF \
        -DENABLE_PDF=OFF -DENABLE_SEVENZIP=OFF -DENABLE_ZIP=OFF \
        -DENABLE_CPPPARSER=OFF -DENABLE_POCODOC=OFF -DENABLE_PAGECOMPILER=OFF \
        -DENABLE_PAGECOMPILER_FILE2PAGE=OFF -DENABLE_ACTIVERECORD=OFF \
        -DENABLE_ACTIVERECORD_COMPILER=OFF -DENABLE_DATA=OFF \
        -DENABLE_DATA_SQLITE=OFF -DENABLE_DATA_MYSQL=OFF \
        -DENABLE_DATA_POSTGRESQL=OFF -DENABLE_DATA_ODBC=OFF -DENABLE_JWT=OFF \
        -DENABLE_APACHECONNECTOR=OFF
}

build_jsoncpp() {
    cmake_build "$BUILD_DIR/libjsoncpp" "$BUILD_DIR/jsoncpp-build" \
        -DBUILD_SHARED_LIBS=ON -DBUILD_STATIC_LIBS=OFF -DBUILD_OBJECT_LIBS=OFF \
        -DJSONCPP_WITH_TESTS=OFF -DJSONCPP_WITH_POST_BUILD_UNITTEST=OFF \
        -DJSONCPP_WITH_CMAKE_PACKAGE=ON -DJSONCPP_WITH_PKGCONFIG_SUPPORT=ON
}

build_googletest() {
    # Static: test executables need not carry another DLL.
    cmake_build "$BUILD_DIR/googletest" "$BUILD_DIR/googletest-build" \
        -DBUILD_SHARED_LIBS=OFF -DBUILD_GMOCK=ON -DINSTALL_GTEST=ON
}

build_wxwidgets() {
    local src=$BUILD_DIR/wxwidgets3.2 bld=$BUILD_DIR/wxwidgets-build h
    mkdir -p "$bld"
    cd "$bld"
    # Base library only (wxbase + wxnet DLLs), no GUI. Debian's tarball has
    # no bundled zlib or expat, hence no zlib streams and no wxXML; the
    # regular expressions use the bundled PCRE2.
    "${NICE[@]}" "$src/configure" --host=$TRIPLET --build="$(dpkg-architecture -qDEB_BUILD_GNU_TYPE)" \
        --prefix="$PREFIX" CC=$TRIPLET-gcc-posix CXX=$TRIPLET-g++-posix \
        CPPFLAGS="$CROSS_DEFINES" \
        --disable-gui --enable-shared --enable-unicode \
        --with-zlib=no --without-expat --with-regex=builtin \
        --without-liblzma --without-libcurl --disable-webrequest
    "${NICE[@]}" make -j"$JOBS"
    make install
    # A base-only install leaves out wx/msw/*.h headers that installed headers
    # still include (wx/init.h -> wx/msw/init.h, ...): add the missing ones.
    (cd "$src/include" && find wx/msw -name '*.h') | while read -r h; do
        [[ -e $PREFIX/include/wx-3.2/$h ]] || install -D -m 644 "$src/include/$h" "$PREFIX/include/wx-3.2/$h"
    done
    # make install links bin/wx-config with an absolute path; make it relative.
    h=$(readlink "$PREFIX/bin/wx-config")
    ln -sfn "../lib/wx/config/$(basename "$h")" "$PREFIX/bin/wx-config"
    "$PREFIX/bin/wx-config" --host=$TRIPLET --libs base,net
}

finish_prefix() {
    local dll path
    # The mingw-w64 runtime DLLs every C++ DLL above depends on.
    for dll in libstdc++-6.dll libgcc_s_seh-1.dll libwinpthread-1.dll; do
        path=$($TRIPLET-g++-posix -print-file-name=$dll)
        [[ -f $path ]] || die "runtime DLL $dll not found"
        install -m 644 "$path" "$PREFIX/bin/"
    done
    # Boost: header-only and not copied; a link keeps /usr/include itself out
    # of the cross compiler's include path.
    ln -sfn /usr/include/boost "$PREFIX/include/boost"
    # Sanity: every DLL's imports must be Windows system DLLs or DLLs in bin/.
    for dll in "$PREFIX"/bin/*.dll; do
        $TRIPLET-objdump -p "$dll" | awk '/DLL Name:/ {print $3}' | while read -r dep; do
            case ${dep,,} in
                kernel32.dll|advapi32.dll|user32.dll|ws2_32.dll|iphlpapi.dll|msvcrt.dll|ole32.dll|\
                oleaut32.dll|shell32.dll|shlwapi.dll|version.dll|crypt32.dll|uuid.dll|winhttp.dll|\
                rpcrt4.dll|bcrypt.dll|secur32.dll|mswsock.dll|netapi32.dll|userenv.dll|gdi32.dll|\
                comctl32.dll|comdlg32.dll|winmm.dll|winspool.drv|psapi.dll|dbghelp.dll) ;;
                *) [[ -n $(find "$PREFIX/bin" -maxdepth 1 -iname "$dep") ]] ||
                       { echo "$(basename "$dll") imports $dep, which is not in bin/"; exit 1; } ;;
            esac
        done
    done
}

# --- Main -------------------------------------------------------------------------
install_host_packages

CACHE_ROOT=${DORVAN_WINDOWS_CACHE:-${XDG_CACHE_HOME:-${HOME:?HOME is not set}/.cache}/dorvan-nebi-windows}
HASH=$(recipe_hash)
PREFIX=$CACHE_ROOT/$HASH
STAMP=$PREFIX/.complete

if [[ -f $STAMP ]]; then
    log "cached prefix is complete: $PREFIX"
    echo "$PREFIX" >&3
    exit 0
fi

mkdir -p "$CACHE_ROOT"
# One build of a given prefix at a time; a second caller waits, then reuses it.
exec 9>"$CACHE_ROOT/.lock-$HASH"
flock 9
if [[ -f $STAMP ]]; then
    log "prefix was completed by another run: $PREFIX"
    echo "$PREFIX" >&3
    exit 0
fi

TOTAL_START=$SECONDS
log "building the Windows dependency prefix $PREFIX"
SRC_CACHE=$CACHE_ROOT/sources
BUILD_DIR=$CACHE_ROOT/build-$HASH
LOG_DIR=$PREFIX/build-logs
rm -rf "$PREFIX" "$BUILD_DIR"   # leftovers of an interrupted build
mkdir -p "$SRC_CACHE" "$BUILD_DIR" "$LOG_DIR"

for s in "${SOURCES[@]}"; do fetch_source "$s"; done
for s in "${SOURCES[@]}"; do unpack_source "$s"; done
write_cmake_toolchain

export PKG_CONFIG_LIBDIR=$PREFIX/lib/pkgconfig   # never the Linux .pc files
step openssl    build_openssl
step poco       build_poco
step jsoncpp    build_jsoncpp
step googletest build_googletest
step wxwidgets  build_wxwidgets
step finish     finish_prefix

{
    printf 'hash %s\n' "$HASH"
    printf 'built %s in %d s\n' "$(date -u +%Y-%m-%dT%H:%M:%SZ)" "$((SECONDS - TOTAL_START))"
    printf 'source %s\n' "${SOURCES[@]}"
} >"$STAMP.tmp"
rm -rf "$BUILD_DIR"
mv "$STAMP.tmp" "$STAMP"   # written last: marks the prefix complete
log "done in $((SECONDS - TOTAL_START)) s: $PREFIX"
echo "$PREFIX" >&3

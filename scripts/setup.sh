# SPDX-License-Identifier: Apache-2.0
# shellcheck shell=bash
# Sourced by the other scripts, with the checkout as the current directory: what they need,
# and builds that show their progress in one line.

# The libraries of kestlog; without one of them it, or a command of it, is left out of a build.
# shellcheck disable=SC2034
kest_reader_libraries=(nlohmann-json3-dev libarchive-dev zlib1g-dev libsndfile1-dev)

# Whether there is what a Debian package brings. Looks for the tool itself, so that it also
# tells on a system that has no such package.
kest_has() {
    case "$1" in
        g++) command -v c++ >/dev/null ;;
        clang) command -v clang++ >/dev/null ;;
        chromium)  # Ubuntu has a script of that name that only tells of its snap
            chromium --version >/dev/null 2>&1 || chromium-browser --version >/dev/null 2>&1
            ;;
        s6) command -v s6-log >/dev/null ;;
        runit) command -v svlogd >/dev/null ;;
        daemontools) command -v multilog >/dev/null ;;
        apache2-utils) command -v rotatelogs >/dev/null ;;
        dpkg-dev) command -v dpkg-shlibdeps >/dev/null ;;
        g++-*) command -v "${1#g++-}-g++" >/dev/null ;;
        qemu-user-static) command -v qemu-arm-static >/dev/null || command -v qemu-arm >/dev/null ;;
        musl-tools) command -v musl-gcc >/dev/null ;;
        googletest) [ -e /usr/src/googletest/CMakeLists.txt ] ;;
        libgtest-dev) kest_includes gtest/gtest.h ;;
        nlohmann-json3-dev) kest_includes nlohmann/json.hpp ;;
        libarchive-dev) kest_includes archive.h ;;
        zlib1g-dev) kest_includes zlib.h ;;
        libsndfile1-dev) kest_includes sndfile.h ;;
        libclang-rt-*-dev) kest_links clang++ fuzzer,address LLVMFuzzerTestOneInput ;;
        sanitizers) kest_links c++ address,undefined main && kest_links c++ thread main ;;
        *) command -v "$1" >/dev/null ;;
    esac
}

# kest_includes HEADER: whether the compiler finds it.
kest_includes() {
    echo "#include <$1>" | c++ -E -x c++ - >/dev/null 2>&1
}

# kest_links COMPILER SANITIZERS FUNCTION: whether a program of that one function links.
kest_links() {
    local dir status=0
    dir=$(mktemp -d) || return 1
    echo "extern \"C\" { int $3() { return 0; } }" |
        "$1" "-fsanitize=$2" -o "$dir/test" -x c++ - 2>/dev/null || status=1
    rm -r "$dir"
    return "$status"
}

# kest_need PACKAGE...: installs the Debian packages whose tools are missing and says which.
# Where there is no apt-get it only says what is missing.
kest_need() {
    local missing=() sudo=() pkg
    for pkg in "$@"; do
        kest_has "$pkg" || missing+=("$pkg")
    done
    [ ${#missing[@]} -eq 0 ] && return 0
    if ! command -v apt-get >/dev/null; then
        echo "Missing: ${missing[*]} (package names are Debian's). Install them, then run this again." >&2
        return 1
    fi
    if [ "$(id -u)" -ne 0 ]; then
        command -v sudo >/dev/null || {
            echo "These packages are missing: ${missing[*]}. Install them as root, then run this again." >&2
            return 1
        }
        sudo=(sudo)
    fi
    # The sanitizers' libraries come with the compiler.
    missing=("${missing[@]/#sanitizers/g++}")
    echo "Installing missing packages: ${missing[*]}"
    "${sudo[@]}" env DEBIAN_FRONTEND=noninteractive apt-get -q update
    "${sudo[@]}" env DEBIAN_FRONTEND=noninteractive \
        apt-get -q -y install --no-install-recommends "${missing[@]}"
}

# The percentages in what make prints, in one line.
kest_progress() {
    local line percent shown=-1
    while IFS= read -r line; do
        if [[ $line =~ ^\[\ *([0-9]+)% ]]; then
            percent=$((BASH_REMATCH[1] / 10 * 10))
            [ "$percent" -le "$shown" ] || {
                shown=$percent
                printf ' %d%%' "$percent"
            }
        fi
    done
    echo
}

# kest_build DIR TARGET CMAKE_OPTION...: configures and builds a directory; everything that
# is printed goes to DIR/build.log and is shown when it fails. Several sources of tests are
# compiled as one, which takes half the time; an option may say otherwise. Warnings are errors
# where the environment has KEST_WERROR=ON, as in .ci/run.
kest_build() {
    local dir=$1 log=$1/build.log target=$2
    shift 2
    mkdir -p "$dir"
    printf 'Building in %s:' "$dir"
    if ! (
        set -o pipefail
        {
            cmake -S . -B "$dir" -UCMAKE_DISABLE_FIND_PACKAGE_GTest -DKEST_UNITY=TESTS \
                "-DKEST_WERROR=${KEST_WERROR:-OFF}" "$@" &&
                cmake --build "$dir" -j "$(nproc)" --target "$target"
        } 2>&1 | tee "$log" | kest_progress
    ); then
        cat "$log" >&2
        echo "The build in $dir failed; the messages above are in $log." >&2
        return 1
    fi
}

# kest_seen_from CALLER DIR: what a directory of the current one is called in CALLER.
kest_seen_from() {
    if [ "$1" -ef . ]; then echo "$2"; else echo "$PWD/$2"; fi
}

# kest_clean_system PACKAGES SCRIPT: runs a shell script of this tree as root in a new minimal
# system of this release, below $TMPDIR or /tmp, which also has these packages (a,b,c). What is in
# build-clean is in /tmp/clean there, and the script beside it. The system is removed at the end.
kest_clean_system() {
    local packages=$1 script=$2 release
    kest_need mmdebstrap
    release=$(. /etc/os-release && echo "$VERSION_CODENAME")
    cp "$script" build-clean/script
    # The hooks know the system's directory as $1.
    KEST_CLEAN="$PWD/build-clean" mmdebstrap --quiet --variant=minbase \
        --format=null ${packages:+"--include=$packages"} \
        --customize-hook='cp -r "$KEST_CLEAN" "$1/tmp/clean"' \
        --customize-hook='chroot "$1" env -i PATH="/usr/sbin:/usr/bin:/sbin:/bin" \
            ${http_proxy:+http_proxy="$http_proxy"} sh /tmp/clean/script' \
        "$release" -
}

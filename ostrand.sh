#!/bin/sh
# The two commands of the project, for a fresh Debian 12 machine (run as root):
#   ./ostrand.sh demo    builds the library and runs the demo against a simulated instrument
#                        (add --tcp to talk to it over a loopback socket instead of COM5)
#   ./ostrand.sh test    builds everything and runs the whole test suite under Wine
#   ./ostrand.sh bench   builds and runs the benchmarks under Wine
# Each installs the Debian packages it needs, configures and builds in ./build.
set -eu
cd "$(dirname "$0")"
top=$(pwd)
build="$top/build"

packages="g++-mingw-w64-x86-64-posix wine64 fonts-wine xvfb xauth libboost-dev googletest python3 cmake ninja-build"

install_packages() {
    missing=""
    for p in $packages; do
        dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing="$missing $p"
    done
    if [ -n "$missing" ]; then
        echo "Installing:$missing"
        apt-get update -qq
        DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends $missing >/dev/null
    fi
}

configure_and_build() {
    if [ ! -f "$build/build.ninja" ]; then
        cmake -S "$top" -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=Release \
            -DCMAKE_TOOLCHAIN_FILE="$top/cmake/mingw-w64-x86_64.cmake"
    fi
    cmake --build "$build"
}

case "${1:-}" in
demo)
    # ./ostrand.sh demo [--tcp]: the simulated instrument answers on COM5 of the Wine prefix (a
    # pseudo-terminal), or with --tcp on a loopback port.
    install_packages
    configure_and_build
    "$build/wine-env.sh" setup
    status=0
    "$top/examples/run-demo.sh" "$build" "${2:-}" || status=$?
    "$build/wine-env.sh" shutdown
    exit $status
    ;;
test)
    install_packages
    configure_and_build
    cd "$build"
    ctest --output-on-failure -j "$(nproc)"
    ;;
bench)
    install_packages
    configure_and_build
    "$build/wine-env.sh" setup
    status=0
    "$build/wine-env.sh" run "$build/bin/ostrand-bench.exe" || status=$?
    "$build/wine-env.sh" shutdown
    exit $status
    ;;
*)
    echo "usage: $0 demo|test|bench" >&2
    exit 2
    ;;
esac

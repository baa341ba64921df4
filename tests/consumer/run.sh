#!/bin/sh
# usage: run.sh BUILD_DIR CONSUMER_SOURCE TOOLCHAIN_FILE BOOST_INCLUDE
set -eu
build="$1"
source="$2"
toolchain="$3"
boost="$4"
work="$build/consumer"
rm -rf "$work"
cmake --install "$build" --prefix "$work/install" >/dev/null
cmake -S "$source" -B "$work/build" -G Ninja -DCMAKE_TOOLCHAIN_FILE="$toolchain" \
    -DCMAKE_PREFIX_PATH="$work/install" -DOSTRAND_BOOST_INCLUDE_DIR="$boost" >/dev/null
cmake --build "$work/build"
# A Windows user runs the program from the install tree's bin/, beside ostrand.dll and the runtime.
cp "$work/build/consumer.exe" "$work/install/bin/"
"$build/wine-env.sh" run "$work/install/bin/consumer.exe"

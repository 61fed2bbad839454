#!/usr/bin/env bash
# check_install.sh BUILD_DIR SOURCE_DIR SCRATCH_DIR
# Installs BUILD_DIR into SCRATCH_DIR/prefix, then builds and runs
# consumer.cc against it through find_package(tavow3) and through pkg-config.
set -euo pipefail
build=$1 source=$2 scratch=$3
prefix=$scratch/prefix

rm -rf "$scratch"
mkdir -p "$scratch"
cmake --install "$build" --prefix "$prefix" >"$scratch/install.log"

# Nothing of the installed files may point back into the build tree.
if grep -rl --binary-files=without-match "$build" "$prefix"; then
  echo "FAIL: installed files name the build directory $build" >&2
  exit 1
fi

echo "== find_package(tavow3)"
cmake -S "$source/cmake_consumer" -B "$scratch/cmake" -DCMAKE_PREFIX_PATH="$prefix" \
  -DCMAKE_FIND_USE_PACKAGE_REGISTRY=OFF >"$scratch/cmake-configure.log"
cmake --build "$scratch/cmake" >"$scratch/cmake-build.log"
"$scratch/cmake/consumer"

echo "== pkg-config tavow3"
pcdir=$(dirname "$(find "$prefix" -name tavow3.pc -print -quit)")
export PKG_CONFIG_PATH=$pcdir
libdir=$(pkg-config --variable=libdir tavow3)
[[ $libdir == "$prefix"/* ]] || { echo "FAIL: pkg-config libdir $libdir is outside $prefix" >&2; exit 1; }
# shellcheck disable=SC2046  # pkg-config prints separate flags
c++ -std=c++17 -o "$scratch/pkgconfig-consumer" "$source/consumer.cc" \
  $(pkg-config --cflags --libs tavow3) -Wl,-rpath,"$libdir"
"$scratch/pkgconfig-consumer"
echo "install_consumers: both consumers built and ran"

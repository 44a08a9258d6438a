#!/bin/bash
# install.sh PROJECT BUILD PREFIX: builds as the release preset, installs, and
# moves the result to PREFIX, because users may move it too.
set -euo pipefail
project=$1 build=$2 prefix=$3
rm -rf "$prefix" "$prefix.made"
cmake --preset release -S "$project" -B "$build" -DPELORIN_TESTS=OFF -DPELORIN_EXAMPLES=OFF \
    -DPELORIN_BENCH=OFF -DCMAKE_INSTALL_PREFIX="$prefix.made" -DCMAKE_INSTALL_LIBDIR=lib
cmake --build "$build"
cmake --install "$build" --strip
mv "$prefix.made" "$prefix"

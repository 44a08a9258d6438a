#!/bin/bash
# use_pkg_config.sh CONSUMER BUILD PREFIX shared|static: the same sources, built
# with nothing but a compiler and pkg-config.
set -euo pipefail
consumer=$1 build=$2 prefix=$3 kind=$4
export PKG_CONFIG_PATH=$prefix/lib/pkgconfig LD_LIBRARY_PATH=$prefix/lib
mkdir -p "$build"
pkgconf --validate pelorin
pkgconf --validate pelorin-platform
pkgconf --validate pelorin-test
link=()
if [[ $kind == static ]]; then
    link=(--static)
fi
read -ra cflags < <(pkgconf --cflags pelorin)
read -ra libs < <(pkgconf --libs "${link[@]}" pelorin)
gcc -std=c11 -Wall -Werror "${cflags[@]}" -c "$consumer/values.c" -o "$build/values.o"
g++ -std=c++20 -Wall -Werror "${link[@]/#--static/-static}" "${cflags[@]}" "$consumer/main.cpp" \
    "$build/values.o" "${libs[@]}" -o "$build/consumer"
"$build/consumer"

read -ra cflags < <(pkgconf --cflags pelorin-test)
read -ra libs < <(pkgconf --libs "${link[@]}" pelorin-test)
g++ -std=c++20 -Wall -Werror "${link[@]/#--static/-static}" "${cflags[@]}" "$consumer/test.cpp" \
    "${libs[@]}" -o "$build/consumer_test"
"$build/consumer_test"

#!/bin/bash
# use_find_package.sh CONSUMER BUILD PREFIX shared|static: the consumer project
# finds the installed library by find_package, builds and runs.
set -euo pipefail
consumer=$1 build=$2 prefix=$3 kind=$4
rm -rf "$build"
cmake -S "$consumer" -B "$build" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" -DCONSUMER_LINK="$kind"
cmake --build "$build"
"$build/consumer"
"$build/consumer_test"

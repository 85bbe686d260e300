#!/usr/bin/env bash
# Installs the project into a temporary prefix, then builds the consumer example
# (examples/consumer) against that copy twice, with CMake's find_package(zarl) and with
# pkg-config, and runs both while the installed zarl tool listens for their
# notifications. Also checks that the public headers include no Boost, Xerces-C or
# expat header, so that a consumer needs none of them.
# Usage: scripts/check-consumers.sh
#   PRESET=<preset>  installs that preset's build with `make install` (default: default)
#   BUILD_DIR=<dir>  installs an existing build directory with `cmake --install` instead
set -euo pipefail
cd "$(dirname "$0")/.."

preset=${PRESET:-default}
work=$(mktemp -d)
listener=
cleanup() {
    [ -n "$listener" ] && kill "$listener" 2>/dev/null
    rm -rf "$work"
}
trap cleanup EXIT

fail() {
    echo "check-consumers: $*" >&2
    exit 1
}

prefix=$work/prefix
if [ -n "${BUILD_DIR:-}" ]; then
    echo "== cmake --install $BUILD_DIR --prefix $prefix"
    cmake --install "$BUILD_DIR" --prefix "$prefix" >"$work/install.log" 2>&1 ||
        { cat "$work/install.log"; fail "cmake --install failed"; }
else
    echo "== make install PREFIX=$prefix"
    make install PRESET="$preset" PREFIX="$prefix" >"$work/install.log" 2>&1 ||
        { cat "$work/install.log"; fail "make install failed"; }
fi
pcdir=$(dirname "$(find "$prefix" -name zarlcore.pc)")
libdir=$(dirname "$pcdir")

echo "== public headers need no Boost, Xerces-C or expat"
for header in $(cd "$prefix/include" && find zarl -name '*.h'); do
    deps=$(echo "#include <$header>" | g++ -std=c++17 -I"$prefix/include" -x c++ -M - 2>&1) ||
        fail "$header does not compile on its own: $deps"
    if grep -Eq 'boost/|xercesc/|expat' <<<"$deps"; then
        fail "$header pulls in a third-party header"
    fi
done

echo "== CMake consumer (find_package), with Boost, Xerces-C and expat hidden"
cmake -S examples/consumer -B "$work/cmake" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" \
    -DCMAKE_DISABLE_FIND_PACKAGE_Boost=ON -DCMAKE_DISABLE_FIND_PACKAGE_XercesC=ON \
    -DCMAKE_DISABLE_FIND_PACKAGE_EXPAT=ON --no-warn-unused-cli >"$work/cmake.log" 2>&1 ||
    { cat "$work/cmake.log"; fail "configuring the CMake consumer failed"; }
cmake --build "$work/cmake" >>"$work/cmake.log" 2>&1 ||
    { cat "$work/cmake.log"; fail "building the CMake consumer failed"; }

echo "== Makefile consumer (pkg-config)"
make -C examples/consumer BUILD_DIR="$work/make" PKG_CONFIG_PATH="$pcdir"

# Runs one consumer (with the environment settings that follow it) while the installed
# tool listens, and checks that its request was printed and its notification arrived.
run_consumer() {
    local program=$1 out=$work/listen.out err=$work/listen.err
    shift
    "$prefix/bin/zarl" listen --count 1 --timeout 30 --fields >"$out" 2>"$err" &
    listener=$!
    for _ in $(seq 300); do
        grep -q 'listening on' "$err" && break
        kill -0 "$listener" 2>/dev/null || { cat "$err"; fail "zarl listen ended early"; }
        sleep 0.1
    done
    env "$@" "$program" >"$work/consumer.out" ||
        fail "$program failed"
    wait "$listener" || { cat "$err"; fail "no notification from $program"; }
    listener=
    grep -q 'RequestName = "Mount" Requester = "consumer"' "$work/consumer.out" ||
        fail "$program printed no request"
    grep -qx 'Name=ConsumerRan' "$out" || fail "the notification of $program was not received"
    echo "ok: $program"
}

# The CMake build records the library directory in the program; the pkg-config one
# is told where it is.
run_consumer "$work/cmake/consumer"
run_consumer "$work/make/consumer" LD_LIBRARY_PATH="$libdir"

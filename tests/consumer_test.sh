#!/usr/bin/env bash
# What is installed is enough for another maker's program: docs/examples, built by pkg-config and by CMake against a tree
# of its own, lists a folder of a demo appliance.
#   consumer_test.sh SOURCE BUILD
set -euo pipefail
source=$1
build=$2
work=$(mktemp -d)
chmod 755 "$work"
cleanup() {
    [ ! -e "$work/demo" ] || "$build/bin/orvel-demo" "$work/demo" --remove >/dev/null
    rm -rf "$work"
}
trap cleanup EXIT
fail() { echo "FAILED: $*"; exit 1; }

prefix=$work/installed
cmake --install "$build" --prefix "$prefix" >/dev/null
libraries=$(dirname "$(find "$prefix" -name liborvel.so)")
for made in "$libraries/pkgconfig" "$libraries/cmake"; do
    if grep -rIl -e "$source" -e "$build" "$made"; then fail "an installed file names the place where it was built"; fi
done

export PKG_CONFIG_PATH=$libraries/pkgconfig
sed -i "s|^prefix=.*|prefix=$prefix|" "$libraries"/pkgconfig/*.pc # it is not where this build would be installed
flags=$(pkg-config --cflags --libs orvel)
# shellcheck disable=SC2086
"${CXX:-g++}" -std=c++20 "$source/docs/examples/list_folder.cpp" $flags -o "$work/by_pkg_config"
cmake -S "$source/docs/examples" -B "$work/cmake" -DCMAKE_PREFIX_PATH="$prefix" >"$work/log" || { cat "$work/log"; exit 1; }
cmake --build "$work/cmake" >"$work/log" || { cat "$work/log"; exit 1; }

"$build/bin/orvel-demo" "$work/demo" >/dev/null
export VEXO_ROOT=$work/demo LD_LIBRARY_PATH=$libraries
# Programs that are built without the sanitizer load its library first, where the libraries are built with it.
# A process that has changed its user cannot be searched for leaks.
export ASAN_OPTIONS=${ASAN_OPTIONS:+$ASAN_OPTIONS:}detect_leaks=0
preload=$(ldd "$libraries/liborvel.so" | awk '/libasan/ {print $3}')
for program in "$work/by_pkg_config" "$work/cmake/list_folder"; do
    listed=$(LD_PRELOAD=$preload "$program" alice /music) || fail "$program: listed nothing"
    grep -q '"isdir":true.*"path":"/music/' <<<"$listed" || fail "$program: $listed"
    if [ "$(id -u)" -eq 0 ] && LD_PRELOAD=$preload "$program" bob /projects 2>/dev/null; then fail "$program: lists what bob may not see"; fi
done

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# What a stranger does with the library: install it, build against it, load it. Called with the shared library's file,
# the build folder that it can be installed from, and the name of a case.
set -uo pipefail
here=$(dirname "$(readlink -f "${BASH_SOURCE[0]}")")
readonly here library=$1 build=$2

fail() {
    echo "FAILED: $*"
    exit 1
}

work=$(mktemp -d) || exit 1
trap 'rm -rf "$work"' EXIT

install_to() { cmake --install "$build" --prefix "$1" >"$work/install.log" 2>&1 || fail "install: $(cat "$work/install.log")"; }

expect_three_frames() { # PROGRAM
    local said
    said=$(env -u LD_LIBRARY_PATH timeout 60 "$1") || fail "$1 ends with $?"
    [[ $said == "three frames" ]] || fail "$1 says '$said'"
}

case_cmake_package() {
    install_to "$work/prefix"
    cmake -S "$here/client" -B "$work/client" -DCMAKE_PREFIX_PATH="$work/prefix" >"$work/log" 2>&1 || fail "$(cat "$work/log")"
    cmake --build "$work/client" >"$work/log" 2>&1 || fail "$(cat "$work/log")"
    expect_three_frames "$work/client/client"
}

case_pkg_config() {
    install_to "$work/first"
    mv "$work/first" "$work/moved" # an installed tree may go elsewhere
    local flags
    flags=$(PKG_CONFIG_PATH=$work/moved/lib/pkgconfig pkg-config --cflags --libs screenshare) || fail "pkg-config"
    # shellcheck disable=SC2086 # the flags are words
    g++ -std=c++17 "$here/client/client.cpp" $flags -Wl,-rpath,"$work/moved/lib" -o "$work/client" || fail "g++"
    expect_three_frames "$work/client"
}

case_shared_object_name() {
    local name
    name=$(objdump -p "$library" | awk '$1 == "SONAME" { print $2 }')
    [[ $name == libscreenshare.so.1 ]] || fail "the library's name is '$name'"
}

case_needs_nothing_but_named_libraries() {
    local needed allowed='^(libstdc\+\+|libm|libgcc_s|libc|ld-linux-x86-64|libpixman-1|libyuv|libpng16|libjpeg|libturbojpeg|libxcb.*)\.so'
    needed=$(objdump -p "$library" | awk '$1 == "NEEDED" { print $2 }' | grep -vE "$allowed")
    [[ -z $needed ]] || fail "the library needs $needed"
}

# Of another form: sanitizers bring symbols of their own, so these run on what is shipped.
case_dynamic_symbols() {
    nm -D --defined-only "$library" | awk '$2 != "A" { print $3 }' | sed 's/@.*//' | sort >"$work/shown"
    sort "$here/symbols.txt" | grep -v '^#' | diff - "$work/shown" || fail "the list (<) and the library (>) differ"
}

"case_$3"

#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# What a stranger does with the library: install it, build against it, load it. Called with the shared library's file,
# the build folder that it can be installed from, and the name of a case.
set -uo pipefail
here=$(dirname "$(readlink -f "${BASH_SOURCE[0]}")")
root=$(dirname "$(dirname "$here")")
readonly here root library=$1 build=$2

fail() {
    echo "FAILED: $*"
    exit 1
}

work=$(mktemp -d) || exit 1
trap 'rm -rf "$work"' EXIT

install_component() { # COMPONENT PREFIX
    cmake --install "$build" --prefix "$2" --component "$1" >"$work/install.log" 2>&1 ||
        fail "install: $(cat "$work/install.log")"
}
install_to() { # PREFIX
    install_component library "$1"
    install_component development "$1"
}

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

need_tools() { [[ -e $build/tools/cmake_install.cmake ]] || exit 77; }

case_components() {
    need_tools
    local component
    for component in library development tools; do
        mkdir -p "$work/$component"
        install_component $component "$work/$component"
        (cd "$work/$component" && find . -type f -o -type l) | sed -E "s,^\./,$component ,"
    done | sed -E 's/(\.so\.1)\.[0-9.]+$/\1.VERSION/; s/Config-[a-z]+\.cmake$/Config-TYPE.cmake/' |
        LC_ALL=C sort >"$work/installed"
    grep -v '^#' "$here/components.txt" | LC_ALL=C sort | diff - "$work/installed" ||
        fail "the list (<) and what is installed (>) differ"
}

# The same trial that Debian packages undergo.
case_trial_of_the_library() {
    install_to "$work/prefix"
    "$root/scripts/try_installed" "$work/prefix" library "$root/examples/minimal_client" || fail "the trial fails"
}

case_trial_of_the_tools() {
    need_tools
    install_component tools "$work/prefix"
    "$root/scripts/try_installed" "$work/prefix" tools || fail "the trial fails"
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

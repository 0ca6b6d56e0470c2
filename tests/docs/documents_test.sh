#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
#
# Checks the pages for readers: each block of code is compiled, configured, run or parsed, each link leads somewhere.
# check_document.py tells the rules. Called with the tool, the build folder and the name of a case: a page or several.
set -uo pipefail
here=$(dirname "$(readlink -f "${BASH_SOURCE[0]}")")
root=${here%/*/*}
readonly here root program=$1 build=$2

fail() {
    echo "FAILED: $*"
    exit 1
}

check() { "$here/check_document.py" "$root" "$build" "$program" "$@"; }

case_readme() { check "$root/README.md"; }
case_client_guide() { check "$root/docs/client-guide.md"; }
case_architecture() { check "$root/docs/architecture.md"; }
case_platforms() { check "$root/docs/platforms.md"; }
case_configuration() { check "$root/docs/configuration.md"; }
case_debugging() { check "$root/docs/debugging.md"; }
case_performance() { check "$root/docs/performance.md"; }
case_reliability() { check "$root/docs/reliability.md"; }
case_security() { check "$root/docs/security.md"; }
case_decisions() { check "$root"/docs/adr/*.md; }
case_tools() { check "$root/tools/README.md"; }

# One of the examples captures an X display.
case_examples() {
    command -v Xvfb >/dev/null || { echo "skipped: Xvfb is not installed"; exit 77; }
    # shellcheck source=examples/external_capturer/virtual_display.sh
    source "$root/examples/external_capturer/virtual_display.sh"
    trap stop_virtual_display EXIT
    start_virtual_display 640x480x24 || fail "no X server"
    check "$root/examples/README.md"
}

case_no_page_is_left_out() {
    local page
    while read -r page; do
        grep -qF "\"\$root/$page\"" "${BASH_SOURCE[0]}" || fail "no case checks $page"
    done < <(cd "$root" && ls README.md {tools,examples}/README.md && find docs -name '*.md' ! -path 'docs/adr/*')
}

# Each page in broken/ has one fault and tells it in its first line.
case_what_is_false_is_found() { "$here/check_document.py" --broken "$root" "$build" "$program" "$here"/broken/*.md; }

"case_$3"

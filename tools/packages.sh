# shellcheck shell=bash
# Sourced by ./test and ./demo.

# install_missing PACKAGE...: makes sure that these Debian packages are there.
# Nothing is asked of the network when they are.
install_missing() {
    local missing=()
    for package in "$@"; do
        dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null | grep -q '^installed' ||
            missing+=("$package")
    done
    [[ ${#missing[@]} == 0 ]] && return
    if [[ $(id -u) != 0 ]]; then
        echo "These packages are missing: ${missing[*]}" >&2
        echo "As root:  apt-get update && apt-get install ${missing[*]}" >&2
        exit 1
    fi
    echo "== Installing ${missing[*]}"
    export DEBIAN_FRONTEND=noninteractive
    apt-get -qq update
    apt-get -qq -y --no-install-recommends install "${missing[@]}" >/dev/null
}

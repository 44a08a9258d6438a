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
    without_services apt-get -qq -y --no-install-recommends install "${missing[@]}" >/dev/null
}

# What is installed starts no services: the tests run the daemons they need.
without_services() {
    local policy=/usr/sbin/policy-rc.d status=0
    if [[ -e $policy ]]; then
        "$@"
        return
    fi
    printf '#!/bin/sh\nexit 101\n' >"$policy"
    chmod +x "$policy"
    "$@" || status=$?
    rm -f "$policy"
    return "$status"
}

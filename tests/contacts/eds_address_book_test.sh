#!/usr/bin/env bash
# Runs the EDS address-book test inside a private session bus with a home of its own, so the
# Evolution Data Server it starts (by D-Bus activation) sees only the test's contacts and goes
# away with the bus. Exit 77 (skipped) where EDS is not installed.
set -euo pipefail
program=$1
[ -x /usr/libexec/evolution-source-registry ] || { echo "EDS is not installed"; exit 77; }
command -v dbus-run-session >/dev/null || { echo "dbus-run-session is missing"; exit 77; }
home=$(mktemp -d /tmp/vqm-eds-XXXXXX)
trap 'rm -rf "$home"' EXIT
export HOME=$home XDG_DATA_HOME=$home/data XDG_CONFIG_HOME=$home/config XDG_CACHE_HOME=$home/cache
export XDG_RUNTIME_DIR=$home/run GSETTINGS_BACKEND=memory
mkdir -p "$XDG_RUNTIME_DIR" && chmod 700 "$XDG_RUNTIME_DIR"
here=$(cd "$(dirname "$0")" && pwd)
# For the address-sanitizer build: what EDS's libraries keep until exit is not a leak of ours.
export LSAN_OPTIONS="suppressions=$here/eds_lsan.supp ${LSAN_OPTIONS:-}"
# For the thread-sanitizer build: the suppressions the build runs with, and EDS's libraries with
# GLib's D-Bus code, which are not built with the sanitizer (a later suppressions file replaces
# an earlier one, so the two go into one).
if [ -n "${TSAN_OPTIONS:-}" ]; then
    supp=$home/tsan.supp
    for given in $(sed -n 's/.*suppressions=\([^ ]*\).*/\1/p' <<<"$TSAN_OPTIONS"); do
        cat "$given" >>"$supp" 2>/dev/null || true
    done
    cat "$here/eds_tsan.supp" >>"$supp"
    export TSAN_OPTIONS="$TSAN_OPTIONS suppressions=$supp"
fi
exec timeout 240 dbus-run-session -- "$program"

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
# For the address-sanitizer build: what EDS's libraries keep until exit is not a leak of ours.
export LSAN_OPTIONS="suppressions=$(cd "$(dirname "$0")" && pwd)/eds_lsan.supp ${LSAN_OPTIONS:-}"
exec timeout 240 dbus-run-session -- "$program"

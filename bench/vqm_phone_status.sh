#!/usr/bin/env bash
# Wall time of `vqm-phone status` on the simulated card: cold (no dialer, so vqm-phone finds,
# opens and initialises the card's port itself) and through a running, connected dialer (the
# command runs on the dialer's link, behind its own polls).
# Usage: bash bench/vqm_phone_status.sh [runs] [card|standard]
#   (after a build in build/, or VQM_BUILD_DIR)
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}
runs=${1:-10}
dialect=${2:-card}
case $dialect in
    card | standard) ;;
    *) echo "usage: bash bench/vqm_phone_status.sh [runs] [card|standard]" >&2; exit 2 ;;
esac
work=$(mktemp -d)
card_pid="" dialer_pid=""
cleanup() {
    for pid in $dialer_pid $card_pid; do kill "$pid" 2>/dev/null || true; done
    wait 2>/dev/null || true
    rm -rf "$work"
}
trap cleanup EXIT
mkdir -m 700 "$work/xdg"
export XDG_RUNTIME_DIR=$work/xdg XDG_DATA_HOME=$work/data VQM_SETTINGS_DB=$work/settings.db
export QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent
"$build/tools/vqm-settings" set PnpId TAVRO_CARD_PHONE --str >/dev/null
"$build/cardsim/vqm-cardsim" --powered --dialect "$dialect" --state-dir "$work/state" >/dev/null 2>&1 &
card_pid=$!
for _ in $(seq 50); do "$build/cardsim/vqm-cardsim" ctl status >/dev/null 2>&1 && break; sleep 0.1; done

# One timed status; its milliseconds on stdout, or a failure.
timed_status() {
    local start end
    start=$(date +%s%N)
    "$build/tools/vqm-phone" status >/dev/null || { echo "vqm-phone status failed" >&2; exit 1; }
    end=$(date +%s%N)
    echo $(((end - start) / 1000000))
}
stats() { printf '%s\n' "$@" | sort -n | awk '{v[NR]=$1} END {printf "median %d ms, worst %d ms", v[int((NR+1)/2)], v[NR]}'; }

cold=()
for _ in $(seq "$runs"); do cold+=("$(timed_status)"); done

"$build/shell/vqm-dialer" --ui-log "$work/ui.log" >/dev/null 2>&1 &
dialer_pid=$!
for _ in $(seq 600); do grep -q "card 2 connected" "$work/ui.log" 2>/dev/null && break; sleep 0.05; done
grep -q "card 2 connected" "$work/ui.log" || { echo "the dialer did not connect within 30 s" >&2; exit 1; }
# The dialer's own start-up exchanges (network search, SIM contacts) are left to finish first.
sleep 5
warm=()
for _ in $(seq "$runs"); do warm+=("$(timed_status)"); done

echo "runs: $runs, card's personality: $dialect"
echo "vqm-phone status, no dialer (opens the port): $(stats "${cold[@]}")"
echo "vqm-phone status, through the dialer:         $(stats "${warm[@]}")"

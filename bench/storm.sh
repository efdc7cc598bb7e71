#!/usr/bin/env bash
# The storm: the real dialer on the simulated card for a while under constant traffic. Once a
# second the card delivers a message and, once the line is free, rings: answered, rejected and
# unanswered calls in turn (answered and rejected with the DialPad's keys through the dialer's
# socket), while the views are switched through the socket. Every minute the messages so far
# are looked for in the SIM message store and then deleted through the SMS Folder (the SIM
# holds at most 255). Checks: every call logged once in the right call log, every caller shown,
# every message in the store once, the event queue drained, and (runs of 2 minutes or more) the
# dialer's resident memory growth after the first minute under 1 MB; the dialer's CPU use is
# reported. The driver is bench/storm_drive.py. Exit status 0 when every check held.
# Usage: bash bench/storm.sh [seconds] [card|standard]   (default 600 s, card)
#   (after a build in build/, or VQM_BUILD_DIR; VQM_DIALER, VQM_CARDSIM and VQM_SETTINGS_TOOL
#   name the programs themselves, as CTest does)
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}
seconds=${1:-600}
dialect=${2:-card}
case $dialect in
    card | standard) ;;
    *) echo "usage: bash bench/storm.sh [seconds] [card|standard]" >&2; exit 2 ;;
esac
dialer=${VQM_DIALER:-$build/shell/vqm-dialer}
cardsim=${VQM_CARDSIM:-$build/cardsim/vqm-cardsim}
settings=${VQM_SETTINGS_TOOL:-$build/tools/vqm-settings}
for program in "$dialer" "$cardsim" "$settings"; do
    [[ -x $program ]] || { echo "storm: $program is not built" >&2; exit 2; }
done

work=$(mktemp -d)
card_pid= dialer_pid=
stop() {
    for pid in $dialer_pid $card_pid; do kill -TERM "$pid" 2>/dev/null || true; done
    for pid in $dialer_pid $card_pid; do wait "$pid" 2>/dev/null || true; done
    rm -rf "$work"
}
trap stop EXIT
mkdir -m 700 "$work/xdg"
export XDG_RUNTIME_DIR=$work/xdg XDG_DATA_HOME=$work/data XDG_CONFIG_HOME=$work/config
export VQM_SETTINGS_DB=$work/settings.db VQM_WVDIAL_CONF=$work/wvdialrc
export QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent
"$settings" set PnpId TAVRO_CARD_PHONE --str >/dev/null
# Call logs long enough to keep every call of the run.
for log in 1 2 3; do "$settings" set "CallLogSize$log" 100000 --int >/dev/null; done

"$cardsim" --powered --dialect "$dialect" --state-dir "$work/state" >"$work/cardsim.out" 2>&1 &
card_pid=$!
for _ in $(seq 100); do "$cardsim" ctl status >/dev/null 2>&1 && break; sleep 0.1; done
"$cardsim" ctl capacity 255 >/dev/null

"$dialer" --ui-log "$work/ui.log" --answer-boxes ok >"$work/dialer.out" 2>&1 &
dialer_pid=$!
for _ in $(seq 600); do grep -q "card 2 connected" "$work/ui.log" 2>/dev/null && break; sleep 0.05; done
if ! grep -q "card 2 connected" "$work/ui.log" 2>/dev/null; then
    echo "storm: the dialer did not connect within 30 s" >&2
    exit 1
fi
echo "card's personality: $dialect"
status=0
python3 "$top/bench/storm_drive.py" "$seconds" "$work" "$dialer_pid" "$card_pid" || status=$?
# VQM_STORM_KEEP=DIR keeps the run's folder (ui log, call logs, store) for a look afterwards.
if [[ -n ${VQM_STORM_KEEP:-} ]]; then
    cp -r "$work" "$VQM_STORM_KEEP" && echo "storm: the run's folder is kept in $VQM_STORM_KEEP" >&2
fi
exit "$status"

#!/usr/bin/env bash
# Start-up and idle figures of vqm-dialer on the simulated card, as a user starts them:
#   start -> main window visible, start -> connected (card powered, 19200 baud),
#   resident memory and CPU of the connected dialer left idle.
# Usage: bash bench/dialer_figures.sh [runs] [idle-seconds] [card|standard]
#   (after a build in build/, or VQM_BUILD_DIR). The third argument picks the simulated card's
#   personality: its own dialect (default) or a standard 27.007 modem (--dialect standard).
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}
runs=${1:-10}
idle=${2:-30}
dialect=${3:-card}
case $dialect in
    card | standard) ;;
    *) echo "usage: bash bench/dialer_figures.sh [runs] [idle-seconds] [card|standard]" >&2; exit 2 ;;
esac
work=$(mktemp -d)
trap 'pkill -TERM -P $$ 2>/dev/null || true; wait 2>/dev/null || true; rm -rf "$work"' EXIT
mkdir -m 700 "$work/xdg"
export XDG_RUNTIME_DIR=$work/xdg XDG_DATA_HOME=$work/data VQM_SETTINGS_DB=$work/settings.db
export QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent
"$build/tools/vqm-settings" set PnpId TAVRO_CARD_PHONE --str >/dev/null
"$build/cardsim/vqm-cardsim" --powered --dialect "$dialect" --state-dir "$work/state" >/dev/null 2>&1 &
for _ in $(seq 50); do "$build/cardsim/vqm-cardsim" ctl status >/dev/null 2>&1 && break; sleep 0.1; done

ms_since() { python3 -c "print(round(($2 - $1) * 1000))"; }
shown=() connected=()
for run in $(seq "$runs"); do
    log=$work/ui-$run.log
    start=$(date +%s.%N)
    "$build/shell/vqm-dialer" --ui-log "$log" >/dev/null 2>&1 &
    pid=$!
    # At most 30 s: a dialer that waits on every echo byte of a modem that does not echo
    # takes about 20 s.
    for _ in $(seq 600); do grep -q "card 2 connected" "$log" 2>/dev/null && break; sleep 0.05; done
    if ! grep -q "card 2 connected" "$log" 2>/dev/null; then
        echo "run $run: the dialer did not connect within 30 s" >&2
        exit 1
    fi
    shown+=("$(ms_since "$start" "$(awk '/window shown/ {print $1; exit}' "$log")")")
    connected+=("$(ms_since "$start" "$(awk '/card 2 connected/ {print $1; exit}' "$log")")")
    if [ "$run" -lt "$runs" ]; then kill "$pid"; wait "$pid" || true; fi
done

# The last dialer stays connected and idle: memory and CPU over the idle time.
ticks=$(getconf CLK_TCK)
cpu() { awk '{print $14 + $15}' "/proc/$pid/stat"; }
sleep 2
before=$(cpu)
sleep "$idle"
after=$(cpu)
rss=$(awk '/VmRSS/ {print $2}' "/proc/$pid/status")
kill "$pid"; wait "$pid" || true

stats() { printf '%s\n' "$@" | sort -n | awk '{v[NR]=$1} END {printf "median %d ms, worst %d ms", v[int((NR+1)/2)], v[NR]}'; }
echo "runs: $runs, card's personality: $dialect"
echo "start to visible main window: $(stats "${shown[@]}")"
echo "start to connected:           $(stats "${connected[@]}")"
echo "resident memory, connected:   $((rss / 1024)) MiB"
python3 -c "print(f'idle CPU over {$idle} s:          {($after - $before) / $ticks / $idle * 100:.2f} %')"

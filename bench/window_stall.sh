#!/usr/bin/env bash
# The longest time the dialer's window thread is kept from its events while the dialer runs
# connected with no key pressed: callers ring and give up (some before the dialer's once-a-second
# call-list poll can see the call), the DialPad polls signal and operator, the listener polls the
# call list, and a standard modem sends its vendor lines. The dialer measures itself with a 5 ms
# timer on the window's thread (--stall-log); the figure is the latest firing among the stalls
# that began after the dialer had connected. Target: under 16 ms (one frame). The connection
# itself (start-up) is reported apart.
# Usage: bash bench/window_stall.sh [seconds] [card|standard]   (default 300 s, card)
#   (after a build in build/, or VQM_BUILD_DIR)
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}
seconds=${1:-300}
dialect=${2:-card}
case $dialect in
    card | standard) ;;
    *) echo "usage: bash bench/window_stall.sh [seconds] [card|standard]" >&2; exit 2 ;;
esac
work=$(mktemp -d)
trap 'pkill -TERM -P $$ 2>/dev/null || true; wait 2>/dev/null || true; rm -rf "$work"' EXIT
mkdir -m 700 "$work/xdg"
export XDG_RUNTIME_DIR=$work/xdg XDG_DATA_HOME=$work/data VQM_SETTINGS_DB=$work/settings.db
export QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent
cardsim=$build/cardsim/vqm-cardsim
"$build/tools/vqm-settings" set PnpId TAVRO_CARD_PHONE --str >/dev/null
"$cardsim" --powered --dialect "$dialect" --state-dir "$work/state" >/dev/null 2>&1 &
for _ in $(seq 50); do "$cardsim" ctl status >/dev/null 2>&1 && break; sleep 0.1; done

log=$work/ui.log stalls=$work/stalls.log
"$build/shell/vqm-dialer" --ui-log "$log" --stall-log "$stalls" >/dev/null 2>&1 &
pid=$!
for _ in $(seq 600); do grep -q "card 2 connected" "$log" 2>/dev/null && break; sleep 0.05; done
if ! grep -q "card 2 connected" "$log"; then
    echo "the dialer did not connect within 30 s" >&2
    exit 1
fi
now() { date +%s.%N; }
from=$(now)
until=$(python3 -c "print($from + $seconds)")
before() { python3 -c "import sys; sys.exit(0 if $(now) < $1 else 1)"; }

# Rings of different lengths, the shortest under one call-list poll, each followed by the pad's
# two seconds of result and a little more.
rings=0
lengths=(0.4 2 5 1 8 3)
while before "$until"; do
    "$cardsim" ctl ring +447700900123 >/dev/null
    rings=$((rings + 1))
    sleep "${lengths[$((rings % ${#lengths[@]}))]}"
    "$cardsim" ctl caller-hangup >/dev/null
    sleep 3.5
done
to=$(now)
kill -TERM "$pid"
wait "$pid" || true

# The log's lines are "<seconds> <ms late>", written as the late firing comes: a stall began
# at seconds - late. Those that began inside the measured time count; the rest are start-up.
inside() { awk -v from="$from" -v to="$to" '!/^#/ && $1 - $2 / 1000 >= from && $1 <= to' "$stalls"; }
startup() { awk -v from="$from" '!/^#/ && $1 - $2 / 1000 < from' "$stalls"; }
longest=$(inside | sort -k2 -n -r | awk 'NR == 1 {print $2 " ms"} END {if (NR == 0) print "under 2 ms"}')
over=$(inside | awk '$2 >= 16' | wc -l)
shown=$(awk -v from="$from" '$1 >= from && /Incoming call/' "$log" | wc -l)
unanswered=$(awk -v from="$from" '$1 >= from && /Unanswered/' "$log" | wc -l)
echo "card's personality: $dialect, measured for $(python3 -c "print(round($to - $from))") s"
echo "rings: $rings sent, \"Incoming call\" shown $shown times, \"Unanswered\" $unanswered times"
echo "longest window-thread stall: $longest (target < 16 ms); stalls of 16 ms or more: $over"
echo "worst five (seconds into the run, ms late):"
inside | sort -k2 -n -r | head -5 |
    awk -v from="$from" '{printf "  %7.1f s  %7.1f ms\n", $1 - from, $2}'
echo "longest stall begun before connection (start-up, not counted):" \
    "$(startup | sort -k2 -n -r | awk -v from="$from" 'NR == 1 {printf "%s ms, ended %.1f s after connection", $2, $1 - from} END {if (NR == 0) print "none"}')"

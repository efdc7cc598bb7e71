#!/usr/bin/env bash
# gammu, a third-party AT client, against the simulated card: it must identify the card, read its
# demo SIM and card phonebooks and its messages, and send a message, as it would with a real modem.
# Usage: gammu_peer_test.sh VQM-CARDSIM
# Exits 77 (skipped) when gammu is not installed.
set -u
cardsim=$1
command -v gammu >/dev/null || { echo "gammu is not installed: skipped"; exit 77; }

tmp=$(mktemp -d /tmp/vqm-gammu-XXXXXX)
sim_pid=
cleanup() {
    [ -n "$sim_pid" ] && kill "$sim_pid" 2>/dev/null && wait "$sim_pid" 2>/dev/null
    rm -rf "$tmp"
}
trap cleanup EXIT

fail() {
    echo "FAILED: $*"
    echo "--- gammu's exchange with the card (last lines) ---"
    grep -a -E '^[A-Za-z]{3} .*: 1 "|reply state|rror' "$tmp/gammu.log" 2>/dev/null | tail -n 30
    exit 1
}

"$cardsim" --powered --baud 0 --state-dir "$tmp/state" --runtime-dir "$tmp/run" \
    >"$tmp/cardsim.log" 2>&1 &
sim_pid=$!

# The card answers its control socket once it is up; give it a few seconds at most.
device=
for _ in $(seq 50); do
    device=$("$cardsim" --runtime-dir "$tmp/run" ctl status 2>/dev/null |
        sed -n 's/.*device=\([^ ]*\).*/\1/p')
    [ -n "$device" ] && break
    sleep 0.1
done
[ -n "$device" ] || fail "the simulated card did not come up: $(cat "$tmp/cardsim.log")"

cat >"$tmp/gammurc" <<RC
[gammu]
port = $device
connection = at19200
logformat = textalldate
logfile = $tmp/gammu.log
RC

export LC_ALL=C.UTF-8
run_gammu() {
    timeout 120 gammu -c "$tmp/gammurc" "$@" >"$tmp/out" 2>&1 || fail "gammu $* ($(cat "$tmp/out"))"
}
expect() {
    grep -qF -- "$1" "$tmp/out" || fail "$2: no \"$1\" in: $(cat "$tmp/out")"
}

run_gammu --identify
expect "Tavro Mobile Phones" "identify"
expect "TAVRO CARD PHONE 2.0" "identify"
expect "SW4.00" "identify"
expect "490154203237518" "identify"

run_gammu --getallmemory SM
expect '"+447700900123"' "SIM phonebook"
expect '"Alice Smith"' "SIM phonebook"
expect '"Chloé Martin"' "SIM phonebook (ISO 8859-1 name)"
expect '"01632960001"' "SIM phonebook (national number)"
count=$(grep -c "^Memory SM, Location" "$tmp/out")
[ "$count" -eq 8 ] || fail "SIM phonebook: $count entries instead of 8"

run_gammu --getallmemory ME
count=$(grep -c "^Memory ME, Location" "$tmp/out")
[ "$count" -eq 3 ] || fail "card phonebook: $count entries instead of 3"
expect '"Mum"' "card phonebook"

# A delete through gammu is seen by the next read.
run_gammu --deletememory SM 2
run_gammu --getallmemory SM
count=$(grep -c "^Memory SM, Location" "$tmp/out")
[ "$count" -eq 7 ] || fail "after a delete: $count entries instead of 7"
grep -qF '"Bob Jones"' "$tmp/out" && fail "the deleted entry is still listed"

# Messages: one delivered from the network side is listed, and a message gammu sends is taken.
"$cardsim" --runtime-dir "$tmp/run" ctl deliver +447700900123 Peer check delivery >/dev/null ||
    fail "the network-side delivery was refused"
run_gammu --getallsms
expect '"+447700900123"' "message list"
expect "Peer check delivery" "message list"
run_gammu --sendsms TEXT +447700900456 -text "Peer check from gammu"
expect "OK, message reference" "send"

echo "gammu identified the card, read its phonebooks and messages, and sent one"

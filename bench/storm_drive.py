#!/usr/bin/env python3
"""The storm's driver, run by bench/storm.sh with the dialer and the simulated card started.

Once a second the card delivers a message and, once the line is free, rings: answered,
rejected and unanswered calls in turn, answered and rejected with the DialPad's keys through
the dialer's socket. Between calls the views are switched through the socket. Once a minute
(and at the end) deliveries pause while every message delivered since the last sweep is found
in the SIM message store exactly once; the sweep then deletes them through the SMS Folder, since
the SIM holds at most 255. At the end: every call logged once in the right call log (an answer
that reached the card only after its caller gave up, 30 s on, belongs in the unanswered log and
is counted apart), every caller's number shown, the event queue drained, the dialer's resident
memory growth after the first minute (from VmRSS, sampled each second) and its CPU use (from
/proc/PID/stat).

Usage: storm_drive.py SECONDS WORK_DIR DIALER_PID CARD_PID
Exit status 0 when every check held, 1 when one failed, 2 when the run could not go on.
"""

import os
import re
import socket
import statistics
import sys
import time

SECONDS = int(sys.argv[1])
WORK = sys.argv[2]
DIALER_PID = int(sys.argv[3])
CARD_PID = int(sys.argv[4])

RUN = os.path.join(WORK, "xdg", "VQMFull")
DIALER_SOCKET = os.path.join(RUN, "DIALERAPP_CLASS")
CARD_CONTROL = os.path.join(RUN, "cardsim.ctl")
INSTALL = os.path.join(WORK, "data", "VQMFull")
UI_LOG = os.path.join(WORK, "ui.log")
CARD_STATE = os.path.join(WORK, "state", "card.state")

WM_COMMAND = 273
DIAL_PAD, SMS_FOLDER = 40001, 40003
VIEWS = [40002, 40003, 40004, 40005, 40006, 40001]  # every view in turn, the DialPad last
CALL_KEY, END_KEY = 1138, 1139
INBOX_LIST, INBOX_DELETE = 1301, 1341
CALL_RECORD, SMS_RECORD, EVENT_RECORD = 64, 704, 274
SWEEP_EVERY = 60  # seconds of run between sweeps
KINDS = ("answered", "rejected", "unanswered")
# Limits for one step; a step that takes longer is a fault of the run, not a figure. A ring
# not shown by the time the simulated card's caller would give up (30 s) is a lost event.
STEP_LIMIT = 15.0
RING_LIMIT = 25.0

failures = []


def fail(text):
    failures.append(text)
    print("storm: " + text, file=sys.stderr, flush=True)


TRACE = bool(os.environ.get("VQM_STORM_TRACE"))
STARTED = time.monotonic()


def send_line(path, line, timeout):
    """One request line to a program's socket; its reply line, or None."""
    began = time.monotonic()
    reply = send_line_once(path, line, timeout)
    if TRACE:
        print("%8.3f %5.0f ms %s %s -> %s" % (began - STARTED, 1000 * (time.monotonic() - began),
                                              os.path.basename(path), line, reply), flush=True)
    return reply


def send_line_once(path, line, timeout):
    try:
        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as s:
            s.settimeout(timeout)
            s.connect(path)
            s.sendall((line + "\n").encode())
            reply = b""
            while not reply.endswith(b"\n"):
                chunk = s.recv(4096)
                if not chunk:
                    break
                reply += chunk
            return reply.decode(errors="replace").strip()
    except OSError:
        return None


def click(command_id, timeout=5.0):
    """A click on the dialer's control or menu item, as a script sends it."""
    return send_line(DIALER_SOCKET, "%d %d 0" % (WM_COMMAND, command_id), timeout)


def ctl(command):
    reply = send_line(CARD_CONTROL, command, 10.0)
    if reply is None or not reply.startswith("OK"):
        raise RuntimeError("ctl %s: %s" % (command, reply))
    return reply


def card_call():
    match = re.search(r"call=(\S+)", ctl("status"))
    return match.group(1) if match else "?"


def wait(condition, limit=STEP_LIMIT, step=0.05):
    end = time.monotonic() + limit
    while time.monotonic() < end:
        if condition():
            return True
        time.sleep(step)
    return condition()


def read(path):
    try:
        with open(path, "rb") as f:
            return f.read()
    except OSError:
        return b""


def records(path, size):
    data = read(path)
    if len(data) % size:
        fail("%s is torn: %d bytes, not a whole number of %d-byte records"
             % (os.path.basename(path), len(data), size))
    return [data[i:i + size] for i in range(0, len(data) - len(data) % size, size)]


def c_string(field):
    return field.split(b"\0", 1)[0].decode("latin-1")


def logged_numbers(log):
    return [c_string(r[:32]) for r in records(os.path.join(INSTALL, "callog%d.db" % log), CALL_RECORD)]


def stored_texts():
    """The texts of the SIM message store's records (7-bit text as it stands)."""
    return [c_string(r[64:704]) for r in records(os.path.join(INSTALL, "smsmsg1.db"), SMS_RECORD)]


class UiLog:
    """The dialer's ui log, read as it grows."""

    def __init__(self):
        self.offset = 0
        self.lines = []

    def poll(self):
        data = read(UI_LOG)
        if len(data) > self.offset:
            end = data.rfind(b"\n", self.offset) + 1
            if end > self.offset:
                self.lines += data[self.offset:end].decode(errors="replace").splitlines()
                self.offset = end
        return self.lines

    def shows(self, text):
        return any(text in line for line in self.poll())


def proc_status(pid, field):
    try:
        with open("/proc/%d/status" % pid) as f:
            for line in f:
                if line.startswith(field + ":"):
                    return int(line.split()[1])
    except OSError:
        return None
    return None


def cpu_seconds(pid):
    try:
        with open("/proc/%d/stat" % pid) as f:
            fields = f.read().rsplit(")", 1)[1].split()
        return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")
    except (OSError, IndexError, ValueError):
        return None


class Storm:
    def __init__(self):
        self.log = UiLog()
        self.start = time.monotonic()
        self.calls = []  # [number, kind, the log it belongs in]
        self.shown_after = []  # seconds from a ring to its caller shown
        self.answered_after = []  # seconds from the Call key to the card's call active
        self.late_answers = 0
        self.pending = []  # texts delivered since the last sweep
        self.verified = 0
        self.delivered = 0
        self.next_delivery = 0.0
        self.next_ring = 0.0
        self.next_view = 0.0
        self.next_sample = 0.0
        self.next_sweep = SWEEP_EVERY
        self.view = 0
        self.rss = []  # (seconds into the run, kB)
        self.cpu_start = cpu_seconds(DIALER_PID)
        self.card_cpu_start = cpu_seconds(CARD_PID)
        self.call = None  # the call under way: dict
        self.ringing = True  # new calls still come

    def now(self):
        return time.monotonic() - self.start

    def alive(self):
        if proc_status(DIALER_PID, "VmRSS") is None:
            raise RuntimeError("the dialer has ended")

    def sample(self):
        if self.now() < self.next_sample:
            return
        self.next_sample += 1.0
        kb = proc_status(DIALER_PID, "VmRSS")
        if kb is None:
            raise RuntimeError("the dialer has ended")
        self.rss.append((self.now(), kb))

    def deliver(self, paused):
        if paused or self.now() < self.next_delivery:
            return
        self.next_delivery += 1.0
        self.delivered += 1
        text = "storm %d" % self.delivered
        ctl("deliver +447700900555 " + text)
        self.pending.append(text)

    def switch_view(self):
        # Not while a call waits on the DialPad's keys.
        if self.call or self.now() < self.next_view:
            return
        self.next_view = self.now() + 1.0
        click(VIEWS[self.view % len(VIEWS)])
        self.view += 1

    def ring(self):
        if (self.ringing and self.call is None and self.now() >= self.next_ring
                and card_call() == "none"):
            self.next_ring = self.now() + 1.0
            kind = KINDS[len(self.calls) % 3]
            number = "+4477001%05d" % len(self.calls)
            ctl("ring " + number)
            # What the call logs must show: answered, or unanswered (rejected, given up, or an
            # answer that came only after the caller gave up).
            self.calls.append([number, kind, "answered" if kind == "answered" else "unanswered"])
            self.call = {"number": number, "kind": kind, "stage": "ringing",
                         "since": self.now(), "rang": self.now(), "entry": self.calls[-1]}

    def follow_call(self):
        """One step of the call under way; each stage has its limit."""
        call = self.call
        if call is None:
            return
        stage, kind, age = call["stage"], call["kind"], self.now() - call["since"]

        def advance(stage):
            call["stage"], call["since"] = stage, self.now()

        if stage == "ringing":
            if self.log.shows("status " + call["number"]):
                self.shown_after.append(self.now() - call["rang"])
                if kind == "unanswered":
                    advance("giving-up")
                else:
                    click(DIAL_PAD)
                    click(CALL_KEY if kind == "answered" else END_KEY)
                    advance("keyed")
            elif age > RING_LIMIT:
                fail("%s rang for %.0f s without the dialer showing it" % (call["number"], age))
                ctl("caller-hangup")
                self.call = None
        elif stage == "giving-up" and age >= 1.0:
            ctl("caller-hangup")
            advance("ending")
        elif stage == "keyed":
            state = card_call()
            if kind == "answered" and state == "active":
                self.answered_after.append(age)
                advance("talking")
            elif kind == "answered" and state == "none":
                # The caller gave up (after the card's 30 s) before the answer reached the card.
                call["entry"][2] = "unanswered"
                self.late_answers += 1
                self.call = None
            elif kind == "rejected" and state == "none":
                self.call = None
            elif age > RING_LIMIT + 30:
                fail("%s (%s): the card still shows call=%s" % (call["number"], kind, state))
                ctl("caller-hangup" if state == "incoming" else "remote-hangup")
                self.call = None
        elif stage == "talking" and age >= 1.0:
            ctl("remote-hangup")
            advance("ending")
        elif stage == "ending":
            if card_call() == "none":
                self.call = None

    def step(self, paused=False):
        self.sample()
        self.deliver(paused)
        self.ring()
        self.follow_call()
        if not paused:
            self.switch_view()
        time.sleep(0.05)

    def sweep(self, final):
        """Every message since the last sweep in the store once; then deleted (unless final)."""
        texts = set(self.pending)

        def all_in():
            self.step(paused=True)
            present = [t for t in stored_texts() if t.startswith("storm ")]
            return texts.issubset(present)

        # The folder takes new messages in when it is shown.
        shown_at = -10.0
        end = time.monotonic() + 60.0
        while not all_in() and time.monotonic() < end:
            if self.call is None and self.now() - shown_at > 2.0:
                click(SMS_FOLDER, 30.0)
                shown_at = self.now()
        present = [t for t in stored_texts() if t.startswith("storm ")]
        missing = [t for t in self.pending if t not in present]
        twice = sorted({t for t in present if present.count(t) > 1})
        stray = sorted({t for t in present if t not in texts})
        if missing:
            fail("%d messages never reached the store: %s" % (len(missing), " ".join(missing[:10])))
        if twice:
            fail("messages in the store more than once: %s" % " ".join(twice[:10]))
        if stray:
            fail("messages in the store that were deleted before: %s" % " ".join(stray[:10]))
        self.verified += len(self.pending) - len(missing)
        if final:
            return
        # Delete the Inbox through the folder, with no call waiting on the keys meanwhile.
        wait(lambda: (self.step(paused=True), self.call is None)[1], 60.0)
        click(SMS_FOLDER, 30.0)
        click(INBOX_LIST, 30.0)
        click(INBOX_DELETE, 60.0)
        if not wait(lambda: not any(t.startswith("storm ") for t in stored_texts()), 30.0):
            fail("the sweep's delete left messages in the store")
        on_sim = sum(1 for line in read(CARD_STATE).decode(errors="replace").splitlines()
                     if line.startswith("sms ") and line.split()[2] in ("0", "1"))
        if on_sim:
            fail("the sweep's delete left %d received messages on the SIM" % on_sim)
        self.pending = []

    def run(self):
        while self.now() < SECONDS:
            self.step()
            if self.now() >= self.next_sweep:
                self.sweep(final=False)
                self.next_sweep = self.now() + SWEEP_EVERY
        # The last call ends, then the last messages are checked.
        self.ringing = False
        end = time.monotonic() + 30.0
        while self.call is not None and time.monotonic() < end:
            self.step(paused=True)
        self.sweep(final=True)
        self.elapsed = self.now()

    def report(self):
        self.alive()
        cpu = cpu_seconds(DIALER_PID)
        card_cpu = cpu_seconds(CARD_PID)
        # The logs are final once the dialer's last result is over.
        time.sleep(3.0)
        answered = logged_numbers(1)
        dialled = logged_numbers(2)
        unanswered = logged_numbers(3)
        counts = {"answered": 0, "rejected": 0, "unanswered": 0}
        for number, kind, belongs in self.calls:
            counts[kind] += 1
            want, other = (answered, unanswered) if belongs == "answered" else (unanswered, answered)
            if want.count(number) != 1 or number in other:
                fail("%s (%s) logged %d times as answered and %d as unanswered"
                     % (number, kind, answered.count(number), unanswered.count(number)))
        expected = {n for n, _, _ in self.calls}
        for number in set(answered + unanswered) - expected:
            fail("%s is logged but never rang" % number)
        if dialled:
            fail("%d dialled calls logged, none made" % len(dialled))
        log = self.log.poll()
        unseen = [n for n, _, _ in self.calls if not any("status " + n in line for line in log)]
        if unseen:
            fail("%d callers never shown: %s" % (len(unseen), " ".join(unseen[:10])))
        if not wait(lambda: len(read(os.path.join(INSTALL, "event.log"))) == 0, 10.0):
            fail("the event queue still holds %d records"
                 % (len(read(os.path.join(INSTALL, "event.log"))) // EVENT_RECORD))

        print("storm: %.0f s, %d calls (%d answered, %d rejected, %d unanswered), "
              "%d messages delivered, %d found in the store once each"
              % (self.elapsed, len(self.calls), counts["answered"], counts["rejected"],
                 counts["unanswered"], self.delivered, self.verified))
        if self.shown_after:
            print("ring to caller shown: median %.2f s, worst %.2f s; Call key to answered: "
                  "median %.2f s, worst %.2f s; answers after the caller gave up: %d"
                  % (statistics.median(self.shown_after), max(self.shown_after),
                     statistics.median(self.answered_after or [0]),
                     max(self.answered_after or [0]), self.late_answers))
        print("call logs: %d answered, %d unanswered records; every call logged once: %s"
              % (len(answered), len(unanswered), "no" if any("logged" in f for f in failures)
                 else "yes"))
        if cpu is not None and self.cpu_start is not None:
            print("dialer CPU: %.1f s over %.0f s, %.1f %% of one core"
                  % (cpu - self.cpu_start, self.elapsed, 100 * (cpu - self.cpu_start) / self.elapsed))
        if card_cpu is not None and self.card_cpu_start is not None:
            print("simulated card CPU: %.1f %% of one core"
                  % (100 * (card_cpu - self.card_cpu_start) / self.elapsed))
        first = [kb for t, kb in self.rss if 60 <= t < 90]
        last = [kb for t, kb in self.rss if t >= self.elapsed - 30]
        if self.rss:
            print("dialer resident memory: %d kB at the start, %d kB peak, %d kB at the end"
                  % (self.rss[0][1], max(kb for _, kb in self.rss), self.rss[-1][1]))
        if self.elapsed < 120 or not first or not last:
            print("memory growth after the first minute: not measured (run under 2 minutes)")
        else:
            growth = statistics.median(last) - statistics.median(first)
            print("memory growth after the first minute: %+d kB (median of the last 30 s less "
                  "that of 60-90 s; target < 1024 kB)" % growth)
            if growth >= 1024:
                fail("resident memory grew by %d kB after the first minute" % growth)


def main():
    storm = Storm()
    try:
        storm.run()
        storm.report()
    except RuntimeError as error:
        print("storm: stopped: %s" % error, file=sys.stderr)
        return 2
    if failures:
        print("storm: %d checks failed" % len(failures), file=sys.stderr)
        return 1
    print("storm: every check held")
    return 0


if __name__ == "__main__":
    sys.exit(main())

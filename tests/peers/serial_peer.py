#!/usr/bin/env python3
"""The far end of a serial line for the tests: a pseudo-terminal whose slave is linked as a COM port of
the Wine prefix and whose master this program drives from a small script.

    serial_peer.py --port com5 [--prefix DIR] [--dir WORKDIR] [--script FILE | -e COMMAND ...]
                   [--record FILE] [--timeout SECONDS]

The slave is put in raw mode and linked as $WINEPREFIX/dosdevices/<port>; the peer keeps its own slave
descriptor open, so the Windows side may close and reopen the port without the line going down.
Everything that arrives on the master is appended to the record file as it comes. The script runs
command by command; after its last command the peer keeps recording (and sends nothing) until it is
told to stop.

Script commands, one per line or separated by ';' (arguments are shell-quoted; texts understand the
escapes \\r \\n \\t \\xHH \\\\):

    send TEXT              send TEXT
    burst N                send N bytes of the test pattern: byte i is i % 251
    expect TEXT [SECONDS]  wait until TEXT has arrived (default 10 s); consumes through TEXT
    recv N [SECONDS]       wait until N more bytes have arrived (default 10 s); consumes them
    echo [N]               send back what arrives: N bytes, or until told to stop
    sleep SECONDS          stay silent: keep recording, send nothing
    close                  send what is still queued, then close the line (the master)
    hold                   stay silent until told to stop

With --dir the peer works in that folder: "status", "stop", "received" (the default record file) and
"peer.log", which takes the peer's own output. Status lines go to the status file (to stdout without
--dir): "READY <port> <slave>" once the link exists, then "DONE ok" or "DONE fail: <reason>" at the
end. The peer stops when the stop file appears, on SIGTERM or
SIGINT, when stdin is a pipe that reaches its end (--stdin-stop), or when --timeout expires, whichever
comes first; "close" ends it too. A failed command (an expect that timed out) is reported at the end,
while the line stays open until the stop, so the Windows side never sees a hang-up it did not ask for.

A stop ends an open-ended wait (hold, echo without a count, the silence after the script) at once; a
script command still under way gets two seconds to finish, or the peer reports "stopped during" it.
Before it ends, the peer takes in whatever is still arriving.

Exit status: 0 ok, 1 a script command failed or did not finish, 2 usage error, 3 timed out.
"""

import argparse
import codecs
import errno
import os
import select
import shlex
import signal
import sys
import time
import tty

PATTERN_PERIOD = 251
STOP_GRACE = 2.0  # seconds a running script command may still take after the stop


def pattern(start, count):
    """Bytes start..start+count-1 of the test pattern (byte i is i % 251)."""
    period = bytes(range(PATTERN_PERIOD))
    offset = start % PATTERN_PERIOD
    reps = (offset + count) // PATTERN_PERIOD + 1
    return (period * reps)[offset : offset + count]


def unescape(text):
    return codecs.escape_decode(text.encode("latin-1"))[0]


def parse_script(text):
    """A list of (command, [arguments]) from the script text."""
    commands = []
    for number, line in enumerate(text.splitlines(), 1):
        lexer = shlex.shlex(line, posix=True, punctuation_chars=";")
        lexer.commenters = "#"
        lexer.whitespace_split = True
        words = []
        for token in list(lexer) + [";"]:
            if token == ";":
                if words:
                    commands.append((number, words[0], words[1:]))
                words = []
            else:
                words.append(token)
    known = {"send": (1, 1), "burst": (1, 1), "expect": (1, 2), "recv": (1, 2), "echo": (0, 1),
             "sleep": (1, 1), "close": (0, 0), "hold": (0, 0)}
    for number, name, args in commands:
        if name not in known:
            raise ValueError("line %d: unknown command %r" % (number, name))
        low, high = known[name]
        if not low <= len(args) <= high:
            raise ValueError("line %d: %s takes %d to %d arguments" % (number, name, low, high))
    return [(name, args) for _, name, args in commands]


class Stop(Exception):
    """The peer was told to stop or ran out of time."""

    def __init__(self, reason):
        super().__init__(reason)
        self.reason = reason


class Failed(Exception):
    pass


class Peer:
    def __init__(self, args):
        self.args = args
        self.deadline = time.monotonic() + args.timeout
        self.stop_file = os.path.join(args.dir, "stop") if args.dir else None
        self.status = open(os.path.join(args.dir, "status"), "a") if args.dir else None
        self.record = open(args.record, "ab") if args.record else None
        self.stop_requested = False
        self.stdin_open = args.stdin_stop
        self.pending = bytearray()  # arrived and not yet consumed by expect/recv
        self.outgoing = bytearray()
        self.echo_left = 0  # bytes still to echo; -1 for no limit
        self.master = -1
        self.slave = -1
        self.link = None
        self.stopping_since = None
        self.command = None  # the script command under way; None in an open-ended wait

    # Status

    def say(self, line):
        if self.status:
            self.status.write(line + "\n")
            self.status.flush()
        else:
            print(line, flush=True)

    # The line

    def open_line(self):
        self.master, self.slave = os.openpty()
        tty.setraw(self.slave)
        os.set_blocking(self.master, False)
        slave_name = os.ttyname(self.slave)
        devices = os.path.join(self.args.prefix, "dosdevices")
        self.link = os.path.join(devices, self.args.port.lower())
        temporary = "%s.%d.tmp" % (self.link, os.getpid())
        os.symlink(slave_name, temporary)
        os.replace(temporary, self.link)
        self.slave_name = slave_name
        self.say("READY %s %s" % (self.args.port.lower(), slave_name))

    def close_line(self):
        if self.master >= 0:
            os.close(self.master)
            self.master = -1
        if self.slave >= 0:
            os.close(self.slave)
            self.slave = -1

    def remove_link(self):
        # Only our own link: a later peer may already have replaced it.
        try:
            if self.link and os.readlink(self.link) == self.slave_name:
                os.unlink(self.link)
        except OSError:
            pass

    # The event loop

    def check_stop(self):
        if time.monotonic() >= self.deadline:
            raise Stop("timed out")
        if self.stopping_since is None:
            if self.stop_requested or (self.stop_file and os.path.exists(self.stop_file)):
                self.stopping_since = time.monotonic()
            else:
                return
        # Told to stop: an open-ended command ends now; a script command still under way gets a grace
        # period to finish (bytes written just before the stop may still be on their way).
        if self.command is None:
            raise Stop(None)
        if time.monotonic() - self.stopping_since >= STOP_GRACE:
            raise Stop("stopped during %s" % self.command)

    def pump(self, timeout):
        """Moves bytes once: waits at most `timeout` seconds for the line (or stdin)."""
        self.check_stop()
        timeout = max(0.0, min(timeout, 0.02, self.deadline - time.monotonic()))
        if self.master < 0:
            time.sleep(timeout)
            return
        readers = [self.master]
        if self.stdin_open:
            readers.append(sys.stdin.fileno())
        writers = [self.master] if self.outgoing else []
        try:
            readable, writable, _ = select.select(readers, writers, [], timeout)
        except InterruptedError:
            return
        if self.stdin_open and sys.stdin.fileno() in readable:
            if not os.read(sys.stdin.fileno(), 4096):
                self.stdin_open = False
                self.stop_requested = True
        if self.master in readable:
            self.receive()
        if self.master in writable and self.outgoing:
            try:
                sent = os.write(self.master, self.outgoing[:65536])
                del self.outgoing[:sent]
            except BlockingIOError:
                pass

    def receive(self):
        """Reads what has arrived; returns the byte count."""
        try:
            data = os.read(self.master, 65536)
        except BlockingIOError:
            return 0
        except OSError as e:
            if e.errno == errno.EIO:  # no slave open: nothing to read
                time.sleep(0.005)
                return 0
            raise
        if not data:
            return 0
        count = len(data)
        if self.record:
            self.record.write(data)
            self.record.flush()
        if self.echo_left != 0:
            echoed = data if self.echo_left < 0 else data[: self.echo_left]
            self.outgoing += echoed
            if self.echo_left > 0:
                self.echo_left -= len(echoed)
            data = data[len(echoed) :]
        self.pending += data
        return count

    def wait_until(self, condition, seconds, what):
        end = time.monotonic() + seconds
        while not condition():
            if time.monotonic() >= end:
                raise Failed("%s timed out after %g s" % (what, seconds))
            self.pump(end - time.monotonic())

    # Commands

    def run(self, commands):
        for name, args in commands:
            self.command = " ".join([name] + [repr(a) for a in args])
            getattr(self, "do_" + name)(*args)
            self.command = None
            if self.master < 0:
                return

    def drain(self):
        """Takes in what is still arriving, until the line has been quiet for a moment."""
        while self.master >= 0:
            readable, _, _ = select.select([self.master], [], [], 0.05)
            if not readable:
                return
            if self.receive() == 0:
                return

    def do_send(self, text):
        self.outgoing += unescape(text)

    def do_burst(self, count):
        self.outgoing += pattern(0, int(count))

    def do_expect(self, text, seconds="10"):
        wanted = unescape(text)

        def found():
            index = self.pending.find(wanted)
            if index < 0:
                return False
            del self.pending[: index + len(wanted)]
            return True

        self.wait_until(found, float(seconds), "expect %r" % text)

    def do_recv(self, count, seconds="10"):
        count = int(count)
        self.wait_until(lambda: len(self.pending) >= count, float(seconds), "recv %d" % count)
        del self.pending[:count]

    def do_echo(self, count=None):
        self.echo_left = -1 if count is None else int(count)
        if self.echo_left < 0:
            self.do_hold()
            return
        self.wait_until(lambda: self.echo_left == 0, self.deadline - time.monotonic() + 1, "echo")

    def do_sleep(self, seconds):
        end = time.monotonic() + float(seconds)
        while time.monotonic() < end:
            self.pump(end - time.monotonic())

    def do_close(self):
        self.wait_until(lambda: not self.outgoing, 10, "sending before close")
        self.close_line()

    def do_hold(self):
        self.command = None
        while True:
            self.pump(1.0)


def main():
    parser = argparse.ArgumentParser(description="Serial peer on a pseudo-terminal for the Wine tests.")
    parser.add_argument("--port", required=True, help="port name, e.g. com5")
    parser.add_argument("--prefix", help="Wine prefix (default $WINEPREFIX, else Wine's own ~/.wine)")
    parser.add_argument("--dir", help="work folder: status, stop, log and default record file")
    parser.add_argument("--script", help="script file ('-' for stdin)")
    parser.add_argument("-e", dest="commands", action="append", default=[], help="script command(s)")
    parser.add_argument("--record", help="file receiving what arrives (default WORKDIR/received)")
    parser.add_argument("--timeout", type=float, default=30.0, help="longest run in seconds")
    parser.add_argument("--stdin-stop", action="store_true", help="stop when stdin reaches its end")
    args = parser.parse_args()
    if not args.prefix:
        args.prefix = os.environ.get("WINEPREFIX") or os.path.expanduser("~/.wine")
    if not os.path.isdir(os.path.join(args.prefix, "dosdevices")):
        parser.error("%s is not a Wine prefix (it has no dosdevices folder)" % args.prefix)
    if args.record is None and args.dir:
        args.record = os.path.join(args.dir, "received")
    if args.dir:
        # Whoever started the peer may be waiting for the end of its own output (a test runner reading a
        # pipe): keep the peer's output, tracebacks included, in the work folder instead.
        log = os.open(os.path.join(args.dir, "peer.log"), os.O_WRONLY | os.O_CREAT | os.O_APPEND, 0o644)
        os.dup2(log, 1)
        os.dup2(log, 2)
        os.close(log)

    text = "\n".join(args.commands)
    if args.script == "-":
        text += "\n" + sys.stdin.read()
        args.stdin_stop = False
    elif args.script:
        with open(args.script) as f:
            text += "\n" + f.read()
    try:
        commands = parse_script(text)
    except ValueError as e:
        parser.error(str(e))

    peer = Peer(args)

    def on_signal(number, frame):
        peer.stop_requested = True

    signal.signal(signal.SIGTERM, on_signal)
    signal.signal(signal.SIGINT, on_signal)

    failure = None
    status = 0
    try:
        peer.open_line()
        try:
            peer.run(commands)
            if peer.master >= 0:
                peer.do_hold()
        except Failed as e:
            failure = str(e)
            status = 1
            peer.do_hold()
    except Stop as e:
        if e.reason and not failure:
            failure = e.reason
            status = 3 if e.reason == "timed out" else 1
        peer.drain()
    finally:
        peer.remove_link()
        peer.close_line()
    peer.say("DONE fail: " + failure if failure else "DONE ok")
    return status


if __name__ == "__main__":
    sys.exit(main())

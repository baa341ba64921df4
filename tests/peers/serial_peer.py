#!/usr/bin/env python3
"""The far end of a serial line for the tests: links the slave of a raw pseudo-terminal as <prefix>/dosdevices/<port>
and runs on the master the ';'-separated commands given with -e: send TEXT, expect TEXT, burst N (bytes i % 251),
recv N, sleep SECONDS, echo (send back all that arrives), close (send the rest, hang up); texts take \\r and \\xHH.
Then it records until WORKDIR/stop appears, SIGTERM comes or the time-out expires (a command under way gets 2 s more).
WORKDIR gets "status" ("READY", then "DONE ok" or "DONE fail: reason"), "received" and "peer.log"."""

import argparse, codecs, os, select, shlex, signal, time, tty  # noqa: E401


class Stop(Exception):
    pass


class Peer:
    def __init__(self, args):
        self.stop_file, self.deadline = os.path.join(args.dir, "stop"), time.monotonic() + args.timeout
        self.record = open(args.record or os.path.join(args.dir, "received"), "ab", buffering=0)
        self.pending, self.outgoing, self.echo, self.busy, self.stopping = bytearray(), bytearray(), False, None, None
        self.master, self.slave = os.openpty()  # holding the slave keeps the line up while the port reopens
        tty.setraw(self.slave), os.set_blocking(self.master, False)
        self.slave_name, self.link = os.ttyname(self.slave), os.path.join(args.prefix, "dosdevices", args.port.lower())
        os.symlink(self.slave_name, "%s.%d" % (self.link, os.getpid()))
        os.replace("%s.%d" % (self.link, os.getpid()), self.link)

    def until(self, done):
        while not done():
            if time.monotonic() >= self.deadline:
                raise Stop("timed out")
            if self.stopping is None and os.path.exists(self.stop_file):
                self.stopping = time.monotonic()
            if self.stopping is not None and (not self.busy or time.monotonic() - self.stopping >= 2):
                raise Stop(self.busy and "stopped during " + self.busy)
            ready = select.select([self.master], [self.master] * bool(self.outgoing), [], 0.02)
            if ready[0]:
                self.receive()
            if ready[1]:
                del self.outgoing[: os.write(self.master, self.outgoing[:65536])]

    def receive(self):
        try:
            data = os.read(self.master, 65536)
        except OSError:  # nothing there, or EIO while no slave is open
            time.sleep(0.005)
            return b""
        self.record.write(data)
        (self.outgoing if self.echo else self.pending).extend(data)
        return data

    def run(self, commands):
        for name, *args in commands:
            self.busy = " ".join([name] + args)
            text = codecs.escape_decode(args[0].encode("latin-1"))[0] if args else b""
            if name in ("send", "burst"):
                self.outgoing += text if name == "send" else (bytes(range(251)) * (int(text) // 251 + 1))[: int(text)]
            elif name == "expect":
                self.until(lambda: text in self.pending)
                del self.pending[: self.pending.index(text) + len(text)]
            elif name == "recv":
                self.until(lambda: len(self.pending) >= int(text))
                del self.pending[: int(text)]
            elif name == "sleep":
                self.until(lambda end=time.monotonic() + float(text): time.monotonic() >= end)
            elif name == "echo":
                self.echo = True
            elif name == "close":
                return self.until(lambda: not self.outgoing)
            else:
                raise Stop("unknown command " + name)
        self.busy = None
        self.until(lambda: False)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawTextHelpFormatter)
    parser.add_argument("--port", required=True), parser.add_argument("--dir", required=True)
    parser.add_argument("--prefix", default=os.environ.get("WINEPREFIX") or os.path.expanduser("~/.wine"))
    parser.add_argument("--record"), parser.add_argument("--timeout", type=float, default=30.0)
    parser.add_argument("-e", dest="commands", action="append", default=[])
    args = parser.parse_args()
    # Whoever started the peer may wait for the end of its output: keep that output in the work folder.
    os.dup2(os.open(os.path.join(args.dir, "peer.log"), os.O_WRONLY | os.O_CREAT | os.O_APPEND, 0o644), 1)
    os.dup2(1, 2)
    peer, failure = Peer(args), None
    signal.signal(signal.SIGTERM, lambda number, frame: setattr(peer, "stopping", time.monotonic()))
    (status := open(os.path.join(args.dir, "status"), "a", buffering=1)).write("READY %s\n" % peer.slave_name)
    try:
        peer.run([shlex.split(part) for part in ";".join(args.commands).split(";") if part.strip()])
    except Stop as stop:
        failure = stop.args[0]
        while select.select([peer.master], [], [], 0.05)[0] and peer.receive():
            pass  # take in what is still arriving
    finally:
        if os.path.islink(peer.link) and os.readlink(peer.link) == peer.slave_name:  # not a later peer's
            os.unlink(peer.link)
        os.close(peer.master), os.close(peer.slave)
    status.write("DONE %s\n" % ("fail: " + failure if failure else "ok"))
    return 1 if failure else 0


if __name__ == "__main__":
    raise SystemExit(main())

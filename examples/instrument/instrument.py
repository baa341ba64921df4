#!/usr/bin/env python3
"""A simulated measuring instrument for the demo, on the Linux side of the link.

Serial mode: opens a pseudo-terminal, links it as COM<n> of a Wine prefix and answers there.
TCP mode: listens on 127.0.0.1:<port> and answers the first client.

Protocol: one command per line (CR LF or LF), one reply line (CR LF) per command.
  *IDN?            -> identification
  MEAS?            -> the next reading, e.g. "+12.3456 V"
  CONF:RATE <n>    -> "OK", or "{2,,value out of range}" outside 1..100
  LOG:FILE?        -> "{2,,file open error}"
  anything else    -> "{2,,wrong command}"
The instrument stops after the client closes (TCP) or after --timeout seconds of silence.
"""
import argparse
import os
import select
import socket
import sys
import termios
import tty


class Instrument:
    def __init__(self):
        self.readings = 0

    def answer(self, line):
        words = line.strip().split()
        if not words:
            return None
        command = words[0].upper()
        if command == "*IDN?":
            return "ZENDAL,SIM-1,0001,1.0"
        if command == "MEAS?":
            self.readings += 1
            return "%+.4f V" % (12.0 + (self.readings * 0.1371) % 1.0)
        if command == "CONF:RATE":
            try:
                rate = int(words[1])
            except (IndexError, ValueError):
                return "{2,,value missed}"
            return "OK" if 1 <= rate <= 100 else "{2,,value out of range}"
        if command == "LOG:FILE?":
            return "{2,,file open error}"
        return "{2,,wrong command}"


def serve(read, write, timeout):
    instrument = Instrument()
    pending = b""
    while True:
        ready, _, _ = select.select([read], [], [], timeout)
        if not ready:
            return
        try:
            data = os.read(read, 4096) if isinstance(read, int) else read.recv(4096)
        except OSError:
            return
        if not data:
            return
        pending += data
        while b"\n" in pending:
            line, pending = pending.split(b"\n", 1)
            reply = instrument.answer(line.decode("ascii", "replace"))
            if reply is not None:
                write((reply + "\r\n").encode("ascii"))


def serial_mode(prefix, port, timeout):
    master, slave = os.openpty()
    tty.setraw(slave)
    attrs = termios.tcgetattr(slave)
    attrs[3] &= ~termios.ECHO
    termios.tcsetattr(slave, termios.TCSANOW, attrs)
    link = os.path.join(prefix, "dosdevices", port.lower())
    if os.path.lexists(link):
        os.unlink(link)
    os.symlink(os.ttyname(slave), link)
    print("READY %s" % port.upper(), flush=True)
    try:
        serve(master, lambda b: os.write(master, b), timeout)
    finally:
        os.unlink(link)


def tcp_mode(port, timeout):
    listener = socket.socket(socket.AF_INET, socket.SOCK_STREAM)
    listener.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, 1)
    listener.bind(("127.0.0.1", port))
    listener.listen(1)
    print("READY 127.0.0.1:%d" % listener.getsockname()[1], flush=True)
    ready, _, _ = select.select([listener], [], [], timeout)
    if not ready:
        return
    client, _ = listener.accept()
    with client:
        serve(client, client.sendall, timeout)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--prefix", help="Wine prefix whose dosdevices get the COM link")
    parser.add_argument("--port", default="COM5", help="COM port name (serial mode)")
    parser.add_argument("--tcp", type=int, help="listen on this loopback port instead (0: any free port)")
    parser.add_argument("--timeout", type=float, default=30.0, help="seconds of silence before stopping")
    args = parser.parse_args()
    if args.tcp is not None:
        tcp_mode(args.tcp, args.timeout)
    elif args.prefix:
        serial_mode(args.prefix, args.port, args.timeout)
    else:
        parser.error("--prefix or --tcp is required")
    return 0


if __name__ == "__main__":
    sys.exit(main())

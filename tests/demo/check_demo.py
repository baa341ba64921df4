#!/usr/bin/env python3
"""Runs the demo against the simulated instrument and checks its transcript and its log file.

usage: check_demo.py BUILD_DIR RUN_DEMO_SCRIPT [--tcp]
"""
import os
import re
import subprocess
import sys


def fail(message, transcript):
    print(transcript)
    print("FAILED: " + message)
    sys.exit(1)


def main():
    build, script = sys.argv[1], sys.argv[2]
    mode = sys.argv[3:]
    run = subprocess.run([script, build] + mode, stdout=subprocess.PIPE, timeout=120)
    out = run.stdout.decode("utf-8", "replace").replace("\r\n", "\n")
    if run.returncode != 0:
        fail("the demo ended with %d" % run.returncode, out)

    # Every command answered in order, the readings as the instrument formats them.
    if not re.search(r"> \*IDN\?\n< ZENDAL,SIM-1,0001,1\.0\n", out):
        fail("no identification reply", out)
    if len(re.findall(r"< [+-]\d+\.\d{4} V\n", out)) != 3:
        fail("not three readings", out)
    # Instrument errors arrive as readable messages with their source and location.
    if not re.search(r"error \{2,,wrong command\} from \S+: Wrong command\n\s+call Query, file demo, line \d+", out):
        fail("the wrong-command reply is not reported readably", out)
    if "Value out of range" not in out:
        fail("the out-of-range reply is not reported readably", out)
    # The refused configuration is a Win32 failure of the library's wrapper.
    expected = r"call WSAConnect, file Socket" if mode else r"call SetCommState, file CommPort"
    if not re.search(r"error \d+ from Win32: .+\n\s+" + expected + r", line \d+", out):
        fail("the Win32 failure is not reported with call and file", out)

    # The log file: its Windows path, mapped into the prefix's documents folder.
    m = re.search(r"Log file: (C:\\users\\[^\\]+\\Documents\\_Debug\\(\S+\.log))\n", out)
    if not m:
        fail("no log file named", out)
    user = m.group(1).split("\\")[2]
    path = os.path.join(build, "wine", "prefix", "drive_c", "users", user, "Documents", "_Debug", m.group(2))
    with open(path, "rb") as f:
        log = f.read()
    if log.startswith(b"\xef\xbb\xbf"):
        fail("the log file starts with a byte-order mark", out)
    text = log.decode("utf-8")
    if "\n" in text.replace("\r\n", ""):
        fail("a line of the log does not end with CR LF", out)
    # Every command sent is in a WRITE block's hex column, every reply in a READ block.
    dumps = re.findall(r"(SYNC|ASYNC) (WRITE|READ) request completed: (\d+) \(0x[0-9A-F]+\) bytes, [^\r]+\r\n((?: [0-9A-F]{2}[^\r]*\r\n)*)", text)
    sent = b"".join(bytes.fromhex(" ".join(line[:96] for line in d[3].split("\r\n"))) for d in dumps if d[1] == "WRITE")
    received = b"".join(bytes.fromhex(" ".join(line[:96] for line in d[3].split("\r\n"))) for d in dumps if d[1] == "READ")
    for command in [b"*IDN?\r\n", b"CONF:RATE 10\r\n", b"MEAS?\r\n", b"FETCH?\r\n", b"CONF:RATE 500\r\n"]:
        if command not in sent:
            fail("%r missing from the logged writes" % command, out)
    for reply in [b"ZENDAL,SIM-1,0001,1.0\r\n", b"OK\r\n", b"{2,,wrong command}\r\n"]:
        if reply not in received:
            fail("%r missing from the logged reads" % reply, out)
    if mode and "shutdown(int how=1) succeeded." not in text:
        fail("the socket's shutdown is not logged", out)
    print("demo transcript and log file check out (%d data blocks)" % len(dumps))


if __name__ == "__main__":
    main()

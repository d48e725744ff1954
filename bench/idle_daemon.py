#!/usr/bin/env python3
"""What the daemon costs while it does nothing: start-up time, memory and processor time.

    bench/idle_daemon.py [--daemon build/release/kelvod] [--seconds 60] [--starts 20]

Start-up is from the creation of the process to its word that it is ready; its peer in the same run is the start of a
program that does nothing (/bin/true, to its end).
"""
import argparse
import os
import pathlib
import signal
import socket
import statistics
import subprocess
import tempfile
import time


def start(daemon, root):
    """Starts the daemon; returns the process and the seconds until it said that it was ready."""
    path = os.path.join(root, "notify")
    with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as ready:
        ready.bind(path)
        ready.settimeout(10)
        begin = time.perf_counter()
        process = subprocess.Popen(
            [daemon, "--root", root, "--log", "stderr"],
            stderr=subprocess.DEVNULL,
            env={**os.environ, "NOTIFY_SOCKET": path},
        )
        assert b"READY=1" in ready.recv(100)
        elapsed = time.perf_counter() - begin
    os.unlink(path)
    return process, elapsed


def stop(process):
    process.send_signal(signal.SIGTERM)
    assert process.wait(10) == 0


def status(process, key):
    for line in pathlib.Path(f"/proc/{process.pid}/status").read_text().splitlines():
        if line.startswith(key + ":"):
            return int(line.split()[1])
    raise KeyError(key)


def processor_seconds(process):
    fields = pathlib.Path(f"/proc/{process.pid}/stat").read_text().rsplit(")", 1)[1].split()
    return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")


def start_times(arguments, root):
    ours, bare = [], []
    for _ in range(arguments.starts):
        process, elapsed = start(arguments.daemon, root)
        ours.append(elapsed * 1000)
        stop(process)
        begin = time.perf_counter()
        subprocess.run(["/bin/true"], check=True)
        bare.append((time.perf_counter() - begin) * 1000)
    return ours, bare


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--daemon", default="build/release/kelvod")
    parser.add_argument("--seconds", type=float, default=60)
    parser.add_argument("--starts", type=int, default=20)
    arguments = parser.parse_args()
    with tempfile.TemporaryDirectory() as root:
        ours, bare = start_times(arguments, root)
        print(f"start-up to ready   median {statistics.median(ours):5.1f} ms, worst {max(ours):5.1f} ms  (bound 50 ms)")
        print(f"  against /bin/true median {statistics.median(bare):5.1f} ms, ratio {statistics.median(ours) / statistics.median(bare):.1f}")
        process, _ = start(arguments.daemon, root)
        time.sleep(1)
        before = processor_seconds(process)
        time.sleep(arguments.seconds)
        used = processor_seconds(process) - before
        print(f"resident while idle {status(process, 'VmRSS') / 1024:5.1f} MB  (bound 12 MB)")
        print(f"processor           {100 * used / arguments.seconds:5.2f} % of a core over {arguments.seconds:.0f} s  (bound 0 %)")
        print(f"threads             {status(process, 'Threads'):5d}")
        stop(process)


if __name__ == "__main__":
    main()

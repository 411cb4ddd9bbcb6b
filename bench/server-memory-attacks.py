#!/usr/bin/env python3
"""Memory of tessal-sync-server under the attacks its limits are for, on loopback and SQLite.

Starts the server on a temporary database with one account, runs one attack and prints the server's
peak resident memory (VmHWM) and what it still holds afterwards (VmRSS), with the answers it gave.

  bench/server-memory-attacks.py SERVER_BINARY bodies [COUNT [BYTES]]   COUNT bodies at once (10, 32 MiB - 4 KiB)
  bench/server-memory-attacks.py SERVER_BINARY chunked [COUNT [BYTES]]  the same, chunked (10, 100 MB)
  bench/server-memory-attacks.py SERVER_BINARY readers [CONNECTIONS [RECORDS]]
      an account of RECORDS records (50,000); CONNECTIONS (100) ask for all of it three times each
      and never read, while the owner polls every half second for 16 s (each poll may take 5 s)
  bench/server-memory-attacks.py SERVER_BINARY idle [CONNECTIONS]
      one address opens CONNECTIONS (5,000) idle connections and reopens them as they close, while
      the owner polls from 127.0.0.2 every half second for 16 s

Extra arguments after `--` go to `serve`.
"""
import json
import os
import socket
import subprocess
import sys
import tempfile
import threading
import time

USER, PASSWORD = "owner@example.com", "owner password"


def memory(pid):
    fields = {}
    with open(f"/proc/{pid}/status") as status:
        for line in status:
            name, _, value = line.partition(":")
            fields[name] = value.strip()
    return fields["VmHWM"], fields["VmRSS"]


def body(action="head", iteration=0, device="owner", data=None, pad=0):
    request = {"user": USER, "password": PASSWORD, "action": action, "iteration": iteration,
               "device": device}
    if data is not None:
        request["data"] = data
    text = json.dumps(request)
    return text if pad <= len(text) else text[:-1] + ',"pad":"' + "x" * (pad - len(text) - 9) + '"}'


def exchange(port, payload, chunked=False, timeout=60, source=None):
    """Sends one request and returns its status (0 when the connection failed or timed out)."""
    try:
        with socket.create_connection(("127.0.0.1", port), timeout=timeout,
                                      source_address=(source, 0) if source else None) as connection:
            data = payload.encode()
            framing = "Transfer-Encoding: chunked" if chunked else f"Content-Length: {len(data)}"
            connection.sendall(f"POST /sync/tessal/sync.php HTTP/1.1\r\nHost: x\r\nConnection: close\r\n"
                               f"Content-Type: application/json\r\n{framing}\r\n\r\n".encode())
            try:
                for at in range(0, len(data), 1 << 20):
                    piece = data[at:at + (1 << 20)]
                    connection.sendall(b"%x\r\n%s\r\n" % (len(piece), piece) if chunked else piece)
                if chunked:
                    connection.sendall(b"0\r\n\r\n")
            except OSError:
                pass  # refused before the end: the answer is waiting
            reply = b""
            while b"\r\n" not in reply:
                more = connection.recv(65536)
                if not more:
                    break
                reply += more
            return int(reply.split(b" ")[1]) if reply.startswith(b"HTTP/1.1 ") else 0
    except OSError:
        return 0


def at_once(count, work):
    results = [None] * count
    threads = [threading.Thread(target=lambda i=i: results.__setitem__(i, work(i))) for i in range(count)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    return results


def owner_polls(port, iteration=0, seconds=16, source=None):
    """Polls (with nothing new) every half second with a 5 s timeout; the statuses."""
    statuses, end = [], time.time() + seconds
    while time.time() < end:
        statuses.append(exchange(port, body(iteration=iteration, device="laptop"), timeout=5, source=source))
        time.sleep(0.5)
    return statuses


def main():
    if len(sys.argv) < 3:
        sys.exit(__doc__)
    server, attack = sys.argv[1], sys.argv[2]
    extra = sys.argv[sys.argv.index("--") + 1:] if "--" in sys.argv else []
    numbers = [int(a) for a in sys.argv[3:len(sys.argv) - len(extra) - (1 if extra else 0)]]
    work = tempfile.mkdtemp(prefix="tessal-attack.")
    database = os.path.join(work, "sync.db")
    subprocess.run([server, "add-user", USER, "--db", database], input=PASSWORD + "\n", text=True,
                   check=True, stdout=subprocess.DEVNULL)
    process = subprocess.Popen([server, "serve", "--listen", "127.0.0.1:0", "--db", database] + extra,
                               stdout=subprocess.PIPE, text=True)
    port = int(process.stdout.readline().rsplit(":", 1)[1])
    try:
        exchange(port, body(device="laptop"))
        print("at start:  VmHWM %s, VmRSS %s" % memory(process.pid))
        if attack in ("bodies", "chunked"):
            count = numbers[0] if numbers else 10
            size = numbers[1] if len(numbers) > 1 else ((32 << 20) - 4096 if attack == "bodies" else 100_000_000)
            payload = body(pad=size)
            statuses = at_once(count, lambda i: exchange(port, payload, chunked=attack == "chunked"))
            print(f"{count} bodies of {size} bytes: statuses {sorted(statuses)}")
        elif attack == "readers":
            connections = numbers[0] if numbers else 100
            records = numbers[1] if len(numbers) > 1 else 50000
            for start in range(0, records, 5000):
                notes = {f"note-{n}@WTNote": {"text": f"note number {n} " + "t" * 80}
                         for n in range(start, min(records, start + 5000))}
                exchange(port, body("save", 0, "writer", {"i": notes}))
            head = body(device="reader").encode()
            ask = (b"POST /sync/tessal/sync.php HTTP/1.1\r\nHost: x\r\nContent-Length: %d\r\n\r\n%s"
                   % (len(head), head)) * 3
            stalled = []
            for _ in range(connections):
                connection = socket.socket()
                connection.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
                connection.connect(("127.0.0.1", port))
                connection.sendall(ask)
                stalled.append(connection)
            polls = owner_polls(port, (records + 4999) // 5000)  # one iteration per save
            print(f"{connections} readers that never read, {records} records: owner's polls {polls}")
            print("during:    VmHWM %s, VmRSS %s" % memory(process.pid))
            for connection in stalled:
                connection.close()
        elif attack == "idle":
            connections = numbers[0] if numbers else 5000
            stop = threading.Event()

            def hold():
                held = []
                while not stop.is_set():
                    while len(held) < connections // 8 and not stop.is_set():
                        try:
                            held.append(socket.create_connection(("127.0.0.1", port), timeout=1))
                        except OSError:
                            time.sleep(0.01)
                    held = [c for c in held if not closed(c)]
                for c in held:
                    c.close()

            def closed(connection):
                """Closed or answered (an idle connection is told only that it is refused)."""
                try:
                    connection.recv(1, socket.MSG_PEEK | socket.MSG_DONTWAIT)
                except BlockingIOError:
                    return False
                except OSError:
                    pass
                connection.close()
                return True

            holders = [threading.Thread(target=hold) for _ in range(8)]
            for holder in holders:
                holder.start()
            time.sleep(2)
            polls = owner_polls(port, source="127.0.0.2")  # the owner is elsewhere
            stop.set()
            for holder in holders:
                holder.join()
            print(f"{connections} idle connections from one address: owner's polls {polls}")
        else:
            sys.exit(__doc__)
        time.sleep(3)
        print("after:     VmHWM %s, VmRSS %s" % memory(process.pid))
    finally:
        process.terminate()
        process.wait()
        subprocess.run(["rm", "-rf", work])


if __name__ == "__main__":
    main()

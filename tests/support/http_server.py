#!/usr/bin/env python3
"""Local HTTP server for the tests, on 127.0.0.1 with a port the system picks at start.

    http_server.py start STATE_DIR   start in the background and return once it listens;
                                     STATE_DIR/http_server.port then holds the port and
                                     STATE_DIR/http_server.pid the server's process id
    http_server.py stop STATE_DIR    stop that server by its process id
    http_server.py serve STATE_DIR   run in the foreground (what start runs)

Routes (GET or POST):
    /respond?status=200&header=Name:%20value&header=...&body=text
        answers with that status (200 if absent), the given header lines in the given order
        (the parameter may repeat) and that body. A Content-Length is added before them unless
        one of them is a Content-Length (in any case).
"""
import http.server
import os
import signal
import subprocess
import sys
import time
import urllib.parse

PORT_FILE = "http_server.port"
PID_FILE = "http_server.pid"
LOG_FILE = "http_server.log"


class Handler(http.server.BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"

    def do_GET(self):
        self.answer()

    def do_POST(self):
        length = int(self.headers.get("Content-Length") or 0)
        self.rfile.read(length)
        self.answer()

    def answer(self):
        url = urllib.parse.urlsplit(self.path)
        if url.path != "/respond":
            self.send_error(404)
            return
        query = urllib.parse.parse_qs(url.query, keep_blank_values=True)
        status = int(query.get("status", ["200"])[0])
        body = query.get("body", [""])[0].encode("utf-8")
        headers = []
        for line in query.get("header", []):
            name, _, value = line.partition(":")
            headers.append((name, value.lstrip(" ")))
        self.send_response(status)
        if not any(name.lower() == "content-length" for name, _ in headers):
            self.send_header("Content-Length", str(len(body)))
        for name, value in headers:
            self.send_header(name, value)
        self.end_headers()
        self.wfile.write(body)

    def log_message(self, format, *args):
        sys.stderr.write("%s %s\n" % (self.address_string(), format % args))


def serve(state_dir):
    server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler)
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(0))
    # The port file appears whole, and only once the socket listens.
    temporary = os.path.join(state_dir, PORT_FILE + ".tmp")
    with open(temporary, "w") as port_file:
        port_file.write(str(server.server_address[1]))
    os.replace(temporary, os.path.join(state_dir, PORT_FILE))
    server.serve_forever()


def start(state_dir):
    os.makedirs(state_dir, exist_ok=True)
    stop(state_dir)
    port_path = os.path.join(state_dir, PORT_FILE)
    # The server must not hold the caller's output pipes, or the caller never sees an end.
    with open(os.path.join(state_dir, LOG_FILE), "w") as log:
        process = subprocess.Popen([sys.executable, os.path.abspath(__file__), "serve", state_dir],
                                   stdin=subprocess.DEVNULL, stdout=log, stderr=log, start_new_session=True)
    with open(os.path.join(state_dir, PID_FILE), "w") as pid_file:
        pid_file.write(str(process.pid))
    deadline = time.monotonic() + 20
    while not os.path.exists(port_path):
        if process.poll() is not None or time.monotonic() > deadline:
            stop(state_dir)
            sys.exit("the test HTTP server did not start; see " + os.path.join(state_dir, LOG_FILE))
        time.sleep(0.05)
    with open(port_path) as port_file:
        print("test HTTP server on 127.0.0.1:%s, process %d" % (port_file.read(), process.pid))


def stop(state_dir):
    pid_path = os.path.join(state_dir, PID_FILE)
    port_path = os.path.join(state_dir, PORT_FILE)
    if os.path.exists(pid_path):
        with open(pid_path) as pid_file:
            pid = int(pid_file.read())
        try:
            os.kill(pid, signal.SIGTERM)
            deadline = time.monotonic() + 5
            while time.monotonic() < deadline:
                # Reaps the server when this process started it; otherwise probes that it is gone.
                try:
                    if os.waitpid(pid, os.WNOHANG)[0] == pid:
                        break
                except ChildProcessError:
                    os.kill(pid, 0)
                time.sleep(0.05)
            else:
                os.kill(pid, signal.SIGKILL)
        except ProcessLookupError:
            pass
        os.remove(pid_path)
    if os.path.exists(port_path):
        os.remove(port_path)


def main():
    if len(sys.argv) != 3 or sys.argv[1] not in ("start", "stop", "serve"):
        sys.exit(__doc__)
    command, state_dir = sys.argv[1], sys.argv[2]
    {"start": start, "stop": stop, "serve": serve}[command](state_dir)


if __name__ == "__main__":
    main()

#!/usr/bin/env python3
"""Local HTTP and HTTPS servers for the tests and the demo, on 127.0.0.1 with ports the system picks.

    http_server.py start STATE_DIR   start in the background and return once both listen;
                                     STATE_DIR/http_server.port and https_server.port then hold
                                     the ports, STATE_DIR/http_server.pid the process id
    http_server.py stop STATE_DIR    stop that server by its process id
    http_server.py serve STATE_DIR   run in the foreground (what start runs)

The HTTPS listener uses a self-signed certificate made with openssl into STATE_DIR at start.
Routes (GET or POST; percent-encoded values stand for single bytes):
    /respond?status=200&header=Name:%20value&header=...&body=text&chunked=1&key=name
        that status (200 if absent), those header lines in order, that body; chunked sends it in
        pieces of 3 bytes, and otherwise a Content-Length is added unless a header line gives one
        (the connection then closes after the body, however long the length said it was);
        key counts the request under that name
    /count?key=name        how many requests /respond counted under that name, and forgets them
    /echo                  the method, then the Cookie, Content-Length, User-Agent and X-*
                           request headers as received, an empty line and the request body
    /big?size=N&chunked=1  N bytes of generated text (KelvraBigBody), with a Content-Length or chunked
    /site                  a sample HTML page of about 4 MiB, sent slowly enough to watch

A third listener, on the port in STATE_DIR/hostile_server.port, answers GET /<name> with the raw
bytes of the scripted reply of that name in HOSTILE_REPLIES (headers of any size, broken lengths,
a connection cut short, a reply that stalls), then closes.
"""
import http.server
import os
import signal
import socket
import socketserver
import ssl
import subprocess
import sys
import threading
import time
import urllib.parse

PORT_FILE = "http_server.port"
HTTPS_PORT_FILE = "https_server.port"
HOSTILE_PORT_FILE = "hostile_server.port"
PID_FILE = "http_server.pid"
LOG_FILE = "http_server.log"
# The generated body: byte i is BLOCK[i % len(BLOCK)], printable ASCII (tests rebuild it).
BLOCK = bytes(33 + (i * 7919) % 94 for i in range(65521))
counts = {}


def generated(size):
    whole, rest = divmod(size, len(BLOCK))
    for _ in range(whole):
        yield BLOCK
    if rest:
        yield BLOCK[:rest]


def sample_site():
    lines = (b"<p>Line %05d of the sample page, sent in slow pieces by the local server.</p>\n" % line
             for line in range(1, 50001))
    return b"<html><head><title>Kelvra sample site</title></head><body>\n" + b"".join(lines) + b"</body></html>\n"


class Handler(http.server.BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"
    # Headers and body leave in separate writes: with Nagle's algorithm the body would wait for
    # the client's delayed acknowledgement of the headers, some 40 ms a request.
    disable_nagle_algorithm = True

    # A body is read whatever the method: one left unread would reset the connection at its close.
    # The client holds its body back until its headers are acknowledged (Nagle's algorithm on its
    # side): acknowledging them at once saves a delayed acknowledgement a request.
    def do_GET(self):
        self.connection.setsockopt(socket.IPPROTO_TCP, socket.TCP_QUICKACK, 1)
        self.answer(self.rfile.read(int(self.headers.get("Content-Length") or 0)))

    do_POST = do_GET

    def answer(self, request_body):
        url = urllib.parse.urlsplit(self.path)
        query = urllib.parse.parse_qs(url.query, keep_blank_values=True, encoding="latin-1")
        value = lambda name, default="": query.get(name, [default])[0]
        headers = [tuple(line.split(":", 1)) for line in query.get("header", [])]
        if url.path == "/respond":
            counts[value("key")] = counts.get(value("key"), 0) + 1
            body = value("body").encode("latin-1")
            chunked = value("chunked") == "1"
            pieces = [body[start:start + 3] for start in range(0, len(body), 3)] if chunked else [body]
            return self.send(int(value("status", "200")), headers, pieces, chunked)
        if url.path == "/count":
            return self.send(200, [], [str(counts.pop(value("key"), 0)).encode()])
        if url.path == "/echo":
            echoed = [f"{name}: {text}" for name, text in self.headers.items()
                      if name in ("Cookie", "Content-Length", "User-Agent") or name.startswith("X-")]
            text = "\n".join([self.command] + echoed + ["", ""]).encode("latin-1")
            return self.send(200, [], [text + request_body])
        if url.path == "/big":
            size = int(value("size", "0"))
            chunked = value("chunked") == "1"
            return self.send(200, [] if chunked else [("Content-Length", str(size))], generated(size), chunked)
        if url.path == "/site":
            page = sample_site()
            headers = [("Content-Type", "text/html; charset=utf-8"), ("Set-Cookie", "visitor=demo; Path=/"),
                       ("Content-Length", str(len(page)))]
            return self.send(200, headers, [page[at:at + 65536] for at in range(0, len(page), 65536)], pace=0.03)
        self.send_error(404)

    def send(self, status, headers, pieces, chunked=False, pace=0.0):
        self.send_response(status)
        if chunked:
            self.send_header("Transfer-Encoding", "chunked")
        elif any(name.lower() == "content-length" for name, _ in headers):
            self.close_connection = True
        else:
            pieces = [b"".join(pieces)]
            self.send_header("Content-Length", str(len(pieces[0])))
        for name, text in headers:
            self.send_header(name, text.lstrip(" "))
        if isinstance(self.connection, ssl.SSLSocket):
            # Wine 8 reuses a kept-alive connection in any session, whatever its certificate
            # policy: a fresh one for every request has its certificate checked each time.
            self.send_header("Connection", "close")
            self.close_connection = True
        self.end_headers()
        for piece in pieces:
            self.wfile.write(b"%x\r\n%s\r\n" % (len(piece), piece) if chunked else piece)
            if pace:
                time.sleep(pace)
        if chunked:
            self.wfile.write(b"0\r\n\r\n")

    def log_message(self, format, *args):
        sys.stderr.write("%s %s\n" % (self.address_string(), format % args))


def hostile_reply(name):
    """The steps of a scripted reply: bytes to send, or seconds to wait before the next step."""
    status = b"HTTP/1.1 200 OK\r\n"
    ending = b"Content-Length: 2\r\n\r\nok"
    if name == "many-lines":  # a header block of 1 MiB in 2,048 lines
        return [status + b"".join(b"X-Line-%05d: %s\r\n" % (i, b"v" * 496) for i in range(2048)) + ending]
    if name == "long-line":  # one header line of 200 KiB
        return [status + b"X-Long: " + b"a" * 204800 + b"\r\n" + ending]
    if name == "cookies":
        return [status + b"".join(b"Set-Cookie: c%05d=%d\r\n" % (i, i) for i in range(20000)) + ending]
    if name == "huge-length":
        return [status + b"Content-Length: 99999999999999999999\r\n\r\nshort"]
    if name == "five-gib":
        return [status + b"Content-Length: 5368709120\r\n\r\nshort"]
    if name == "cut-headers":
        return [status + b"Content-Type: text/pl"]
    if name == "cut-body":
        return [status + b"Content-Length: 1000\r\n\r\npartial"]
    if name == "garbage-status":
        return [b"\x01\xffGARBAGE STATUS\r\nX-A: 1\r\n\r\nbody"]
    if name == "stall":  # the headers, then nothing for longer than any test waits
        return [status + b"Content-Length: 100\r\n\r\n", 4.0]
    return []  # "empty" and any other name: the connection closes without a byte


class HostileHandler(socketserver.BaseRequestHandler):
    def handle(self):
        request = b""
        while b"\r\n\r\n" not in request:
            data = self.request.recv(65536)
            if not data:
                return
            request += data
        name = request.split(b" ", 2)[1].decode("latin-1").lstrip("/")
        for step in hostile_reply(name):
            if isinstance(step, float):
                time.sleep(step)
            else:
                self.request.sendall(step)


class HostileServer(socketserver.ThreadingTCPServer):
    daemon_threads = True


def listen(state_dir, port_file, tls=None, server=None):
    if server is None:
        server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler)
    if tls:
        server.socket = tls.wrap_socket(server.socket, server_side=True)
    threading.Thread(target=server.serve_forever, daemon=True).start()
    # The port file appears whole, and only once the socket listens.
    temporary = os.path.join(state_dir, port_file + ".tmp")
    with open(temporary, "w") as file:
        file.write(str(server.server_address[1]))
    os.replace(temporary, os.path.join(state_dir, port_file))


def serve(state_dir):
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(0))
    certificate, key = (os.path.join(state_dir, "https_server." + kind) for kind in ("pem", "key"))
    subprocess.run(["openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days", "2", "-subj",
                    "/CN=127.0.0.1", "-keyout", key, "-out", certificate], check=True, capture_output=True)
    tls = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
    tls.load_cert_chain(certificate, key)
    listen(state_dir, HTTPS_PORT_FILE, tls)
    listen(state_dir, HOSTILE_PORT_FILE, server=HostileServer(("127.0.0.1", 0), HostileHandler))
    listen(state_dir, PORT_FILE)
    threading.Event().wait()


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
    for name in (PORT_FILE, HTTPS_PORT_FILE, HOSTILE_PORT_FILE):
        if os.path.exists(os.path.join(state_dir, name)):
            os.remove(os.path.join(state_dir, name))


def main():
    if len(sys.argv) != 3 or sys.argv[1] not in ("start", "stop", "serve"):
        sys.exit(__doc__)
    command, state_dir = sys.argv[1], sys.argv[2]
    {"start": start, "stop": stop, "serve": serve}[command](state_dir)


if __name__ == "__main__":
    main()

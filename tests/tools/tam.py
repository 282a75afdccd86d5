# SPDX-License-Identifier: BSD-2-Clause
"""A TSM that devices call, for tests: it says what it was told to say."""
import http.server
import threading
import time

TYPE = "application/otrp+json"


class Tam:
    """Answers the requests that come with `steps`, one each, then with `last`. A step is the body of a
    request, a status, (status, body, headers), None to hang up, or a function of the body that gives
    one of these."""

    def __init__(self, steps, tls=None, last=204):
        self.steps, self.last, self.seen = list(steps), last, []
        tam = self

        class Handler(http.server.BaseHTTPRequestHandler):
            protocol_version = "HTTP/1.1"

            def do_POST(self):
                body = self.rfile.read(int(self.headers["Content-Length"]))
                tam.seen.append((self.path, dict(self.headers), body, time.monotonic()))
                step = tam.steps.pop(0) if tam.steps else tam.last
                step = step(body) if callable(step) else step
                if step is None:
                    self.close_connection = True
                    return
                status, answer, headers = (step if isinstance(step, tuple) else
                                           (step, b"", {}) if isinstance(step, int) else
                                           (200, step, {}))
                self.send_response(status)
                for name, value in ({"Content-Type": TYPE, "Content-Length": len(answer)} | headers).items():
                    self.send_header(name, str(value))
                self.end_headers()
                self.wfile.write(answer)

            def log_message(self, *_):
                pass

        class Server(http.server.ThreadingHTTPServer):
            request_queue_size = 128

            def handle_error(self, *_):
                pass

        self.server = Server(("127.0.0.1", 0), Handler)
        if tls:
            self.server.socket = tls.wrap_socket(self.server.socket, server_side=True,
                                                 do_handshake_on_connect=False)
        self.url = f"http{'s' if tls else ''}://127.0.0.1:{self.server.server_port}/tam"
        threading.Thread(target=self.server.serve_forever, daemon=True).start()

    def bodies(self):
        return [body for _, _, body, _ in self.seen]

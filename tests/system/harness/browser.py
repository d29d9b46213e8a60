"""Plays a movie in a headless browser and prints what was seen and heard when, as JSON.

Arguments: MOVIE PROFILE, a folder for the browser. Run in namespaces of its own by players.py: the browser must reach
nothing but this server.
"""
import http.server
import json
import subprocess
import sys
import threading
from pathlib import Path

PAGE = Path(__file__).with_name("browser_page.html")
BROWSER = ["chromium", "--headless=new", "--no-sandbox", "--disable-gpu", "--no-first-run", "--disable-sync",
           "--disable-background-networking", "--disable-component-update", "--disable-default-apps",
           "--autoplay-policy=no-user-gesture-required"]


class Server(http.server.ThreadingHTTPServer):
    """Serves the page and the movie, and takes the result."""

    def __init__(self, movie):
        super().__init__(("127.0.0.1", 0), Handler)
        self.movie = movie
        self.result = None
        self.finished = threading.Event()


class Handler(http.server.BaseHTTPRequestHandler):
    """One request. A browser asks for a movie in ranges."""

    def log_message(self, format, *args):  # pylint: disable=redefined-builtin
        pass

    def do_POST(self):
        self.server.result = self.rfile.read(int(self.headers["Content-Length"])).decode()
        self.send_response(204)
        self.end_headers()
        self.server.finished.set()

    def do_GET(self):
        file, kind = {"/": (PAGE, "text/html"), "/movie": (self.server.movie, "video/mp4")}.get(self.path, (None, None))
        if file is None:
            self.send_error(404)
            return
        data = Path(file).read_bytes()
        wanted = self.headers.get("Range")
        first, _, last = wanted.removeprefix("bytes=").partition("-") if wanted else ("0", "", "")
        part = data[int(first):int(last) + 1 if last else len(data)]
        self.send_response(206 if wanted else 200)
        if wanted:
            self.send_header("Content-Range", f"bytes {first}-{int(first) + len(part) - 1}/{len(data)}")
        self.send_header("Content-Type", kind)
        self.send_header("Accept-Ranges", "bytes")
        self.send_header("Content-Length", str(len(part)))
        self.end_headers()
        try:
            self.wfile.write(part)
        except OSError:
            pass  # the browser has seen enough of it


def main():
    server = Server(sys.argv[1])
    threading.Thread(target=server.serve_forever, daemon=True).start()
    address = f"http://127.0.0.1:{server.server_port}/"
    with subprocess.Popen([*BROWSER, f"--user-data-dir={sys.argv[2]}", address], stdout=subprocess.DEVNULL,
                          stderr=subprocess.DEVNULL) as browser:
        finished = server.finished.wait(90)
        browser.terminate()
    print(server.result if finished else json.dumps({"error": "the page gave no result"}))


if __name__ == "__main__":
    main()

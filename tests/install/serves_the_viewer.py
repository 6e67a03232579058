"""The installed program shows the viewer: serves_the_viewer.py PROGRAM DIST, where DIST has the files that the build
made of it, or is empty in a build without the viewer. Nothing but the program is asked, from an empty folder."""
import os
import pathlib
import re
import subprocess
import sys
import tempfile
import urllib.request

PROGRAM = sys.argv[1]
DIST = pathlib.Path(sys.argv[2]) if sys.argv[2] else None


def get(url):
    with urllib.request.urlopen(url, timeout=20) as answer:
        return answer.read(), answer.headers


def check_page(url):
    page, headers = get(url)
    policy = headers["Content-Security-Policy"]
    assert "default-src 'none'; script-src 'self'; style-src 'self';" in policy, policy
    assert "unsafe" not in policy, policy
    assert headers["Content-Type"] == "text/html; charset=utf-8", headers["Content-Type"]
    text = page.decode()
    # Nothing comes from elsewhere: neither by a whole address nor by one without a protocol.
    assert not re.search(r"(?:src|href)=.?(?:https?:)?//", text)
    return text, page


def check_viewer(url):
    text, page = check_page(url)
    names = sorted(path.name for path in DIST.iterdir())
    assert names == ["first.js", "index.html", "viewer.css", "viewer.js"], names
    assert 'src="viewer.js"' in text and 'href="viewer.css"' in text
    for name in names:
        assert get(url + name)[0] == (DIST / name).read_bytes(), name
    assert page == (DIST / "index.html").read_bytes()


def main():
    with tempfile.TemporaryDirectory() as folder:
        plain = {"PATH": os.environ["PATH"], "HOME": folder}
        with subprocess.Popen([PROGRAM, "serve", folder, "--port", "0", "-q"], stdout=subprocess.PIPE, cwd=folder,
                              env=plain) as server:
            try:
                url = server.stdout.readline().decode().strip()
                if DIST:
                    check_viewer(url)
                else:
                    assert "built without the viewer" in check_page(url)[0]
            finally:
                server.terminate()
        assert server.returncode == 0, server.returncode


main()

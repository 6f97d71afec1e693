"""Opens a page in headless Chromium."""
import json
import os
import re
import shutil
import subprocess
import tempfile

LIMIT_S = 120
_OPTIONS = ("--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run", "--disable-background-networking",
            "--disable-component-update", "--disable-sync", "--hide-scrollbars", "--force-device-scale-factor=1")


def need(test):
    if not shutil.which("chromium"):
        test.skipTest("chromium is not installed")


def _run(page, *options):
    with tempfile.TemporaryDirectory() as profile:
        return subprocess.run(["chromium", *_OPTIONS, "--user-data-dir=" + profile, *options,
                               page if page.startswith("http") else "file://" + os.path.abspath(page)],
                              capture_output=True, text=True, timeout=LIMIT_S, check=True).stdout


def dom(page, *options):
    return _run(page, "--dump-dom", *options)


def screenshot(page, picture, size=(1240, 1000), *options):
    _run(page, *options, "--window-size=%d,%d" % size, "--screenshot=" + os.path.abspath(picture))


WIDTHS = (360, 768, 1400)  # a telephone's, a tablet's, a screen's
_MEASURE = """<script>addEventListener("load", () => {
  for (const one of document.querySelectorAll("details")) one.open = true;
  const style = getComputedStyle(document.body);
  parent.postMessage([innerWidth, document.documentElement.scrollWidth, style.color, style.backgroundColor], "*");
});</script>"""
_FRAMES = """<!DOCTYPE html>%s<script>const seen = [];
addEventListener("message", message => { seen.push(message.data); document.title = JSON.stringify(seen); });</script>"""


def _luminance(color):
    parts = [int(part) / 255 for part in re.findall(r"\d+", color)[:3]]
    return sum(weight * (part / 12.92 if part <= 0.04045 else ((part + 0.055) / 1.055) ** 2.4)
               for weight, part in zip((0.2126, 0.7152, 0.0722), parts))


def measured(page, dark):
    """Width, width that the content needs, luminance of text and paper at each of WIDTHS, with all that can be opened open."""
    with tempfile.TemporaryDirectory() as folder:
        with open(page) as source, open(os.path.join(folder, "page.html"), "w") as copy:
            text = re.sub(r'<meta http-equiv="Content-Security-Policy"[^>]*>', "", source.read())
            copy.write(text.replace("</body>", _MEASURE + "</body>"))
        frames = os.path.join(folder, "frames.html")
        with open(frames, "w") as file:
            file.write(_FRAMES % "".join('<iframe width="%d" height="900" style="border:0" src="page.html"></iframe>' % width for width in WIDTHS))
        shown = dom(frames, "--window-size=1500,1000", "--virtual-time-budget=5000", "--blink-settings=preferredColorScheme=%d" % (not dark))
    found = sorted(json.loads(re.search("<title>(.*?)</title>", shown)[1]))
    assert [row[0] for row in found] == list(WIDTHS), found
    return [(width, needed, _luminance(ink), _luminance(paper)) for width, needed, ink, paper in found]

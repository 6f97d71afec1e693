"""Opens a page in headless Chromium."""
import os
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


def screenshot(page, picture, size=(1240, 1000)):
    _run(page, "--window-size=%d,%d" % size, "--screenshot=" + os.path.abspath(picture))

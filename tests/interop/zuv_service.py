"""Starts zuv-service on a free port for a test, and stops it."""
import contextlib
import os
import select
import subprocess
import tempfile


@contextlib.contextmanager
def running(program, *options):
    """Gives the address, such as http://127.0.0.1:40001, of a service that stops at the end of the block."""
    with tempfile.TemporaryDirectory() as folder:
        database = os.path.join(folder, "zuv.db")
        process = subprocess.Popen([program, "--port", "0", "--database", database, *options],
                                   stdout=subprocess.PIPE, text=True)
        try:
            ready, _, _ = select.select([process.stdout], [], [], 30)
            line = process.stdout.readline() if ready else ""
            if not line.startswith("listening on "):
                raise RuntimeError("the service did not start: " + repr(line))
            yield line[len("listening on "):].strip()
        finally:
            process.terminate()
            if process.wait(30) != 0:
                raise RuntimeError("the service ended with %d" % process.returncode)

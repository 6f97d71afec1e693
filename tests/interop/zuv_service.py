"""Starts the two services that the tests call, each on a free port: zuv-service, and the one on an independent stack."""
import contextlib
import os
import signal
import tempfile

import listening


@contextlib.contextmanager
def running(program, *options):
    """Gives the address, such as http://127.0.0.1:40001, of a zuv-service that stops at the end of the block."""
    with tempfile.TemporaryDirectory() as folder:
        database = os.path.join(folder, "zuv.db")
        with listening.started([program, "--port", "0", "--database", database, *options]) as address:
            yield address


def running_npm(folder, schemas, *options):
    """The same for the service in the folder, where its packages are installed."""
    return listening.started(["node", "server.js", schemas, *options], end_status=-signal.SIGTERM, cwd=folder)

"""Starts the two services that the tests call, each on a free port: zuv-service, and the one on an independent stack."""
import contextlib
import os
import signal
import tempfile

import listening


@contextlib.contextmanager
def running(program, *options, **how):
    """Gives the address of a zuv-service that stops at the end of the block; `how` is for listening.started. Its documents go
    with it unless the options name a database."""
    with tempfile.TemporaryDirectory() as folder:
        place = [] if "--database" in options else ["--database", os.path.join(folder, "zuv.db")]
        with listening.started([program, "--port", "0", *place, *options], **how) as address:
            yield address


def running_npm(folder, schemas, *options):
    """The same for the service in the folder, where its packages are installed."""
    return listening.started(["node", "server.js", schemas, *options], end_status=-signal.SIGTERM, cwd=folder)

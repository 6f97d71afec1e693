"""Starts a program that says "listening on ADDRESS" once it is ready, and stops it."""
import contextlib
import select
import subprocess

READY = "listening on "
LIMIT_S = 60


class Address(str):
    """That of a program which listens, such as http://127.0.0.1:40001."""
    process = None  # subprocess.Popen


@contextlib.contextmanager
def started(command, end_status=0, **options):
    """Gives the Address of a program that is stopped at the end of the block.

    end_status is what it has to end with when it is asked to terminate; options are those of subprocess.Popen.
    """
    process = subprocess.Popen(command, stdout=subprocess.PIPE, text=True, **options)
    try:
        ready, _, _ = select.select([process.stdout], [], [], LIMIT_S)
        line = process.stdout.readline() if ready else ""
        if not line.startswith(READY):
            raise RuntimeError("%s did not start: %r" % (command[0], line))
        address = Address(line[len(READY):].strip())
        address.process = process
        yield address
    finally:
        process.terminate()
        try:
            status = process.wait(LIMIT_S)
        except subprocess.TimeoutExpired:
            process.kill()
            status = process.wait()
        process.stdout.close()
    if status != end_status:
        raise RuntimeError("%s ended with %d" % (command[0], status))

"""Commands that a text shows, run as they are there, one shell for all; what they print is what the text says.

In the text a command begins with "$ " and goes on in lines with "> "; other lines are output, "..." whatever differs.
"""
import os
import re
import subprocess

import zuv


def of(blocks):
    """(command, expected output) of literal blocks."""
    found = []
    for line in "".join(blocks).splitlines():
        if line.startswith("$ "):
            found.append((line[2:], []))
        elif line.startswith("> ") and not found[-1][1]:
            found[-1] = (found[-1][0] + "\n" + line[2:], [])
        else:
            found[-1][1].append(line)
    return found


def _pattern(lines):
    text = re.escape("".join(line + "\n" for line in lines)).replace(r"\.\.\.", ".*?")
    return re.compile(r"\A" + text + (".*" if lines and lines[-1].endswith("...") else "") + r"\Z", re.S)


def check(test, rows, folder, **environment):
    script = "".join("{ %s\n} 2>&1; printf '\\0'\n" % command for command, _ in rows)
    run = subprocess.run(["bash", "-c", script], capture_output=True, text=True, timeout=zuv.LIMIT_S, cwd=folder, env={
        **os.environ, "XDG_CONFIG_HOME": os.devnull, "PATH": os.path.dirname(zuv.PROGRAM) + ":" + os.environ["PATH"], **environment})
    outputs = run.stdout.split("\0")[:-1]
    test.assertEqual((len(outputs), run.stderr), (len(rows), ""))
    for (command, expected), output in zip(rows, outputs):
        with test.subTest(command=command):
            test.assertRegex(output, _pattern(expected))

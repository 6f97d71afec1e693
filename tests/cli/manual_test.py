"""The manual and the page about the command line: their examples do what they say, options and exit codes are the program's.
And completion in bash and zsh."""
import os
import pathlib
import re
import shutil
import subprocess
import tempfile
import unittest

import examples
import zuv
import programs  # of the interoperability tests: servers and certificates

MANUAL = os.path.join(zuv.SOURCE, "docs", "man", "zuv.1")
SERVICE_MANUAL = os.path.join(zuv.SOURCE, "docs", "man", "zuv-service.1")
PAGE = os.path.join(zuv.SOURCE, "docs", "command-line.md")
COMPLETION = os.path.join(zuv.SOURCE, "cli", "completion", "zuv.")
HELPERS = "/usr/share/bash-completion/bash_completion"

def source():
    return pathlib.Path(MANUAL).read_text()


def exit_codes():
    return re.findall(r"EXIT_\w+ = (\d+)", pathlib.Path(zuv.SOURCE, "cli", "exit_codes.h").read_text())


class manual(unittest.TestCase):
    def test_the_examples_do_what_the_text_says(self):
        rows = examples.of(block.replace("\\e", "\\") for block in re.findall(r"(?ms)^\.Bd -literal.*?\n(.*?)^\.Ed", source()))
        self.assertGreater(len(rows), 20)
        with tempfile.TemporaryDirectory() as folder, zuv.service() as address:
            examples.check(self, rows, folder, ZUV_ENDPOINT=address)

    def test_so_does_the_page_about_the_command_line(self):
        text = pathlib.Path(PAGE).read_text().replace("http://127.0.0.1:9080", "$service")
        rows = examples.of(re.findall(r"(?ms)^```console\n(.*?)^```$", text))
        self.assertGreater(len(rows), 30)
        self.assertEqual(re.findall(r"(?m)^\| (\d+) \|", text), exit_codes())
        with tempfile.TemporaryDirectory() as folder, zuv.service() as open_to_all, \
                zuv.service("--user", "ada", "--password", "sesame") as locked:
            programs.certificates(folder)
            with programs.stunnel(folder, locked) as (port,):
                examples.check(self, rows, folder, service=open_to_all, secured="https://127.0.0.1:%d" % port)

    def test_options_and_exit_codes_are_those_of_the_program(self):
        noted = set(re.findall(r"Fl Fl ([a-z0-9-]+)", source())) - {"help"}
        listed = set()
        for command in ("profile get", "ping", "data get", "data put", "new", "check", "trace"):
            listed |= set(re.findall(r"(?m)^  (?:-\w,)?--([a-z0-9-]+)", zuv.run(*command.split(), "--help").stdout))
        self.assertEqual(noted, listed - {"help"})
        noted = set(re.findall(r"Fl Fl ([a-z0-9-]+)", pathlib.Path(SERVICE_MANUAL).read_text()))
        run = subprocess.run([zuv.SERVICE, "--help"], capture_output=True, text=True, timeout=zuv.LIMIT_S)
        self.assertEqual(noted, set(re.findall(r"(?m)^  (?:-\w,)?--([a-z0-9-]+)", run.stdout)) - {"help"})
        self.assertEqual(subprocess.run([zuv.SERVICE, "--no"], capture_output=True, timeout=zuv.LIMIT_S).returncode, 2)
        codes = exit_codes()
        self.assertEqual(re.findall(r"(?m)^\.It (\d+)$", source()), codes)
        self.assertEqual(re.findall(r"(\d+) [a-zA-Z]", zuv.run("--help").stdout.split("Exit:")[1]), codes)

    def test_the_page_is_well_made(self):
        if not shutil.which("mandoc"):
            self.skipTest("mandoc is not installed")
        run = subprocess.run(["mandoc", "-T", "lint", "-W", "warning", MANUAL, SERVICE_MANUAL], capture_output=True, text=True)
        self.assertEqual((run.returncode, run.stdout), (0, ""))

    def bash_completes(self, words):
        line = "zuv " + " ".join(words)
        split = re.findall(r":|[^:\s]+", line) + ([""] if line.endswith(" ") else [])
        return ["bash", "-c", '. ' + HELPERS + '; . "$0"; '
                'COMP_WORDBREAKS=" :"; COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); COMP_LINE="%s"; COMP_POINT=${#COMP_LINE}; '
                '_zuv; printf "%%s\\n" "${COMPREPLY[@]}"' % line, COMPLETION + "bash", *split]

    def zsh_completes(self, words):
        return ["zsh", "-fc", 'compadd() { shift; print -rl -- "$@" }; _files() { }; '
                'words=("$@"); CURRENT=$#; PREFIX=${words[-1]}; . "$0"', COMPLETION + "zsh", "zuv", *words]

    def test_shells_complete_commands_options_and_classes(self):
        shells = [self.bash_completes] * os.path.exists(HELPERS) + [self.zsh_completes] * bool(shutil.which("zsh"))
        if not shells:
            self.skipTest("neither bash-completion nor zsh is installed")
        rows = ((["pro"], ["problemreport", "profile"]), (["profile", ""], ["add", "create", "get", "refreshCredentials", "remove", "set"]),
                (["profile", "get", "--sil"], ["--silence-limit"]), (["new", "Client.Authentication.C"], ["Client.Authentication.CredentialsExpired",
                                                       "Client.Authentication.CredentialsMismatch"]), (["check", "--class", "Addr"], ["Address"]),
                (["profile", "get", "--output", ""], []), (["trace", "--h"], ["--help", "--html"]), (["new", "protocol:Addr"], ["Address"]))
        for shell in shells:
            for words, expected in rows:
                with self.subTest(shell=shell.__name__, words=words):
                    run = subprocess.run(shell(words), capture_output=True, text=True, timeout=60,
                                         env={**os.environ, "PATH": os.path.dirname(zuv.PROGRAM) + ":" + os.environ["PATH"]})
                    self.assertEqual(run.stderr, "")
                    prefix = "protocol:" if shell == self.zsh_completes and ":" in words[-1] else ""  # to bash a word of its own
                    self.assertEqual(sorted(filter(None, run.stdout.split("\n"))), [prefix + one for one in expected])

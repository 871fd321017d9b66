#!/usr/bin/env python3
"""check_completion.py SHARE: types into real shells at a terminal, and fails unless Tab completes
corvexctl's words and offers all of them. The completions are those under SHARE, corvexctl is found
on PATH."""

import os
import pty
import re
import select
import subprocess
import sys
import time

SHELLS = {
    "bash": (
        ["bash", "--norc", "--noprofile", "-i"],
        "bind 'set completion-query-items 0'; bind 'set page-completions off'; "
        ". {share}/bash-completion/completions/corvexctl",
    ),
    "zsh": (
        ["zsh", "-f", "-i"],
        "fpath=({share}/zsh/vendor-completions $fpath); LISTMAX=1000; "
        "autoload -U compinit; compinit -D -u",
    ),
}
PATIENCE = 20  # seconds
CLEAR_LINE = "\x15"


class Terminal:
    """A shell at a terminal."""

    def __init__(self, command):
        child, self.fd = pty.fork()
        if child == 0:
            os.execvpe(command[0], command, dict(os.environ, TERM="dumb", PS1=""))

    def type(self, keys, is_done):
        """What appears from the typing on, until it is_done, or nothing has come for too long."""
        os.write(self.fd, keys.encode())
        seen, end = "", time.monotonic() + PATIENCE
        while not is_done(seen) and time.monotonic() < end:
            if select.select([self.fd], [], [], 0.1)[0]:
                seen += os.read(self.fd, 4096).decode(errors="replace")
        return seen


def check(shell, share, words):
    command, setup = SHELLS[shell]
    terminal = Terminal(command)
    terminal.type(setup.format(share=share) + "; echo re''ady\n", lambda seen: "ready" in seen)
    if "LOGBEGIN" not in terminal.type("corvexctl logb\t", lambda seen: "LOGBEGIN" in seen):
        sys.exit(f"{shell} does not complete logb")

    def offered(seen):
        return set(re.findall(r"\b[A-Z_]{6,}\b", seen))

    seen = terminal.type(CLEAR_LINE + "corvexctl \t\t", lambda seen: offered(seen) >= words)
    if offered(seen) != words:
        sys.exit(f"{shell} offers {sorted(offered(seen))} and not {sorted(words)}")
    os.close(terminal.fd)


def main():
    listed = subprocess.run(["corvexctl", "--list"], stdout=subprocess.PIPE, check=True, text=True)
    words = {line.split()[0] for line in listed.stdout.splitlines()}
    for shell in SHELLS:
        check(shell, sys.argv[1], words)


if __name__ == "__main__":
    main()

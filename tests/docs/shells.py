# SPDX-License-Identifier: Apache-2.0
"""Lets real shells complete command lines: bash and zsh on a terminal of their own, fish by its own question."""

import os
import pathlib
import pty
import select
import shlex
import shutil
import subprocess
import time

PATIENCE = 60


class TerminalShell:
    """A shell on a terminal. One key inserts all candidates into the line, another writes the line to a file."""

    INSERT, TELL = b"\x18a", b"\x18r"  # Ctrl-X a, Ctrl-X r

    def __init__(self, arguments, environment, directory, ready):
        self.line_file = directory / "line"
        self.process_id, self.terminal = pty.fork()
        if self.process_id == 0:
            try:
                os.chdir(directory)
                os.execvpe(arguments[0], arguments, environment)
            finally:
                os._exit(127)
        os.set_blocking(self.terminal, False)
        self.shown = b""
        self.wait_for(ready.exists)  # typed earlier, keys would reach a terminal that still echoes them

    def wait_for(self, condition):
        end = time.monotonic() + PATIENCE
        while not condition():
            if select.select([self.terminal], [], [], 0.02)[0]:
                self.shown += os.read(self.terminal, 65536)
            if time.monotonic() > end:
                raise AssertionError(f"the shell does not answer; it shows {self.shown[-2000:]}")

    def line_after(self, line):
        """Returns the command line when all candidates have been inserted."""
        self.line_file.unlink(missing_ok=True)
        os.write(self.terminal, line.encode() + self.INSERT + self.TELL)
        self.wait_for(self.line_file.exists)
        return self.line_file.read_text()

    def offers(self, line):
        after = self.line_after(line)
        # Nothing fits when nothing changes. No candidate of the tests has spaces before the word that is completed.
        return [] if after == line else shlex.split(after)[line.count(" "):]

    def close(self):
        os.close(self.terminal)
        os.waitpid(self.process_id, 0)


def write_script(directory, twctl, shell):
    script = directory / f"completion.{shell}"
    script.write_text(subprocess.run([twctl, "completion", shell], check=True, text=True, capture_output=True).stdout)
    return script


def bash(directory, environment, twctl):
    script = write_script(directory, twctl, "bash")
    start = directory / "start.bash"
    start.write_text(f"""source {script}
_twctl_patience={PATIENCE}
bind 'set bell-style none'
bind 'set completion-query-items 0'
bind '"\\C-xa": insert-completions'
_tell() {{ printf '%s' "$READLINE_LINE" >line.new; mv line.new line; READLINE_LINE=''; READLINE_POINT=0; }}
bind -x '"\\C-xr": _tell'
PROMPT_COMMAND=": >ready.bash"
""")
    return TerminalShell(["bash", "--noprofile", "--rcfile", str(start), "-i"], environment, directory, directory / "ready.bash")


def zsh(directory, environment, twctl):
    script = write_script(directory, twctl, "zsh")
    (directory / ".zshrc").write_text(f"""autoload -U compinit
compinit -u -D
source {script}
_twctl_patience={PATIENCE}
_tell() {{ printf '%s' "$BUFFER" >line.new; mv line.new line; BUFFER='' }}
zle -N _tell
zle -C all-matches complete-word _generic
zstyle ':completion:all-matches:*' insert true
zstyle ':completion:all-matches::::' completer _all_matches _complete
bindkey '^Xa' all-matches
bindkey '^Xr' _tell
precmd() {{ : >ready.zsh }}
""")
    return TerminalShell(["zsh", "-d", "-i"], {**environment, "ZDOTDIR": str(directory)}, directory, directory / "ready.zsh")


class Fish:
    def __init__(self, directory, environment, twctl):
        self.script = write_script(directory, twctl, "fish")
        self.directory, self.environment = directory, environment

    def lines(self, line):
        """Returns each candidate with its description, if it has one."""
        answer = subprocess.run(
            ["fish", "--no-config", "-c", f"source {self.script}; set -g __twctl_patience {PATIENCE}; complete -C $argv[1]", line],
            env=self.environment, cwd=self.directory, text=True, stdin=subprocess.DEVNULL, capture_output=True, timeout=PATIENCE,
        )
        if answer.stderr:
            raise AssertionError(f"completing {line}: {answer.stderr}")
        return answer.stdout.splitlines()

    def offers(self, line):
        return [candidate.split("\t")[0] for candidate in self.lines(line)]

    def close(self):
        pass


SHELLS = {"bash": bash, "zsh": zsh, "fish": Fish}


def missing_shells():
    return [name for name in SHELLS if shutil.which(name) is None]

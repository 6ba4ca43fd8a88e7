"""ferrixctl, as a person or a script runs it inside a box."""
import json
import os
import pty
import select
import subprocess

from ferrix.box import PACKAGE

PROGRAM = f"{PACKAGE}/target/bin/ferrixctl"
DONE, REFUSED, USAGE, NOT_REACHABLE = range(4)


def run(*words, **environment):
    """(exit status, standard output, standard error)."""
    done = subprocess.run([PROGRAM, *words], check=False, text=True, timeout=120,
                          capture_output=True, env={**os.environ, **environment})
    return done.returncode, done.stdout, done.stderr


def ok(*words):
    """The standard output of a command that has to succeed, in silence otherwise."""
    status, output, errors = run(*words)
    assert (status, errors) == (DONE, ""), f"{words}: {status} {output} {errors}"
    return output


def read(*words):
    """What a reading command says as JSON."""
    return json.loads(ok(*words, "--json"))


def refused(*words, status=REFUSED):
    """The sentence on standard error of a command that ends with this status."""
    got, output, errors = run(*words)
    assert (got, output) == (status, ""), f"{words}: {got} {output} {errors}"
    assert errors.startswith("ferrixctl: ") and "\033" not in errors, errors
    return errors


def on_terminal(*words, **environment):
    """The exit status and all that is written to a terminal of 80 columns."""
    master, slave = pty.openpty()
    with subprocess.Popen([PROGRAM, *words], stdin=slave, stdout=slave, stderr=slave,
                          env={"TERM": "xterm", "PATH": os.environ["PATH"], **environment}) as child:
        os.close(slave)
        written = b""
        while select.select([master], [], [], 120)[0]:
            try:
                part = os.read(master, 65536)
            except OSError:  # the other end is closed
                break
            if not part:
                break
            written += part
        os.close(master)
        return child.wait(60), written.decode()

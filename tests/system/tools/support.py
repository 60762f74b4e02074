"""What the tests of the program share: running it, making streams, a folder for files."""
import contextlib
import json
import os
import pathlib
import resource
import subprocess
import tempfile
import time
import unittest

# What runs a program of another machine here; empty when it is this machine's.
EMULATOR = [word for word in os.environ.get("TAV_EMULATOR", "").split("|") if word]
WINDOWS = os.environ["TAV_TOOL"].endswith(".exe")
with open(os.environ["TAV_TOOL"], "rb") as program:
    BIG_ENDIAN = program.read(6) == b"\x7fELF\x02\x02"
TAV = [*EMULATOR, os.environ["TAV_TOOL"]]
GENERATE = [*EMULATOR, os.environ.get("TAV_GENERATE", "")]
# A build with sanitizers needs terabytes of addresses and more time: limits of memory and of time say nothing there.
SANITIZED = os.environ.get("TAV_SANITIZED", "") != ""

# How long something may take that is over at once. It ends a test that hangs, and says nothing of how fast a machine is that
# does something else, too, or runs a build with sanitizers.
PATIENCE = 600
LONGEST_MESSAGE = 2000


class Result:
    def __init__(self, done):
        self.status = done.returncode
        self.raw = done.stdout
        self.out = done.stdout.decode("utf-8", "replace")
        self.err = done.stderr.decode("utf-8", "replace")


def tav(*arguments, stdin=None, **more):
    """Runs the program; it has to end."""
    done = subprocess.run([*TAV, *map(str, arguments)], input=stdin if stdin is not None else b"",
                          capture_output=True, timeout=PATIENCE, **more)
    return Result(done)


def tav_in_little_memory(*arguments):
    """Runs the program where it gets 400 MiB of addresses, its own code included."""
    if SANITIZED or EMULATOR:  # an emulator takes all addresses that it can get
        return tav(*arguments)
    return tav(*arguments, preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_AS, (400 << 20, 400 << 20)))


@contextlib.contextmanager
def running(words, **streams):
    """A process beside the block, which waits for its end. A check that fails in the block ends the process, too: one
    that does not end by itself would keep the test from telling."""
    with subprocess.Popen([str(word) for word in words], **streams) as process:
        try:
            yield process
        except BaseException:
            process.kill()
            raise


def until(condition):
    """Waits until a condition holds, and returns what it gives."""
    deadline = time.monotonic() + PATIENCE
    while not (found := condition()) and time.monotonic() < deadline:
        time.sleep(0.005)
    return found


def generate(path, *options):
    """Writes a random stream and returns what is in it."""
    done = subprocess.run([*GENERATE, str(path), *map(str, options)], capture_output=True, check=True, timeout=PATIENCE)
    return json.loads(done.stdout)


def tree_rows(text):
    """Offset, size and path of every node that `tav tree --paths --width 0` lists, and the damaged rows apart."""
    nodes, damaged = [], []
    for line in text.splitlines():
        fields = line.split()
        if " damaged  " in line or line.endswith(" damaged"):
            damaged.append(int(fields[0], 16))
        elif len(fields) > 2 and fields[2].startswith("/"):
            nodes.append((int(fields[0], 16), fields[1], fields[2]))
    return nodes, damaged


def bytes_of_hex(text):
    """The bytes that the rows of `tav hex` show, and whether each is at its own place, once."""
    made = bytearray()
    for line in text.splitlines():
        if line.startswith(";") or line == "*":
            continue
        offset = int(line.split(":")[0], 16)
        if offset < len(made):
            raise AssertionError(f"the byte at {offset:#x} is shown twice")
        made += bytes(offset - len(made))
        made += bytes.fromhex(line.split(": ", 1)[1][:40].replace(" ", ""))
    return bytes(made)


def nodes_of(path, *options):
    """Types of all nodes but those that only end a group, in stream order, as the JSON has them."""
    lines = (json.loads(line) for line in tav("json", path, "--lines", *options).out.splitlines())
    return [line["type"] for line in lines if line.get("id", 65001) not in (65000, 65001)]


class ToolTest(unittest.TestCase):
    def _formatMessage(self, msg, standardMsg):
        """What a failure says. Outputs of megabytes are cut: nobody reads them, and logs have limits."""
        text = super()._formatMessage(msg, standardMsg)
        if len(text) <= LONGEST_MESSAGE:
            return text
        half = LONGEST_MESSAGE // 2
        return f"{text[:half]}\n... {len(text) - 2 * half} characters left out ...\n{text[-half:]}"

    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-test-")
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def snapshot(self, *options):
        path = self.folder / "x.tav"
        result = tav("snapshot", "-o", path, "--force", *options)
        self.assertEqual((result.status, result.err), (0, ""))
        return path

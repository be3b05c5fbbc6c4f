"""The virtual machine: boots, and says what came over its serial ports."""

import os
import re
import selectors
import subprocess
import time

# What the machine writes to the debug-exit device ends the emulator with twice that and one more. A
# kernel that panics ends it with 0.
ALL_PASSED = 2 * 0x2A + 1
SOME_FAILED = 2 * 0x2B + 1

_COMMON = (
    "-M pc -cpu max -smp 1 -nodefaults -no-user-config -display none -no-reboot "
    "-device isa-debug-exit,iobase=0xf4 -serial stdio"
).split()
# Time as it goes, or as the machine's own instructions count it: the same on a busy host, and
# waiting takes no time.
ACCELERATORS = {
    "real": ["-accel", "tcg,thread=multi"],
    "virtual": ["-accel", "tcg,thread=single", "-icount", "shift=2,sleep=off"],
}
_KERNEL = "console=ttyS0 quiet panic=-1 tsc=reliable mitigations=off cryptomgr.notests"


class Result:
    """How a check went, as the machine tells it: "passed", "FAILED" or "skipped"."""

    def __init__(self, name, outcome, seconds, note):
        self.name, self.outcome, self.seconds, self.note = name, outcome, float(seconds), note


class VirtualMachine:
    """One boot. `on_result` gets each result as it comes, then the lines that the check wrote."""

    def __init__(self, program, kernel, initramfs, clock, on_result, memory=512, arguments=""):
        """`memory`: in MiB; `arguments`: more for the kernel's command line."""
        self.console = []  # all lines, the results too
        self._on_result = on_result
        self._files = initramfs.with_suffix(".files")
        self._command = [program, *_COMMON, "-m", str(memory), *ACCELERATORS[clock]]
        self._command += ["-serial", f"file:{self._files}"]
        self._command += ["-kernel", str(kernel), "-initrd", str(initramfs), "-append"]
        self._command.append(f"{_KERNEL} {arguments}".rstrip())

    @property
    def files(self):
        """The archive that the machine sent through its second port."""
        return self._files

    def run(self, limit):
        """Boots and waits for the end; the emulator's exit status, None if it took longer than
        `limit` seconds."""
        end = time.monotonic() + limit
        with subprocess.Popen(
            self._command, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT
        ) as emulator, selectors.DefaultSelector() as ready:
            ready.register(emulator.stdout, selectors.EVENT_READ)
            pending = b""
            try:
                while ready.select(max(0, end - time.monotonic())):
                    piece = os.read(emulator.stdout.fileno(), 65536)
                    if not piece:
                        self._take(pending)
                        return emulator.wait()
                    *lines, pending = (pending + piece).split(b"\n")
                    for line in lines:
                        self._take(line)
                self._take(pending)
                return None
            finally:
                emulator.kill()

    def _take(self, line):
        text = line.decode(errors="replace").rstrip("\r")
        self.console.append(text)
        found = re.search(r"@result (\S+) (passed|FAILED|skipped) ([0-9.]+) ?(.*)", text)
        if found:
            self._on_result(Result(*found.groups()))

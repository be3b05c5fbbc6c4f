"""The static probes of a library, in the words of the kernel's uprobe events."""

import re
import subprocess

from .failure import Failure


def _file_offset(library, address):
    headers = subprocess.run(["readelf", "-lW", library], capture_output=True, text=True).stdout
    for line in headers.splitlines():
        found = re.match(r"\s*LOAD\s+(0x\w+)\s+(0x\w+)\s+0x\w+\s+(0x\w+)", line)
        if found:
            offset, begin, size = (int(number, 16) for number in found.groups())
            if begin <= address < begin + size:
                return address - begin + offset
    raise Failure(f"{library}: a probe lies outside of what is loaded")


def uprobe_definitions(library, path):
    """A line for each probe of the library, which is at `path` in the machine:
    "p:vexatouch/report /usr/lib/libvexaplatform.so.1:0x38f48 a0=%si:u64 ..."."""
    notes = subprocess.run(["readelf", "-nW", library], capture_output=True, text=True).stdout
    lines = []
    for provider, name, location, semaphore, arguments in re.findall(
        r"Provider: (\S+)\s+Name: (\S+)\s+Location: (0x\w+), Base: 0x\w+, Semaphore: (0x\w+)\s+"
        r"Arguments: (.*)",
        notes,
    ):
        if int(semaphore, 16) != 0:
            raise Failure(f"{library}: the probe {name} counts its listeners")
        fetched = []
        for index, argument in enumerate(arguments.split()):
            found = re.fullmatch(r"(\d)@%(?:[er](?=[a-z]))?(\w+)", argument)
            if not found:
                raise Failure(f"{library}: the probe {name} has its argument {index} at {argument}")
            # The kernel knows registers by their name without the size.
            fetched.append(f"a{index}=%{found[2]}:u{8 * int(found[1])}")
        place = _file_offset(library, int(location, 16))
        lines.append(f"p:{provider}/{name} {path}:{place:#x} {' '.join(fetched)}")
    if not lines:
        raise Failure(f"{library}: has no probes")
    return "\n".join(lines) + "\n"

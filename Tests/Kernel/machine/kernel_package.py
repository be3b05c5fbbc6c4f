"""Debian's kernel, fetched and unpacked but not installed."""

import lzma
import os
import pathlib
import re
import shutil
import struct
import subprocess
import tempfile

from .failure import Failure, Skipped

# In the order in which they are loaded. hidraw is a part of hid. The cloud flavour lacks uinput.
MODULES = ["hid", "hid-generic", "uhid", "uinput", "evdev"]
_PACKAGE = "linux-image-amd64"


def _output(*command, **options):
    return subprocess.run(command, capture_output=True, text=True, **options)


def _newest():
    """The package that Debian's metapackage stands for, as "linux-image-6.1.0-1-amd64=6.1.1-1"."""
    shown = _output("apt-cache", "show", "--no-all-versions", _PACKAGE).stdout
    found = re.search(r"^Depends: (linux-image-\S+) \(= ([^)]+)\)", shown, re.MULTILINE)
    return f"{found[1]}={found[2]}" if found else None


def _elf_image(bz_image):
    """The ELF image inside a bzImage. Booting it saves the machine from unpacking it itself, which
    takes eight seconds under emulation."""
    magic = bz_image[0x202:0x206]
    if magic != b"HdrS":
        raise Failure("the kernel has no boot header")
    sectors = bz_image[0x1F1] or 4
    offset, length = struct.unpack_from("<II", bz_image, 0x248)
    start = (sectors + 1) * 512 + offset
    payload = bz_image[start : start + length]
    if not payload.startswith(b"\xfd7zXZ\0"):
        raise Failure("the kernel inside its boot image is not packed with XZ")
    # What follows the packed data is its size.
    image = lzma.LZMADecompressor().decompress(payload)
    if not image.startswith(b"\x7fELF"):
        raise Failure("the unpacked kernel is not an ELF image")
    return image


def _unpack(package, folder):
    wanted = ["./boot/vmlinuz-*"] + [f"./lib/modules/*/{name}.ko" for name in MODULES]
    content = subprocess.Popen(["dpkg-deb", "--fsys-tarfile", package], stdout=subprocess.PIPE)
    with content:
        unpacked = subprocess.run(
            ["tar", "-x", "-C", folder, "--wildcards", *wanted], stdin=content.stdout
        )
    if unpacked.returncode != 0 or content.returncode != 0:
        raise Failure(f"{package}: cannot be unpacked")
    (image,) = folder.glob("boot/vmlinuz-*")
    (folder / "vmlinux").write_bytes(_elf_image(image.read_bytes()))
    for name in MODULES:
        (module,) = folder.glob(f"lib/modules/*/kernel/**/{name}.ko")
        module.rename(folder / f"{name}.ko")
    shutil.rmtree(folder / "boot")
    shutil.rmtree(folder / "lib")


def unpacked_kernel(cache):
    """The folder with the newest kernel, "vmlinux" and the modules; what was fetched before is kept
    in the cache. Throws Skipped when there is none and none can be fetched."""
    newest = _newest()
    kept = sorted(folder for folder in cache.glob("linux-image-*") if folder.is_dir())
    if newest is None:
        if not kept:
            raise Skipped(f"apt knows no {_PACKAGE} (run apt-get update)")
        return kept[-1]
    folder = cache / newest.replace("=", "_")
    if folder.is_dir():
        return folder
    cache.mkdir(parents=True, exist_ok=True)
    with tempfile.TemporaryDirectory(dir=cache, prefix="unpacking-") as made:
        work = pathlib.Path(made)
        print(f"fetching {newest}", flush=True)
        fetched = _output("apt-get", "download", "-q", newest, cwd=work)
        packages = list(work.glob("*.deb"))
        if fetched.returncode != 0 or len(packages) != 1:
            if kept:
                print(f"cannot fetch it; testing {kept[-1].name} instead", flush=True)
                return kept[-1]
            raise Skipped(f"cannot fetch {newest} (run apt-get update): {fetched.stderr.strip()}")
        unpacked = work / "unpacked"
        unpacked.mkdir()
        _unpack(packages[0], unpacked)
        os.rename(unpacked, folder)
    return folder

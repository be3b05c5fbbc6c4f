"""The file system that the machine boots into: an uncompressed cpio archive of the kind "newc"."""

import os
import pathlib
import re
import stat
import subprocess

from .failure import Failure


def _record(out, inode, name, mode, content, owner=(0, 0), node=(0, 0)):
    fields = [inode, mode, *owner, 1, 0, len(content), 0, 0, *node, len(name.encode()) + 1, 0]
    header = "070701" + "".join(f"{field:08x}" for field in fields)
    for part in (header.encode() + name.encode() + b"\0", content):
        out.write(part + bytes(-len(part) % 4))


def _trailer(out):
    _record(out, 0, "TRAILER!!!", 0, b"")


def write_system(target, root):
    """Archives a whole system as it lies in a folder, with its owners and rights."""
    with open(target, "wb") as out:
        found = ["."]
        for place, folders, names in os.walk(root):
            found += [os.path.relpath(os.path.join(place, name), root) for name in folders + names]
        for inode, name in enumerate(found, start=1):
            path = os.path.join(root, name)
            status = os.lstat(path)
            content = b""
            if stat.S_ISLNK(status.st_mode):
                content = os.readlink(path).encode()
            elif stat.S_ISREG(status.st_mode):
                content = pathlib.Path(path).read_bytes()
            device = (os.major(status.st_rdev), os.minor(status.st_rdev))
            owner = (status.st_uid, status.st_gid)
            _record(out, inode, name, status.st_mode, content, owner, device)
        _trailer(out)


class Initramfs:
    """Collects files by their path in the machine, then writes the archive."""

    _MERGED = ("bin", "sbin", "lib", "lib64")  # these are links into /usr

    def __init__(self, staged):
        """`staged`: the folder with the installed product, whose libraries come by themselves."""
        self._staged = staged
        self._entries = {}  # path without the leading slash: (mode, content)
        self._looked_through = set()
        for name in self._MERGED:
            self.folder("/usr/" + name)
            self._entries[name] = (stat.S_IFLNK | 0o777, f"usr/{name}".encode())

    def folder(self, path, mode=0o755):
        self._parents(path)
        self._entries[self._key(path)] = (stat.S_IFDIR | mode, b"")

    def link(self, path, target):
        self._parents(path)
        self._entries[self._key(path)] = (stat.S_IFLNK | 0o777, target.encode())

    def text(self, path, content, mode=0o644):
        self._parents(path)
        self._entries[self._key(path)] = (stat.S_IFREG | mode, content.encode())

    def file(self, path, source):
        """A file with the rights that it has here, and, of a program, the libraries that it needs,
        at the places where the loader finds them here."""
        source = pathlib.Path(source)
        content = source.read_bytes()
        self._parents(path)
        mode = 0o755 if source.stat().st_mode & 0o100 else 0o644
        self._entries[self._key(path)] = (stat.S_IFREG | mode, content)
        if content.startswith(b"\x7fELF") and source.suffix != ".ko":
            self._libraries(source)

    def tree(self, path, source):
        """All that is in a folder."""
        for place, _, names in os.walk(source):
            inside = pathlib.Path(path) / pathlib.Path(place).relative_to(source)
            for name in names:
                found = pathlib.Path(place) / name
                if found.is_symlink():
                    self.link(inside / name, os.readlink(found))
                else:
                    self.file(inside / name, found)

    def write(self, target):
        # The kernel takes the mode of the root folder from the archive.
        entries = {".": (stat.S_IFDIR | 0o755, b"")}
        entries.update(self._entries)
        with open(target, "wb") as out:
            for inode, name in enumerate(entries, start=1):
                _record(out, inode, name, *entries[name])
            _trailer(out)

    @classmethod
    def _key(cls, path):
        key = str(path).lstrip("/")
        return f"usr/{key}" if key.split("/")[0] in cls._MERGED else key

    def _parents(self, path):
        for parent in reversed(pathlib.PurePath(self._key(path)).parents):
            self._entries.setdefault(str(parent), (stat.S_IFDIR | 0o755, b""))

    def _libraries(self, source):
        if source in self._looked_through:
            return
        self._looked_through.add(source)
        listed = subprocess.run(["ldd", source], capture_output=True, text=True)
        if "not a dynamic executable" in listed.stderr or "statically linked" in listed.stdout:
            return
        missing = re.search(r"^\s*(\S+) => not found", listed.stdout, re.MULTILINE)
        if listed.returncode != 0 or missing:
            reason = f"needs {missing[1]}" if missing else listed.stderr.strip()
            raise Failure(f"{source}: {reason}")
        for library in re.findall(r"(/\S+) \(0x", listed.stdout):
            real = os.path.realpath(library)
            if self._staged in pathlib.Path(real).parents:
                continue
            self._parents(library)
            self._entries.setdefault(
                self._key(library), (stat.S_IFREG | 0o755, pathlib.Path(real).read_bytes())
            )

"""The checks that a machine runs, and how they went."""

import resource
import shutil
import sys
import tarfile
import time

from . import virtual_machine

EMULATOR = "qemu-system-x86_64"


class Check:
    """One script, whose first comment says what it shows."""

    def __init__(self, path):
        self.path, self.name = path, path.name
        self.about = path.read_text().split("\n", 1)[0].lstrip("# ")


def all_checks(folder):
    return [Check(path) for path in sorted(folder.iterdir())]


def chosen_checks(program, folder, only):
    """Those whose names begin so, all without any; ends the program for a name that none has."""
    checks = all_checks(folder)
    for name in only:
        if not any(check.name.startswith(name) for check in checks):
            print(f"{program}: no check '{name}', see --list", file=sys.stderr)
            sys.exit(2)
    return [check for check in checks if not only or check.name.startswith(tuple(only))]


def print_list(checks):
    for check in checks:
        print(f"{check.name:28} {check.about}")


def _keep_files(archive, folder, names):
    """What the machine sent: the logs of the checks of these names, and figures. False, and says why, when
    they are not whole."""
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    try:
        with tarfile.open(archive) as files:
            files.extractall(folder)
    except (tarfile.TarError, OSError) as fault:
        print(f"FAILED   the files of the machine are not whole: {fault}")
        return False
    # One that is cut off between two files reads well.
    for name in names:
        if not (folder / f"{name}.log").exists():
            print(f"FAILED   the files of the machine are not whole: {name}.log is missing")
            return False
    return True


def run_checks(checks, limit, work, kernel, initramfs, clock, **options):
    """Boots a machine with the checks in it and prints a line for each; how many passed, failed, were
    skipped. What it wrote goes to `work`. `options` are the machine's."""
    counts = {"passed": 0, "FAILED": 0, "skipped": 0}
    about = {check.name: check.about for check in checks}
    missing = dict(about)

    def on_result(result):
        counts[result.outcome] += 1
        missing.pop(result.name, None)
        mark = "ok" if result.outcome == "passed" else result.outcome
        note = f"  ({result.note.strip()})" if result.note.strip() else ""
        print(f"{mark:8} {result.seconds:6.2f} s  {result.name}: {about[result.name]}{note}", flush=True)

    machine = virtual_machine.VirtualMachine(
        EMULATOR, kernel / "vmlinux", initramfs, clock, on_result, **options
    )
    begin = time.monotonic()
    status = machine.run(limit)
    print(
        f"         {time.monotonic() - begin:6.2f} s  machine with {clock} time, which took the host "
        f"{resource.getrusage(resource.RUSAGE_CHILDREN).ru_utime:.0f} s",
        flush=True,
    )
    (work / "console").write_text("\n".join(machine.console) + "\n")
    if not _keep_files(machine.files, work / "out", about):
        counts["FAILED"] += 1
    ended = {virtual_machine.ALL_PASSED: 0, virtual_machine.SOME_FAILED: 1}
    if status in ended and not missing:
        if counts["FAILED"]:
            print("\n".join(line for line in machine.console if line.startswith("@log ")))
        return counts
    print("\n".join(machine.console[-200:]))
    if status is None:
        print(f"FAILED   the machine was still running after {limit:.0f} seconds; its console is above")
    else:
        print(f"FAILED   the machine ended by itself (status {status}); its console is above")
    counts["FAILED"] += max(1, len(missing))
    for name in missing:
        print(f"FAILED   {name}: did not end")
    return counts


def exit_status(total, seconds):
    """Prints the counts."""
    print(
        f"{total['passed']} passed, {total['FAILED']} failed, {total['skipped']} skipped in {seconds:.0f} s"
    )
    if total["FAILED"] or not sum(total.values()):
        return 1
    if total["skipped"]:
        print("skipped: see above")
        return 77
    return 0

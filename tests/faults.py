"""The campaign of scripts/faults. usage: faults.py BINARY [--sample]"""
import os
import random
import re
import shutil
import subprocess
import sys
import time
from collections import Counter
from pathlib import Path

# Entries are told as in worlds.txt: links and files only, and "~" ends in a slash.
STORAGE, A, B = "/var/db/timezone/", "2022b.1.0", "2022b.2.0"
SYSTEM = ("/usr/share/zoneinfo.default/+VERSION=2022a /usr/share/zoneinfo.default/Asia/Tokyo=TZif "
          "/usr/share/icu/icutzformat.txt=44l ")
DOWNLOADS = "".join(f"tz/{v}/zoneinfo/Asia/Tokyo=TZif tz/{v}/icutz/icutz44l.dat= " for v in (A, B))
SETTLED = SYSTEM + DOWNLOADS + "localtime>~zoneinfo/Asia/Tokyo TZVersionDiffRecord=old "
LATEST, ON_SYSTEM = f"tz_latest>~tz/{B} ", "zoneinfo>/usr/share/zoneinfo.default "
ON_A, ON_B = (f"zoneinfo>~tz/{v}/zoneinfo icutz>~tz/{v}/icutz " for v in (A, B))
WORLDS = {
    "steady": SETTLED + ON_B + LATEST,
    "first switch": SETTLED + ON_SYSTEM + LATEST,
    "switch": SETTLED + ON_A + LATEST,
    "first boot": SYSTEM + "tz/empty=",
    "no storage": SYSTEM,
    "system newer": SETTLED.replace("2022a", "2022c") + ON_B + LATEST,
    "localtime rewrite": SYSTEM + ON_SYSTEM + "localtime>/usr/share/zoneinfo/Asia/Tokyo",
    "legacy link": SETTLED + LATEST + ON_B.replace(" icutz", " /var/db/icutz") + "/var/db/icu=",
}

# The errors that fit a call, none where it cannot fail. A call that is not here ends the campaign,
# so that none is passed over. The kernel's brk has no errors: it returns an end too low.
ON_PATH = "EIO EACCES ENOENT ENOMEM"
ERRORS = {
    "access": ON_PATH, "newfstatat": ON_PATH, "readlink": ON_PATH,
    "unlink": ON_PATH + " EROFS", "rmdir": ON_PATH + " EROFS", "symlink": ON_PATH + " ENOSPC EROFS",
    "openat": ON_PATH + " ENOSPC EROFS EMFILE EINTR", "fchdir": "EIO EACCES ENOMEM",
    "fcntl": "EIO EACCES EINTR", "close": "EIO ENOSPC EINTR", "read": "EIO ENOMEM EINTR",
    "writev": "EIO ENOSPC ENOMEM EINTR", "getdents64": "EIO ENOENT ENOMEM", "fstatfs": "EIO ENOMEM",
    "mmap": "ENOMEM", "munmap": "ENOMEM", "brk": "retval=0", "getrandom": "EAGAIN EINTR",
    "futex": "", "rt_sigaction": "", "exit_group": "",
}

# What the loader and the C library call before the program's own first call: not counted.
STARTUP = re.compile(r"(execve|brk|m\w+|arch_prctl|set_\w+|rseq|prlimit64|getrandom|pread64)\("
                     r"|.*(/etc/ld\.so|/lib|/proc/self/exe)")

# What docs/design.md explains under these names: the world, a kill before a call or an error in
# it, and what then differs for good.
WINDOWS = {
    "no zoneinfo link": "switch: kill symlink .*/zoneinfo: TZVersionDiffRecord",
    "between the links": "(first )?switch: kill (unlink|symlink) .*/icutz: .*Record icutz"
                         "|system newer: kill unlink .*/timezone/icutz: icutz",
    "record not written": "(first )?switch: kill (newfstatat|openat|writev) .*Record: .*Record",
    "no localtime link": "localtime rewrite: kill symlink .*/localtime: localtime",
    "localtime link reset": ".*: error .* /var/.*/(localtime|zoneinfo/Asia/Tokyo): localtime",
    "ICU link not removed": "system newer: error unlink .*/timezone/icutz: icutz",
    "legacy link not moved": "legacy link: error (access|readlink|symlink) .*/icutz: icutz",
}


def make_world(entries):
    for top in "/var/db", "/usr/share":
        shutil.rmtree(top, ignore_errors=True)
    for name, kind, text in re.findall(r"(\S+?)([>=])(\S*)", entries):
        path = Path(STORAGE, name)
        path.parent.mkdir(parents=True, exist_ok=True)
        if kind == ">":
            path.symlink_to(text.replace("~", STORAGE))
        else:
            path.write_text(text)


def state():
    """What stands outside the downloads: links by their content, files by theirs."""
    return {path: os.readlink(path) if path.is_symlink() else path.read_bytes()
            for top in ("/var/db", STORAGE) for path in Path(top).glob("*")
            if path.is_symlink() or path.is_file()}


def run(*tracer):
    """The status of a run; that of a kill where it takes longer than two seconds."""
    command = ["timeout", "-s", "KILL", "2", *tracer, sys.argv[1]]
    return subprocess.run(command, stderr=subprocess.DEVNULL, check=False).returncode


def trace():
    return Path("/tmp/trace").read_text(errors="replace")


def own_calls():
    """Each call of a run: its name, its number among its like, the entry that it is about."""
    if run("strace", "-y", "-o", "/tmp/trace") != 0:
        sys.exit("A run ends badly without any fault.")
    calls, seen = [], Counter()
    for name, arguments in re.findall(r"(?m)^(\w+)\((.*)", re.sub("AT_FDCWD<.*?>", "", trace())):
        seen[name] += 1
        if calls or not STARTUP.match(f"{name}({arguments}"):
            paths = re.findall(r'["<](/[^">]*?)/?[">]', arguments) or ["-"]
            calls.append((name, seen[name], paths[-1 if name == "symlink" else 0]))
    return calls


def faults_for(name, number):
    """The injections to try on a call: a kill, and each error once and from then on."""
    yield f"{name}:signal=KILL:when={number}"
    for error in ERRORS[name].split():
        fault = f"{name}:{error if '=' in error else 'error=' + error}:when={number}"
        yield from (fault, fault + "+")


def main():
    if not (Path("/var/private-world").is_dir() and os.path.ismount("/usr/share")):
        sys.exit("This rewrites /var/db and /usr/share: run scripts/faults.")
    trials, undisturbed = [], {}
    for world, entries in WORLDS.items():
        make_world(entries)
        for name, number, path in own_calls():
            trials += [(world, f"{name} {number} {path}", fault)
                       for fault in faults_for(name, number)]
        run()
        undisturbed[world] = state()
    whole = "--sample" not in sys.argv
    counts, windows, failed = Counter(), Counter(), False

    for world, call, fault in trials if whole else random.Random(2022).sample(trials, 1000):
        make_world(WORLDS[world])
        status = run("strace", "-o", "/tmp/trace", "-e", "inject=" + fault)
        hit = re.search("INJECTED|killed by", trace())
        clean_status, after = run(), state()
        kind = "kill" if "KILL" in fault else "error"
        counts[world, kind] += 1
        if not hit or clean_status != 0 or status != {"kill": -9, "error": 0}[kind]:
            counts[world, "bad"] += 1
            failed = True
            print(f"bad end: {world}: inject={fault}: {status}, then {clean_status}")
        differing = {path.name for path in after.keys() | undisturbed[world].keys()
                     if after.get(path) != undisturbed[world].get(path)}
        if kind == "error":  # after which the record rightly tells what the fallback did
            differing.discard("TZVersionDiffRecord")
        if differing and not fault.endswith("+"):
            counts[world, kind + " window"] += 1
            windows[f"{world}: {kind} {call}: {' '.join(sorted(differing))}"] += 1

    unmet = set(WINDOWS) if whole else set()
    for window, times in windows.items():
        name = next((name for name, what in WINDOWS.items() if re.fullmatch(what, window)), None)
        unmet.discard(name)
        failed |= name is None
        print(f"{window} ({name or 'NOT DOCUMENTED'}){f' x {times}' * (times > 1)}")
    print(f"{'world':18}    kills   errors   bad ends   windows: kills   errors")
    for world in WORLDS:
        row = (counts[world, c] for c in ("kill", "error", "bad", "kill window", "error window"))
        print("{:18}{:9}{:9}{:11}{:17}{:9}".format(world, *row))
    sys.exit("documented, but not met: " + ", ".join(unmet) if unmet else int(failed))


main()

# Called by scripts/faults, which tells what it does.

import os
import random
import re
import subprocess
import sys
from collections import Counter
from multiprocessing import Process, RawValue
from pathlib import Path

WORLDS = ("steady first_switch switched first_boot storage_is_a_file older_and_no_newer old_place"
          " legacy_moves everything_at_once").split()

# How a call may fail, once or from then on. The kernel's brk has no errors: it returns an end too
# low. Nor has futex when it wakes: the C library ends a process that sees one.
FAULTS = [f"{often}:error={error}" for often in ("", "+")
          for error in "EIO ENOMEM EACCES ENOENT EEXIST ENOSPC EINTR".split()]
# What the C library calls before the program's own first call: not counted.
STARTUP = re.compile(r"(execve|brk|m\w+|arch_prctl|set_\w+|rseq|prlimit64|getrandom)\(|.*/proc/self")
CHANGING = re.compile(r"(symlink|rename|unlink|rmdir|write)\(|openat\(.*O_CREAT")

# What docs/design.md explains under these names: the world, the call that failed, the links that
# then differ for good.
WINDOWS = {
    "localtime link reset": ".*: (readlink|access|symlink): localtime",
    "ICU link not removed": "older_and_no_newer: unlink: icutz",
    "legacy link not moved": "legacy_moves: (access|readlink|symlink): icutz",
}


# The status of a run under strace with some options, or of a clean one; that of a kill where it
# takes longer than two seconds.
def run(options=""):
    tracer = f"strace -o /tmp/trace {options}" if options else ""
    command = f"timeout -s KILL 2 {tracer} build/release/kestrel".split()
    return subprocess.run(command, stderr=subprocess.DEVNULL, check=False).returncode


def make(world):
    subprocess.run(["build/release/kestrel_tests", world], check=True)


# What stands outside the downloads, but for the content of files.
def state():
    return {(str(path), os.readlink(path) if path.is_symlink() else "")
            for top in ("/var/db", "/var/db/timezone") for path in Path(top).glob("*")
            if path.name not in ("timezone", "TZVersionDiffRecord")}


# The program's own calls in a run from what stands there: each line, its call, and which of them.
def traced():
    run("-e trace=all")
    seen, own = Counter(), False
    for line in Path("/tmp/trace").read_text().splitlines()[:-1]:
        name = line.split("(")[0]
        seen[name] += 1
        own = own or not STARTUP.match(line)
        if own and name not in ("exit_group", "futex"):
            yield line, name, f"{name}:when={seen[name]}"


# Each trial: a world, the call that the fault is for, and the faults of one run after the other.
def trials():
    for world in WORLDS:
        make(world)
        for line, name, place in list(traced()):
            for fault in FAULTS if name != "brk" else (":retval=0", "+:retval=0"):
                yield world, name, [place + fault]
            kill = place + ":signal=KILL"
            yield world, name, [kill]
            if CHANGING.match(line):
                make(world)
                run(f"-e inject={kill}")
                for line, _, place in list(traced()):
                    if CHANGING.match(line):
                        yield world, name, [kill, place + ":signal=KILL"]


# The faults, each followed by a clean run.
def campaign(chosen):
    undisturbed, counts, found, failed = {}, Counter(), Counter(), False
    for world, call, faults in [(world, "", []) for world in WORLDS] + chosen:
        make(world)
        killed = "KILL" in "".join(faults)
        ends = [run(f"-e inject={fault}") for fault in faults] + [run()]
        counts[killed] += len(faults)
        if ends != [-9 if killed else 0] * len(faults) + [0]:
            failed = True
            print(f"bad end: {world}: {faults}: {ends}")
        after = state()
        if differing := after ^ undisturbed.setdefault(world, after):
            names = " ".join(sorted({os.path.basename(path) for path, _ in differing}))
            found[f"{world}: {call}: {names}", killed] += 1
    for (window, killed), times in found.items():
        name = next((n for n, what in WINDOWS.items() if re.fullmatch(what, window)), "")
        failed |= killed or not name
        print(f"{window} ({'KILLED' if killed else name or 'NOT DOCUMENTED'}) x {times}")
    print(f"{counts[True]} runs killed, {counts[False]} with failing calls, in {len(WORLDS)} worlds:"
          f" {'NOT ALL IS WELL' if failed else 'no bad end, no other difference'}")
    return failed


# Runs that switch and correct the local zone under the eyes of a reader.
def watched(runs):
    looks, nothing, over = (RawValue("l") for _ in range(3))

    def look():
        while not over.value:
            for path in ("zoneinfo/Asia", "icutz/.", "localtime"):
                looks.value += 1
                nothing.value += not os.path.exists("/var/db/timezone/" + path)

    make("everything_at_once")
    before = [(path, content) for path, content in state() if content]
    reader = Process(target=look)
    reader.start()
    for _ in range(runs):
        for path, content in before:
            os.symlink(content, "/var/db/own")
            os.replace("/var/db/own", path)
        run()
    over.value = 1
    reader.join()
    print(f"{runs} switches under {looks.value} looks: {nothing.value} found nothing")
    return nothing.value > 0


# Rounds of three to six runs at once. Only the download has the local zone, so that no run may go
# back from it.
def crowded(rounds):
    make("new_zone")
    run()
    wanted, otherwise = state(), 0
    for number in range(rounds):
        make("new_zone")
        crowd = [subprocess.Popen("build/release/kestrel", stderr=subprocess.DEVNULL)
                 for _ in range(3 + number % 4)]
        statuses = {process.wait() for process in crowd}
        otherwise += statuses != {0} or state() != wanted
    print(f"{rounds} rounds of three to six runs at once: {otherwise} ended otherwise than one run")
    return otherwise > 0


# A quiet run that does not mark the two directories of the storage, or not write its line at once.
def unmarked_or_torn():
    make("steady")
    calls = "\n".join(line for line, _, _ in traced())
    marked = re.findall(r'"/var/db/timezone/(.*)", .* = (\d+)\nfcntl\(\2, 0x40 .*, 0x4\)', calls)
    wrong = [place for place, _ in marked] != ["", "tz/"] or calls.count("\nwrite") != 1
    print("the storage is not marked, or a line not written at once" if wrong else "all is marked")
    return wrong


def main():
    chosen, share = list(trials()), 1
    if "--sample" in sys.argv:
        chosen, share = random.Random(2022).sample(chosen, 1000), 10
    sys.exit(unmarked_or_torn() | campaign(chosen) | watched(2000 // share) | crowded(1500 // share))


main()

# Called by scripts/faults, which says what it does.

import random
import re
import subprocess
import sys
from collections import Counter
from pathlib import Path

from worlds import SCENES, kinds, make

WORLDS = ("steady first_switch first_boot zoneinfo_is_a_directory older_and_no_newer old_place"
          " legacy_moves everything_at_once").split()

# How a call may fail, once or from then on. The kernel's brk has no errors: it returns an end too
# low. Nor has futex when it wakes: the C library ends a process that sees one.
ERRORS = [often + ":error=" + error for often in ("", "+")
          for error in "EIO ENOMEM EACCES ENOENT EEXIST ENOSPC EINTR".split()]
# What the C library calls before the program's own first call: not counted.
STARTUP = re.compile(r"(execve|brk|m\w+|arch_\w+|set_\w+|rseq|prlimit64|getrandom)\(|.*/proc/self")
REMOVED = re.compile(r'unlink\("/var/db/timezone/(zoneinfo|icutz|localtime)"\) *= 0')

# What docs/design.md explains under these names: the world, the call that failed, the links that
# then differ for good.
WINDOWS = {
    "localtime link reset": ".*: (readlink|access|symlink|rename): localtime",
    "ICU link not renamed": ".*: rename: icutz .*",
    "ICU link not removed": "older_and_no_newer: unlink: icutz",
    "legacy link not moved": "legacy_moves: (access|readlink|symlink): icutz",
}


def start(fault=""):
    inject = "-e inject=" + fault if fault else ""
    command = f"timeout -s KILL 2 strace -qqo /tmp/trace {inject} build/release/kestrel"
    return subprocess.Popen(command.split(), stderr=subprocess.DEVNULL)


# What is there after runs with these faults, one after the other, and a clean run.
def after(world, *faults):
    make(SCENES[world]["+"])
    for fault in [*faults, ""]:
        end = start(fault).wait()
        assert end in (0, -9 if "KILL" in fault else 0), f"bad end: {world}: {faults}: {end}"
    return kinds()


# The program's own calls in a run: each line, its name, and which of them.
def calls(world):
    after(world)
    seen, own = Counter(), False
    for line in Path("/tmp/trace").read_text().splitlines()[:-1]:
        name = line.split("(")[0]
        seen[name] += 1
        own = own or not STARTUP.match(line)
        if own and name not in ("exit_group", "futex"):
            yield line, name, f"{name}:when={seen[name]}"


# Each trial: a world, the call that the fault is for, and the faults.
def trials(world):
    own = list(calls(world))
    for _, name, place in own:
        for error in ERRORS if name != "brk" else (":retval=0", "+:retval=0"):
            yield world, name, [place + error]
        kill = place + ":signal=KILL"
        yield world, name, [kill]
        yield world, name, [kill, random.choice(own)[2] + ":signal=KILL"]


def campaign(chosen):
    undisturbed, differences = {world: after(world) for world in WORLDS}, Counter()
    for world, call, faults in chosen:
        if differing := after(world, *faults) ^ undisturbed[world]:
            names = " ".join(sorted({Path(path).name for path, _ in differing}))
            differences[f"{world}: {call}: {names}", "KILL" in faults[0]] += 1
    for (what, killed), times in differences.items():
        name = [name for name, window in WINDOWS.items() if re.fullmatch(window, what)]
        print(f"{what} ({'KILLED' if killed else name}) x {times}")
        assert name and not killed
    print(f"{len(chosen)} trials in {len(WORLDS)} worlds: no bad end, no other difference")


# What only a trace shows: no link is removed that could be renamed over.
def traced():
    lines = "\n".join(line for line, _, _ in calls("steady"))
    assert lines.count("\nwrite") == 1, "a line is not written at once"
    for world, allowed in (("everything_at_once", []), ("older_and_no_newer", ["icutz"])):
        removed = [match[1] for line, _, _ in calls(world) if (match := REMOVED.match(line))]
        assert removed == allowed, f"{world}: removed {removed}"


# Delayed runs at once. Only the download has the local zone, so that no run may go back from it.
def crowded(rounds):
    undisturbed = after("new_zone")
    for number in range(rounds):
        make(SCENES["new_zone"]["+"])
        faults = [f"{call}:delay_enter={random.randrange(15, 60)}000"
                  for call in random.sample(("rename", "symlink", "readlink", "access"), 2)]
        crowd = [start(fault) for fault in faults + [""] * (number % 2)]
        assert [run.wait() for run in crowd] == [0] * len(crowd) and kinds() == undisturbed, faults
    print(f"{rounds} rounds of delayed runs at once: all ended as one run does")


random.seed(2022)
everything = [trial for world in WORLDS for trial in trials(world)]
sample = "--sample" in sys.argv
traced()
campaign(random.sample(everything, 1000) if sample else everything)
crowded(20 if sample else 400)

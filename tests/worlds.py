# Reads tests/worlds.txt, whose head explains its form, and tests every scene of it under pytest.
# With a scene's name as argument it makes that scene's world and no more.

import os
import random
import re
import subprocess
import sys
from pathlib import Path
from unittest.mock import ANY

import pytest

if not os.path.isdir("/var/private-world"):
    sys.exit("This rewrites /var/db and /usr/share: run scripts/test.")

TABLE = Path(__file__).with_name("worlds.txt")
STORAGE = "/var/db/timezone"
# A word of a world: "-" or not, the path, and the sign with what follows it, or at the end.
ENTRY = re.compile(r"(-?)(.+?)(?:([>=%])(.*)|([/|]))?")
MODES = {">": 0o777, "=": 0o666, "/": 0o777, "|": 0o666}
KESTREL = os.path.abspath(os.environ.get("KESTREL", "build/dev/kestrel"))
os.environ["PATH"] = os.path.dirname(KESTREL) + ":" + os.environ["PATH"]
# For tests of what several users do.
several_users = pytest.mark.skipif(Path("/proc/self/uid_map").read_text().split()[2] == "1",
                                   reason="takes several users: run it as root")


# The scenes by name, each with the lines of each sign.
def read_scenes():
    meanings, scenes, scene = {}, {}, {}
    lines = TABLE.read_text().replace("~", STORAGE).splitlines()
    for line in [line for line in lines if line and not line.startswith("#")]:
        line = re.sub(r"\$(\w+)", lambda use: meanings[use[1]], line)
        if line.startswith("  "):
            sign, _, text = line.strip().partition(" ")
            scene[sign] += text + "\n"
        elif meaning := re.fullmatch(r"(\w+) = (.*)", line):
            meanings[meaning[1]] = meaning[2]
        else:
            name, _, world = line.partition(": ")
            assert world and name not in scenes, f"no scene, or a name for the second time: {line}"
            scene = scenes[name] = dict.fromkeys(("+", "$", "=>", "1>", "2>", "exit"), "")
            scene["+"] = world + "\n"
    return scenes


# The entries of a world: path, sign ("-" for no longer there) and content.
def entries(world):
    for word in world.replace("~", STORAGE).split():
        gone, path, sign, content, end = ENTRY.fullmatch(word).groups("")
        assert gone or sign or end, f"no entry: {word}"
        yield os.path.join(STORAGE, path), gone or sign or end, content


def make(world):
    os.umask(0)
    os.system("chmod -R u+w /var/db; find /var/db /usr/share -mindepth 1 -delete")
    for path, sign, content in entries(world):
        os.makedirs(path if sign == "/" else os.path.dirname(path), exist_ok=True)
        {"/": lambda path, _: None,
         ">": lambda path, content: os.symlink(content, path),
         "=": lambda path, content: Path(path).write_text(content),
         "|": lambda path, _: os.mkfifo(path),
         "%": lambda path, content: os.chmod(path, int(content, 8))}[sign](path, content)


# What exists: the sign, the content, the mode and the inode of each path.
def found():
    state = {}
    for top in (Path("/var/db"), Path("/usr/share")):
        for path in top.rglob("*"):
            status = path.lstat()
            what = "/" if path.is_dir() else "|", ""
            if path.is_symlink():
                what = ">", os.readlink(path)
            elif path.is_file():
                what = "=", path.read_text("latin-1")
            state[str(path)] = *what, status.st_mode & 0o7777, status.st_ino
    return state


# What exists without the inodes, and without the record.
def kinds():
    return {(path, what[:3]) for path, what in found().items() if "Record" not in path}


SCENES = read_scenes()


@pytest.mark.parametrize("name", SCENES)
def test_scene(name):
    scene = SCENES[name]
    make(scene["+"])
    expected = found()
    for path, sign, content in entries(scene["=>"]):
        if sign == "-":
            del expected[path]
        elif sign == "%":
            expected[path] = *expected[path][:2], int(content, 8), expected[path][3]
        else:
            expected[path] = sign, content, MODES[sign], ANY
    ended = subprocess.run(scene["$"] or "kestrel", shell=True, capture_output=True, text=True,
                           check=False)
    status = ended.returncode if ended.returncode >= 0 else 128 - ended.returncode
    assert (ended.stderr.splitlines(), ended.stdout.splitlines(), status) == (
        scene["2>"].splitlines(), scene["1>"].splitlines(), int(scene["exit"] or 0))
    assert found() == expected


# No scene, as qemu keeps such a call to itself.
def test_marks():
    make(SCENES["steady"]["+"])
    os.system("ASAN_OPTIONS=detect_leaks=0 strace -yo /tmp/trace kestrel 2>/dev/null")
    trace = Path("/tmp/trace").read_text()
    assert re.findall(r"fcntl.*<(.*)>, 0x40 .*, 0x4\)", trace) == [STORAGE, STORAGE + "/tz"]
    assert all("CLOEXEC" in call for call in re.findall("open.*(?:/db/|default/|txt).*", trace))


# Random worlds are made of these: a path and what may be there, first what is common. "-" is
# nothing, and "?" one of the versions.
VERSIONS = "2022b.1.0 2022b.1.0 2022c.1.0 2022c.1.0 2022z 2147483648a x /2022c.1.0".split()
PIECES = [line.split() for line in """\
/usr/share/zoneinfo.default/+VERSION =2022b =2022a =2022z =x =2147483648a / - >gone
/usr/share/zoneinfo.default/Asia/Tokyo >/tmp/machine/share/zoneinfo/Asia/Tokyo -
/usr/share/icu/icutzformat.txt =44l =44b = -
/usr/share/zoneinfo >~/zoneinfo -
tz/2022b.1.0/zoneinfo >/tmp/machine/share/zoneinfo -
tz/2022b.1.0/icutz/icutz44l.dat = -
tz/2022c.1.0/zoneinfo >/tmp/machine/share/zoneinfo -
tz/2022c.1.0/icutz/icutz44l.dat = -
tz/?/icutz/icutz44b.dat - =
zoneinfo >~/tz/2022b.1.0/zoneinfo >/usr/share/zoneinfo.default >~/tz/?/zoneinfo >tz/?/x >~/tz/? - /
icutz >~/tz/2022b.1.0/icutz >~/tz/?/icutz >../timezone/tz/?/icutz - / =
tz_latest >~/tz/? - >tz/? >~/tz/ >/srv/? / =
localtime >~/zoneinfo/Asia/Tokyo >/usr/share/zoneinfo/Asia/Tokyo >zoneinfo/Asia/Tokyo -
zoneinfo.new - >~/tz/?/zoneinfo / =
icutz.new - >~/tz/?/icutz >/usr/share/icu / =
/var/db/icutz - >~/tz/?/icutz >/missing /
/var/db/icu - / >/missing
""".splitlines()]
ON_SYSTEM = {"zoneinfo": ">/usr/share/zoneinfo.default", "icutz": "-", "tz_latest": "-"}


def random_world(dice):
    odd, words = dice.choice((0.04, 0.1, 0.2, 0.5)), []
    on_system = dice.random() < 0.3
    for path, usual, *others in PIECES:
        if on_system and path in ON_SYSTEM:
            usual = ON_SYSTEM[path]
        what = dice.choice(others) if dice.random() < odd else usual
        words += [(path + what).replace("?", dice.choice(VERSIONS))] * (what != "-")
    return " ".join(words)


# Asks kestrelctl what the next run will do, and holds what a run does against that. Gives the first
# word of the answer, and whether all was well.
def foretell(world):
    make(world)
    before = found()
    asked = subprocess.run(["kestrelctl", "status"], capture_output=True, text=True, check=False)
    assert found() == before, f"status changes {world}"
    run = subprocess.run("kestrel", capture_output=True, text=True, check=False)
    after = found()
    was, now = ([state.get(f"{STORAGE}/{link}", "")[:2] for link in ("zoneinfo", "icutz")]
                for state in (before, after))
    on_system, failed = now[0] == (">", "/usr/share/zoneinfo.default"), "Unable to" in run.stderr
    same = now[0] == was[0]
    reset = on_system and (not same or was[1] and not now[1])
    said, path = re.search("^next run: (.*?)(?: (/.*))?$", asked.stdout, re.M).groups("")
    holds = {"keeps the active copy": same and not (failed and (reset or not on_system)),
             "goes back to the system copy": reset,
             "fails: it leaves the links as they are": same and failed and not reset,
             "switches to": now == [(">", path + "/zoneinfo"), (">", path + "/icutz")] != was}
    assert holds.get(said) and (asked.returncode or after == before), (
        f"{asked.stdout}status {asked.returncode}, in {world}\n{run.stderr}{was} -> {now}")
    return said.split()[0], asked.returncode == 0


@pytest.mark.parametrize("name", [name for name in SCENES if not SCENES[name]["$"]])
def test_foretold(name):
    foretell(SCENES[name]["+"])


# With RANDOM_WORLDS=2000 in the environment it takes that many.
def test_foretold_in_random_worlds():
    dice = random.Random(2022)
    told = {foretell(random_world(dice)) for _ in range(int(os.environ.get("RANDOM_WORLDS", 150)))}
    assert len({word for word, _ in told}) == 4 and ("keeps", True) in told


if __name__ == "__main__":
    make(SCENES[sys.argv[1]]["+"])

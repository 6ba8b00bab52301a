# Reads tests/worlds.txt, makes the worlds of its scenes, and tests what a run says and changes there.
# pytest collects it. With a scene's name as argument it makes that world.

import os
import re
import subprocess
import sys
from pathlib import Path
from unittest.mock import ANY

import pytest

if not os.path.isdir("/var/private-world"):
    sys.exit("This rewrites /var/db and /usr/share: run scripts/test.")

TABLE = Path(__file__).with_name("worlds.txt")
KESTREL = os.environ.get("KESTREL", "build/dev/kestrel")
LINE = re.compile(r"(\w+) = (.*)|(\w+): (.*?)(?: ! (.*?))?(?: => (.*?))?(?: \| (.*))?")
ENTRY = re.compile(r"(-?)([^>=%|]+?)(/|\||(?:(>|=|%)(.*)))?")


def read_scenes():
    definitions, scenes = {}, {}
    for line in TABLE.read_text().splitlines():
        if line and not line.startswith("#"):
            while re.search(r"\$\w", line):
                line = re.sub(r"\$(\w+)", lambda use: definitions[use[1]], line)
            name, text, scene, *parts = LINE.fullmatch(line).groups("")
            (scenes if scene else definitions)[scene or name] = parts if scene else text
    return scenes


# The entries of a text: each path, the sign of its kind ("-" for nothing), and its content.
def entries(text):
    for word in text.split():
        gone, path, what, sign, content = ENTRY.fullmatch(word).groups("")
        home = "" if path.startswith("/") else "/var/db/timezone/"
        yield home + path, gone or sign or what, content.replace("~", "/var/db/timezone", sign == ">")


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


# All entries: the kind, the content, a file's mode, and the inode.
def found():
    state = {}
    for top in (Path("/var/db"), Path("/usr/share")):
        for path in top.rglob("*"):
            status = path.lstat()
            kind = "/" if path.is_dir() else "|"
            if path.is_symlink():
                kind = ">" + os.readlink(path)
            elif path.is_file():
                kind = f"={path.read_text('latin-1')} {status.st_mode:o}"
            state[str(path)] = kind, status.st_ino
    return state


# All entries but the record, with their kinds.
def kinds():
    return {(path, kind) for path, (kind, _) in found().items() if "Record" not in path}


SCENES = read_scenes()


@pytest.mark.parametrize("name", SCENES)
def test_world(name):
    world, command, changes, lines = SCENES[name]
    make(world)
    expected = found() | {path: (sign + content.replace("%", " 100") + " 100666" *
                                 (sign == "=" and "%" not in content), ANY)
                          for path, sign, content in entries(changes)}
    powerless = "" if os.geteuid() else "setpriv --bounding-set=-all"
    command = (command or "kestrel").replace("powerless", powerless).replace("kestrel", KESTREL)
    ended = subprocess.run(command, shell=True, stderr=subprocess.PIPE, text=True, check=False)
    if ended.returncode == 77:
        pytest.skip("not as this user")
    said = ["kestrel" + line if line.startswith("ctl: ") else "kestrel: " + line
            for line in lines.split(" / ") if line]
    assert (ended.stderr.splitlines(), ended.returncode) == (said, 0)
    assert found() == {path: what for path, what in expected.items() if what[0] != "-"}


if __name__ == "__main__":
    make(SCENES[sys.argv[1]][0])

# Tests kestrelctl on real zones, and on bundles that are whole by their index.

import fcntl
import os
import re
import shutil
import struct
import subprocess
from collections import Counter
from pathlib import Path

import pytest

from worlds import KESTREL, found, kinds, make

pytestmark = pytest.mark.skipif(os.geteuid() != 0, reason="only root starts a run")
STORAGE = Path("/var/db/timezone")
FETCHED = Path("/tmp/fetched")
BUNDLE = struct.pack("<H2s4xI4s16x5I12x", 32, b"\xda\x27", 0, b"ResB", 0, 5, 0, 0, 8)
TRACER = ["strace", "-qqo", "/tmp/trace"]
# The leak check works neither under strace nor as another user.
os.environ["ASAN_OPTIONS"] = "detect_leaks=0"


# A device that reads its system copy, 2026a, and what was fetched, 2026b.
@pytest.fixture(name="device", autouse=True)
def make_device():
    make("zoneinfo>/usr/share/zoneinfo.default localtime>~/zoneinfo/Asia/Tokyo tz/ "
         "/usr/share/icu/icutzformat.txt=44l /usr/share/zoneinfo>/var/db/timezone/zoneinfo")
    shutil.rmtree(FETCHED, ignore_errors=True)
    for top, version in (("/usr/share/zoneinfo.default", "2026a"), (FETCHED / "zoneinfo", "2026b")):
        for zone in ("Asia/Tokyo", "Etc/UTC"):
            os.makedirs(os.path.dirname(f"{top}/{zone}"))
            shutil.copy(f"/tmp/machine/share/zoneinfo/{zone}", f"{top}/{zone}")
        Path(top, "+VERSION").write_text(version)
    (FETCHED / "zoneinfo/Japan").symlink_to("Asia/Tokyo")
    (FETCHED / "icutz").mkdir()
    for name in ("zoneinfo64", "metaZones", "timezoneTypes", "windowsZones"):
        (FETCHED / f"icutz/{name}.res").write_bytes(BUNDLE)
    (FETCHED / "icutz/icutz44l.dat").touch(0o600)


def ctl(line, *tracer):
    command = [*tracer, KESTREL + "ctl", *line.replace("DIR", str(FETCHED)).split()]
    return subprocess.run(command, capture_output=True, text=True, check=False)


def test_publish_and_back():
    alone = ctl("publish 2026b.1.0 DIR", "bash", "-c", 'exec -a /nowhere/kestrelctl "$@"', "bash")
    assert (alone.returncode, alone.stderr.count("b.1.0 is not active")) == (1, 1)
    assert ctl("status").stdout.endswith("\nlast switch: none\n")
    for _ in range(2):
        assert ctl("publish 2026b.1.0 DIR").stdout == "2026b.1.0 is active\n"
    assert all(os.lstat(path).st_mode & 0o777 == {"/": 0o755, "=": 0o644, ">": 0o777}[kind[0]]
               for path, kind in kinds() if "/2026b.1.0/" in path)
    assert ctl("status").stdout == (
        "active: 2026b.1.0\nzoneinfo: /var/db/timezone/tz/2026b.1.0/zoneinfo\nsystem: 2026a.1.0\n"
        "schema: 44l\nnewest: 2026b.1.0\nnext run: keeps the active copy\nzone: Asia/Tokyo\n"
        "last switch: 2026a.1.0_2026b.1.0\n")
    for line, said in (("publish 2026c.1.0 DIR", "2026c.1.0 is active\n"),
                       ("back 2026b.1.0", "2026b.1.0 is active\n"),
                       ("prune", "removed /var/db/timezone/tz/2026c.1.0\n")):
        assert ctl(line).stdout == said
    before = found()
    subprocess.run(KESTREL, check=True, stderr=subprocess.DEVNULL)
    assert found() == before
    subprocess.run("ln -sfn zoneinfo/Asia/Tokyo localtime", shell=True, cwd=STORAGE, check=True)
    assert "leads to no whole zone" in ctl("status").stderr


# What is wrong with a version, or with what was fetched after a shell's command in its directory.
@pytest.mark.parametrize("version, damage, reason", [
    ("2026a.1.0", ":", "2026a.1.0 is not newer than the copy 2026b.1.0"),
    ("2026c.2147483648", ":", "no version, or has a number above"),
    ("../2026c", ":", "no version, or has a number above"),
    ("2026b.1.0", "echo >>zoneinfo/+VERSION", "2026b.1.0 has other content"),
    ("2026c", "mv icutz/icutz44l.dat icutz/icutz44b.dat", "no schema by icutz/icutz44l.dat"),
    ("2026c", "rm icutz/metaZones.res", "icutz/metaZones.res is missing or not whole"),
    ("2026c", "truncate -s 100 zoneinfo/Asia/Tokyo", "the local zone, is missing or not whole"),
    ("2026c", ": >zoneinfo/+VERSION", "zoneinfo/+VERSION is not whole"),
    ("2026c", "echo x >zoneinfo/Etc/UTC", "zoneinfo/Etc/UTC is not whole"),
    ("2026c", "mv zoneinfo/Etc .; ln -s ../Etc zoneinfo", "zoneinfo/Etc is missing"),
    ("2026c", "ln -sf /tmp/fetched/zoneinfo/Asia/Tokyo zoneinfo/Etc/UTC", "Etc/UTC is missing"),
    ("2026c", "rm zoneinfo/Etc/UTC; mkdir zoneinfo/Etc/UTC", "zoneinfo/Etc/UTC is missing"),
    ("2026c", "mv icutz/metaZones.res .; ln -s $PWD/metaZones.res icutz", "icutz/metaZones.res is missing"),
    ("2026c", "head -c 60 zoneinfo/Etc/UTC >zoneinfo/New", "zoneinfo/New is not whole"),
    ("2026c", "mkfifo zoneinfo/New", "cannot copy: Invalid argument"),
])
def test_refused(version, damage, reason):
    assert ctl("publish 2026b.1.0 DIR").returncode == 0
    before = found()
    subprocess.run(damage, shell=True, cwd=FETCHED, check=True)
    refused = ctl(f"publish {version} DIR")
    assert (refused.returncode, found()) == (1, before) and reason in refused.stderr


# Before each call that changes something, a publication is killed, or finds no room.
@pytest.mark.parametrize("fault", ["signal=KILL", "error=ENOSPC"])
def test_interrupted(fault):
    before, seen = kinds(), Counter()
    ctl("publish 2026b.1.0 DIR", *TRACER)
    undisturbed = kinds()
    assert "unlink(\"/var/db/timezone/tz_latest\"" not in Path("/tmp/trace").read_text()
    for line in Path("/tmp/trace").read_text().splitlines():
        name = line.split("(")[0]
        seen[name] += 1
        if re.match(r"(mkdir|symlink|rename|sendfile|syncfs|fchmod)|openat.*O_CREAT", line):
            make_device.__wrapped__()
            end = ctl("publish 2026b.1.0 DIR", *TRACER, "-e", f"inject={name}:{fault}:when={seen[name]}")
            published = (STORAGE / "tz_latest/zoneinfo/Etc/UTC").exists()
            assert end.returncode == -9 or published or kinds() == before, line
            assert published or not os.path.lexists(STORAGE / "tz_latest"), line
            assert (STORAGE / "localtime").exists(), line
            assert ctl("publish 2026b.1.0 DIR").returncode == 0 and kinds() == undisturbed, line


def test_two_at_once():
    (STORAGE / "tz/.kestrelctl").mkdir()
    lock = os.open(STORAGE / "tz/.kestrelctl", os.O_RDONLY)
    fcntl.flock(lock, fcntl.LOCK_EX)
    for line in ("publish 2026b.1.0 DIR", "back", "prune"):
        assert "another kestrelctl is at work" in ctl(line).stderr
    os.close(lock)
    assert ctl("publish 2026b.1.0 DIR").stdout == "2026b.1.0 is active\n"


def test_storage_of_another_user():
    os.system("cd /var/db/timezone; chown -hR 1234 .; chmod 755 . tz; chmod a+r /tmp/fetched/icutz/*")
    assert ctl("publish 2026b.1.0 DIR").returncode == 0
    assert {os.stat(path).st_uid for path in (STORAGE / "tz").rglob("*")} == {1234}
    for line, said in (("publish 2026c.1.0 DIR", "2026c.1.0 waits for the next run of kestrel"),
                       ("back", "2026a.1.0 is active"), ("prune", "removed")):
        assert said in ctl(line, "setpriv", "--reuid=1234", "--clear-groups").stdout
    assert "Permission denied" in ctl("prune", "setpriv", "--reuid=4321").stderr
    subprocess.run("rmdir tz; ln -s /usr/share tz", shell=True, cwd=STORAGE, check=True)
    assert "Permission denied" in ctl("prune").stderr

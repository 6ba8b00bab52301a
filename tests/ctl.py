# Tests kestrelctl on a small device with real zones, and bundles that are whole by their index.

import fcntl
import os
import re
import shutil
import struct
import subprocess
from collections import Counter
from pathlib import Path

import pytest

from worlds import found, kinds, make, several_users

STORAGE = Path("/var/db/timezone")
FETCHED = Path("/tmp/fetched")
SYSTEM = Path("/usr/share/zoneinfo.default")
BUNDLES = ("zoneinfo64", "metaZones", "timezoneTypes", "windowsZones")
TRACE = Path("/tmp/trace")
TRACER = ["strace", "-qqo", str(TRACE)]
AS_OWNER = ["setpriv", "--reuid=1234", "--clear-groups"]
# The leak check works neither under strace nor as another user.
os.environ["ASAN_OPTIONS"] = "detect_leaks=0"


def bundle(order):
    return struct.pack(order + "H2s4xB3x4s16x5I12x", 32, b"\xda\x27", order == ">", b"ResB",
                       0, 5, 0, 0, 8)


def fetch(release, directory=FETCHED):
    """Makes a whole download of that release."""
    shutil.rmtree(directory, ignore_errors=True)
    shutil.copytree(SYSTEM, directory / "zoneinfo", symlinks=True)
    (directory / "zoneinfo/+VERSION").write_text(release)
    (directory / "zoneinfo/tzdata.zi").write_text(f"# version {release}\n")
    (directory / "icutz").mkdir()
    for name in BUNDLES:
        (directory / f"icutz/{name}.res").write_bytes(bundle("<"))
    (directory / "icutz/icutz44l.dat").touch()


@pytest.fixture(autouse=True)
def device():
    """A device that reads its system copy, 2026a. What was fetched is 2026b."""
    make("zoneinfo>/usr/share/zoneinfo.default localtime>~/zoneinfo/Asia/Tokyo tz/ "
         "/usr/share/icu/icutzformat.txt=44l /usr/share/zoneinfo>/var/db/timezone/zoneinfo")
    os.umask(0o022)
    for zone in ("Asia/Tokyo", "Etc/UTC"):
        (SYSTEM / zone).parent.mkdir(parents=True)
        shutil.copy(f"/tmp/machine/share/zoneinfo/{zone}", SYSTEM / zone)
    (SYSTEM / "Japan").symlink_to("Asia/Tokyo")
    (SYSTEM / "localtime").symlink_to("/etc/localtime")
    (SYSTEM / "+VERSION").write_text("2026a")
    for path in ("/usr/share/zoneinfo.default", "/usr/share/icu", STORAGE, STORAGE / "tz"):
        os.chmod(path, 0o755)
    fetch("2026b")


def ctl(line, *before):
    """Runs kestrelctl, by the commands before it; gives all that it prints, and its status."""
    command = [*before, "kestrelctl", *line.replace("DIR", str(FETCHED)).split()]
    ended = subprocess.run(command, capture_output=True, text=True, check=False, cwd="/")
    said = ended.stdout + ended.stderr
    assert "%s" not in said and (said or ended.returncode <= 0), ended
    return said, ended.returncode


def sh(command):
    return subprocess.run(["bash", "-c", command], cwd=STORAGE, capture_output=True, check=False)


def publish(*releases):
    for release in releases:
        fetch(release)
        assert ctl(f"publish {release}.1.0 DIR") == (f"{release}.1.0 is active\n", 0)


STRICTLY = ["sh", "-c", 'umask 077; exec "$0" "$@"']


def well():
    before = found()
    status = ctl("status")
    sh("kestrel")
    return status[1] == 0 and found() == before or status


def test_the_life_of_a_device():
    assert well() is True
    publish("2026b")
    fetch("2026c")
    for before in (STRICTLY, []):
        assert ctl("publish 2026c.1.0 DIR", *before) == ("2026c.1.0 is active\n", 0)
    for path, (sign, _, mode, _) in found().items():
        assert "/tz/" not in path or mode == {"/": 0o755, "=": 0o644, ">": 0o777}[sign], path
    assert ctl("status") == (
        "active: 2026c.1.0\nzoneinfo: /var/db/timezone/tz/2026c.1.0/zoneinfo\n"
        "system: 2026a.1.0\nschema: 44l\nnewest: 2026c.1.0\nnext run: keeps the active copy\n"
        "zone: Asia/Tokyo\nlast switch: 2026b.1.0_2026c.1.0\n"
        "downloads: 2026b.1.0 2026c.1.0\nwithdrawn: none\n", 0)
    assert ctl("back 2026b.1.0", *STRICTLY) == ("2026b.1.0 is active\n", 0)
    assert os.stat(STORAGE / "withdrawn").st_mode & 0o777 == 0o644
    assert "newest: 2026b.1.0\n" in ctl("status")[0] and well() is True
    assert ctl("publish 2026c.1.0 DIR")[1] == 3
    assert ctl("back 2026c.1.0") == ("2026c.1.0 is active\n", 0)
    assert "withdrawn: none\n" in ctl("status")[0]
    assert ctl("zone Etc/UTC") == ("zone: Etc/UTC\n", 0)
    assert ctl("back") == ("2026a.1.0 is active\n", 0)
    assert "withdrawn: 2026c.1.0\n" in ctl("status")[0] and well() is True
    publish("2026d")


# Versions beside a system copy 2026a, the active 2026c, and the withdrawn 2026d.
@pytest.mark.parametrize("version, status, line", [
    ("2026a.1.0", 3, "2026a.1.0 is not newer than the system copy, 2026a.1.0"),
    ("2026b.9.0", 3, "2026b.9.0 is not newer than the active copy, 2026c.1.0"),
    ("2026c.1", 3, "2026c.1 is not newer than the active copy, 2026c.1.0"),
    ("2026d.1.0", 3, "2026d.1.0 is withdrawn: publish a higher version"),
    ("2026e.1.0", 4, "/tmp/fetched/zoneinfo/+VERSION is of release 2026f, not 2026e"),
    ("2026c.1.0", 4, "2026c.1.0 has other content: publish this under a higher version"),
    ("2026f.2147483648", 2, "2026f.2147483648 is no version: a version is such as 2026b.1.0"),
    ("../2026f", 2, "../2026f is no version"),
])
def test_versions(version, status, line):
    publish("2026c", "2026d")
    ctl("back 2026c.1.0")
    fetch("2026f")
    before = found()
    said = ctl(f"publish {version} DIR")
    assert (line in said[0], said[1], found()) == (True, status, before), said


# What is wrong with a download, after a shell's command in its directory; and the line about it.
@pytest.mark.parametrize("damage, line", [
    ("mv icutz/icutz44l.dat icutz/icutz44b.dat", "has schema 44b, and the system copy has 44l"),
    ("rm icutz/icutz44l.dat", "icutz/icutz44l.dat is missing"),
    ("rm icutz/metaZones.res", "icutz/metaZones.res is missing"),
    ("truncate -s 40 icutz/metaZones.res", "icutz/metaZones.res is not whole"),
    ("cp /tmp/big icutz/metaZones.res", "icutz/metaZones.res has not the byte order of schema 44l"),
    ("rm -r icutz", "/tmp/fetched/icutz is missing or no directory"),
    ("truncate -s 100 zoneinfo/Asia/Tokyo", "zoneinfo has not the local zone, Asia/Tokyo"),
    (": >zoneinfo/+VERSION", "zoneinfo/+VERSION is not whole"),
    ("echo '# version 2026d' >zoneinfo/tzdata.zi", "tzdata.zi is of release 2026d, not 2026c"),
    ("echo x >zoneinfo/Etc/UTC", "zoneinfo/Etc/UTC is not whole"),
    ("head -c 60 zoneinfo/Etc/UTC >zoneinfo/New", "zoneinfo/New is not whole"),
    ("rm zoneinfo/Etc/UTC", "zoneinfo/Etc/UTC is missing"),
    ("rm zoneinfo/Etc/UTC; mkdir zoneinfo/Etc/UTC", "zoneinfo/Etc/UTC is missing"),
    ("mv zoneinfo/Etc .; ln -s ../Etc zoneinfo", "zoneinfo/Etc is a link that leads out"),
    ("ln -s ../../fetched/zoneinfo/Japan zoneinfo/New", "zoneinfo/New is a link that leads out"),
    ("ln -s ../../../2026b.1.0/zoneinfo/Japan zoneinfo/New", "New is a link that leads out"),
    ("ln -s /tmp/fetched/zoneinfo/Japan zoneinfo/New", "zoneinfo/New is a link that leads out"),
    ("ln -s New zoneinfo/New", "zoneinfo/New is a link that leads out of the copy or nowhere"),
    ("mv icutz/metaZones.res .; ln -s ../metaZones.res icutz", "metaZones.res is a link that"),
    ("mkfifo zoneinfo/New", "zoneinfo/New is neither a file, nor a directory, nor a link"),
    pytest.param("chown 4321 zoneinfo/Etc", "zoneinfo/Etc belongs to another user: chown -R it",
                 marks=several_users),
    ("chmod g+w icutz", "others than its owner can write /tmp/fetched/icutz: chmod -R go-w it"),
    (": >\"zoneinfo/$(printf '\\033')~\"", "zoneinfo/?~ is not whole"),
    ("mkdir -p zoneinfo/$(printf 'd/%.0s' {1..70})", "d/d lies too deep"),
    ("rm -r /tmp/fetched", "/tmp/fetched is missing or no directory"),
])
def test_damaged_downloads(damage, line):
    publish("2026b")
    fetch("2026c")
    Path("/tmp/big").write_bytes(bundle(">"))
    before = found()
    subprocess.run(["bash", "-c", damage], cwd=FETCHED, check=True)
    said = ctl("publish 2026c.1.0 DIR")
    assert (line in said[0], said[1], found()) == (True, 4, before), said


# What is wrong on a device that reads 2026b, after a shell's command in the storage; the line; and
# the cure, after which nothing is wrong. $B is the active copy, $A the system copy.
ADD = "kestrelctl publish 2026b.1.0 /tmp/fetched"
@pytest.mark.parametrize("damage, line, cure", [
    ("truncate -s 99 $B/zoneinfo/Etc/UTC", "Etc/UTC is not whole: publish 2026b.1.0 again", ADD),
    ("rm $B/zoneinfo/Asia/Tokyo", "Asia/Tokyo is missing: publish 2026b.1.0 again", ADD),
    ("rm $B/icutz/metaZones.res", "metaZones.res is missing: publish 2026b.1.0 again", ADD),
    ("rm $B/zoneinfo/Etc/UTC; mkfifo $B/zoneinfo/Etc/UTC", "Etc/UTC is neither a file", ADD),
    ("rm $B/zoneinfo/Etc/UTC; ln -s /dev/zero $B/zoneinfo/Etc/UTC", "Etc/UTC is a link that", ADD),
    ("echo 2026a >$B/zoneinfo/+VERSION", "+VERSION is of release 2026a, not 2026b", ADD),
    ("cp /tmp/big $B/icutz/metaZones.res", "has not the byte order of schema 44l: publish", ADD),
    ("chmod 600 $B/zoneinfo/Etc/UTC", "not everyone can read $B/zoneinfo/Etc/UTC: chmod 644 it",
     "chmod 644 $B/zoneinfo/Etc/UTC"),
    ("chmod 700 $B/zoneinfo/Etc", "not everyone can read $B/zoneinfo/Etc: chmod 755 it",
     "chmod 755 $B/zoneinfo/Etc"),
    ("chmod 600 $B/icutz/icutz44l.dat", "not everyone can read $B/icutz/icutz44l.dat: chmod a+rX",
     "chmod 644 $B/icutz/icutz44l.dat; kestrel"),
    ("chmod 700 tz", "not everyone can read /var/db/timezone/tz: chmod a+rX it", "chmod a+rX tz"),
    ("chmod 700 $B/zoneinfo", "not everyone can read $B/zoneinfo: ", "chmod a+rX $B/zoneinfo"),
    ("chmod 700 $B/icutz", "not everyone can read $B/icutz: ", "chmod a+rX $B/icutz"),
    ("chmod 711 $B/zoneinfo/Asia", "not everyone can read $B/zoneinfo/Asia: chmod 755 it",
     "chmod 755 $B/zoneinfo/Asia"),
    ("chmod 700 $B", "not everyone can read $B: chmod a+rX it", "chmod a+rX $B"),
    ("rm $B/icutz/icutz44l.dat", "icutz44l.dat is missing or no file: publish 2026b.1.0", ADD),
    ("rm -r $B/icutz; : >$B/icutz", "icutz44l.dat is missing or no file: publish", ADD),
    ("mv $B/icutz/icutz44{l,b}.dat", "has 44l: start a run of kestrel, and remove /var/db/timezone/"
     "tz_latest", "kestrel; rm tz_latest"),
    ("rm -r $B", "$B is missing: start a run of kestrel, and remove /var/db/timezone/tz_latest",
     "kestrel; rm tz_latest"),
    ("rm -r $B; : >$B", "$B is missing: start a run of kestrel, and", "kestrel; rm tz_latest"),
    ("rm -r tz", "timezone/tz/ is missing or no directory: make it one",
     "mkdir tz; kestrel; rm tz_latest"),
    ("ln -sf ../+VERSION $B/zoneinfo/Asia/Tokyo", "Asia/Tokyo is not whole: publish", ADD),
    ("ln -sfn Etc $B/zoneinfo/Japan", "zoneinfo/Japan is missing: publish", ADD),
    ("mv $B/icutz /tmp/out; ln -s /tmp/out $B/icutz", "icutz is a link that leads out of the", ADD),
    ("truncate -s 10G $B/zoneinfo/Etc/UTC", "Etc/UTC is not whole: publish", ADD),
    ("echo >$B/zoneinfo/+VERSION", "+VERSION is of release , not 2026b: publish", ADD),
    ("ln -sfn $B zoneinfo", "leads to $B, which is no copy: start a run of kestrel", "kestrel"),
    ("ln -sfn tz/2026b.1.0/zoneinfo zoneinfo", "which is no copy: start a run", "kestrel"),
    ("ln -sfn $B/icutz zoneinfo", "which no program expects: kestrelctl back 2026b.1.0",
     "kestrelctl back 2026b.1.0"),
    ("rm zoneinfo", "/var/db/timezone/zoneinfo is missing: start a run of kestrel", "kestrel"),
    ("rm zoneinfo; mkdir zoneinfo", "zoneinfo is no link: remove it, and start a run of kestrel",
     "rmdir zoneinfo; kestrel"),
    ("rm icutz", "icutz is not that of the active copy: kestrelctl back 2026b.1.0",
     "kestrelctl back 2026b.1.0"),
    ("rm icutz; mkdir icutz", "icutz is no link: remove it, and kestrelctl back 2026b.1.0",
     "rmdir icutz; kestrelctl back 2026b.1.0"),
    ("rm tz_latest; touch tz_latest", "tz_latest is no link: remove it", "rm tz_latest"),
    ("ln -sfn tz/2026b.1.0 tz_latest", "leads to tz/2026b.1.0, which is no path of a download: "
     "remove /var/db/timezone/tz_latest", "rm tz_latest"),
    ("ln -sfn $PWD/tz/x tz_latest", "names x, which is no version: remove", "rm tz_latest"),
    ("ln -sfn $PWD/tz/2026c tz_latest", "2026c, the newest download, is missing", "rm tz_latest"),
    ("mkdir -p tz/2026c/icutz; : >tz/2026c/icutz/icutz44b.dat; ln -sfn $PWD/tz/2026c tz_latest",
     "2026c has schema 44b, and the system copy has 44l: remove", "rm tz_latest"),
    ("cp -r $B tz/x; ln -sfn $PWD/tz/x/zoneinfo zoneinfo; ln -sfn $PWD/tz/x/icutz icutz",
     "/var/db/timezone/tz/x has a name that is no version: start a run of kestrel", "kestrel"),
    ("ln -sfn /usr/share /usr/share/zoneinfo", "zoneinfo does not lead to /var/db/timezone/zoneinfo"
     ": ln -sfn /var/db/timezone/zoneinfo /usr/share/zoneinfo",
     "ln -sfn /var/db/timezone/zoneinfo /usr/share/zoneinfo"),
    ("rm localtime", "localtime is missing: kestrelctl zone NAME", "kestrelctl zone Asia/Tokyo"),
    ("rm localtime; mkdir localtime", "localtime is no link: remove it, and kestrelctl zone NAME",
     "rmdir localtime; kestrelctl zone Asia/Tokyo"),
    ("ln -sfn zoneinfo/Asia/Tokyo localtime", "leads to zoneinfo/Asia/Tokyo, not into /var/db",
     "kestrelctl zone Asia/Tokyo"),
    ("ln -sfn $PWD/zoneinfo/Asia localtime", "the local zone Asia is not whole in the active",
     "kestrelctl zone Asia/Tokyo"),
    ("ln -sfn $PWD/zoneinfo/+VERSION localtime", "the local zone +VERSION is not whole in the",
     "kestrelctl zone Asia/Tokyo"),
    ("ln -sfn $PWD/zoneinfo//Asia/Tokyo localtime", "the local zone /Asia/Tokyo is not whole in",
     "kestrelctl zone Asia/Tokyo"),
    ("mkdir withdrawn", "/var/db/timezone/withdrawn cannot be read: remove it", "rmdir withdrawn"),
    ("ln -s $B/icutz icutz.new; rm icutz; mkdir icutz", "run of kestrel goes back to the system",
     "rmdir icutz; kestrel"),
    ("ln -s $B/icutz icutz.new", "icutz.new is of a run that was killed: start a run", "kestrel"),
    ("ln -s /usr /var/db/icutz", "/var/db/icutz is of an older system: remove it", "rm ../icutz"),
    ("mkdir /var/db/icu", "/var/db/icu is of an older system: remove it", "rmdir ../icu"),
    ("ln -s /usr /var/db/icu", "/var/db/icu is of an older system: remove it", "rm ../icu"),
    ("chmod 600 /usr/share/icu/icutzformat.txt", "not everyone can read /usr/share/icu/icutzformat",
     "chmod a+rX /usr/share/icu/icutzformat.txt"),
    ("rm /usr/share/zoneinfo; mkdir /usr/share/zoneinfo", "remove it, and ln -sfn /var/db/timezone",
     "rmdir /usr/share/zoneinfo; ln -sfn /var/db/timezone/zoneinfo /usr/share/zoneinfo"),
    ("echo 2026c >$A/+VERSION", "$B is older than the system copy, 2026c.1.0: start", "kestrel"),
    ("echo 2147483648a >$A/+VERSION", "+VERSION does not name a release such as 2026b: repair",
     "echo 2026a >$A/+VERSION"),
    ("rm $A/+VERSION", "$A/+VERSION is missing, empty or unreadable: repair the image",
     "echo 2026a >$A/+VERSION"),
    ("rm /usr/share/icu/*", "icutzformat.txt is missing, empty or unreadable: repair the image",
     "echo 44l >/usr/share/icu/icutzformat.txt"),
    ("echo 44 >/usr/share/icu/icutzformat.txt", "does not name a schema such as 44l: repair",
     "echo 44l >/usr/share/icu/icutzformat.txt"),
    ("kestrelctl back; truncate -s 9 $A/Etc/UTC", "$A/Etc/UTC is not whole: repair the image",
     "cp $B/zoneinfo/Etc/UTC $A/Etc"),
    ("kestrelctl back; echo x >$A/Asia/Tokyo", "$A/Asia/Tokyo is not whole: repair the image",
     "cp $B/zoneinfo/Asia/Tokyo $A/Asia"),
    ("cp -r $B tz/2026c; truncate -s 9 tz/2026c/zoneinfo/Etc/UTC; ln -sfn $PWD/tz/2026c tz_latest",
     "2026c/zoneinfo/Etc/UTC is not whole: remove /var/db/timezone/tz_latest", "rm tz_latest"),
])
def test_status(damage, line, cure):
    publish("2026b")
    Path("/tmp/big").write_bytes(bundle(">"))
    os.environ |= {"A": str(SYSTEM), "B": str(STORAGE / "tz/2026b.1.0")}
    assert well() is True
    sh(damage)
    said = ctl("status")
    assert said[1] == 1 and os.path.expandvars(line) in said[0], said
    sh(cure)
    assert well() is True


@several_users
def test_status_of_another_user():
    publish("2026b")
    os.chmod(STORAGE / "tz", 0o700)
    said = ctl("status", "setpriv", "--reuid=4321", "--clear-groups")
    assert said[0].endswith("not everyone can read /var/db/timezone/tz: chmod a+rX it\n")
    assert said[0].count("kestrelctl: ") == said[1] == 1 and "next run" not in said[0]


# A copy that is damaged on the device is replaced, whether or not it is active.
def test_replacement():
    publish("2026b")
    os.truncate(STORAGE / "tz/2026b.1.0/zoneinfo/Etc/UTC", 99)
    said = ctl("publish 2026b.1.0 DIR", *TRACER, "-e", "inject=renameat2:error=EINVAL")
    assert said[1] == 1 and "publish the data under a higher version" in said[0]
    publish("2026b")
    assert well() is True and os.listdir(STORAGE / "tz") == ["2026b.1.0"]


def test_publishing_in_place():
    fetch("2026b", STORAGE / "tz/2026b.1.0")
    sh("chmod -R go= tz/2026b.1.0; mkdir /var/db/icu; : >/var/db/icu/kept")
    there = ctl("publish 2026b.1.0 /var/db/timezone/tz/2026b.1.0", *STRICTLY)
    assert there == ("2026b.1.0 is active\n", 0) and well() is True
    fetch("2026c", STORAGE / "tz/2026d.1.0")
    assert ctl("publish 2026d.1.0 /var/db/timezone/tz/2026d.1.0")[1] == 4


# Before each call that changes something, a command is killed, or the call fails, once or from then
# on. Then a reader finds the local zone, a failure is no success, and the same command completes
# the work. What a killed command made and did not name is the next command's to remove; a version
# that could not be withdrawn is said.
CHANGING = r"(mkdir|symlink|rename|unlink|syncfs|fsync|fchmod)|openat.*O_CREAT|write\(\d+, \"\w"


def lasting():
    return {(path, what) for path, what in kinds()
            if ".kestrelctl" not in path and "withdrawn" not in path}


@pytest.mark.parametrize("line", ["publish 2026d.1.0 DIR", "back 2026b.1.0", "prune",
                                  "zone Etc/UTC"])
def test_interrupted(line):
    publish("2026b", "2026c")
    sh("cp -r tz/2026b.1.0 tz/2025z.1.0; rm -rf /tmp/db; cp -a /var/db /tmp/db")
    fetch("2026d")
    # Faster, but not for publish, whose run of kestrel is not to be disturbed.
    quickly = ["-f", "--seccomp-bpf"] if not line.startswith("publish") else []
    tracer = [*TRACER, *quickly, "-e", "trace=/^(mkdir|symlink|rename|unlink|sync|fsync|fchmod|"
              "open|write)"]
    assert ctl(line, *tracer)[1] == 0
    undisturbed, seen, kinds_seen = lasting(), Counter(), Counter()
    for call in re.sub(r"(?m)^\d+ +", "", TRACE.read_text()).splitlines():
        name, kind = call.split("(")[0], re.sub(r"\d+|\"[\w+.]*\"", "", call)
        seen[name] += 1
        kinds_seen[kind] += 1
        # Of calls that differ in a descriptor or a name only, one is enough.
        if not re.match(CHANGING, call) or kinds_seen[kind] > 1:
            continue
        often = "+" if name != "write" else ""  # a sanitizer writes, too
        for fault in (f"signal=KILL:when={seen[name]}", f"error=EIO:when={seen[name]}",
                      f"error=ENOSPC:when={seen[name]}{often}"):
            sh("rm -rf /var/db/*; cp -a /tmp/db/. /var/db")
            said = ctl(line, *tracer, "-e", f"inject={name}:{fault}")
            assert (STORAGE / "localtime").read_bytes().startswith(b"TZif"), (call, fault)
            assert said[1] or lasting() == undisturbed, (call, fault, said)
            assert said[1] or not line.startswith("back") or "withdrawn" in str(kinds()) or (
                "is not withdrawn" in said[0]), (call, fault, said)
            assert ctl(line)[1] == 0 and lasting() == undisturbed, (call, fault)
            assert not (STORAGE / "tz/.kestrelctl").exists(), (call, fault)


# The ways out of a full storage, without an inode and without a block.
@pytest.mark.parametrize("line, said", [
    ("back", "2026a.1.0 is active"), ("back 2026b.1.0", "2026b.1.0 is active"),
    ("prune", "removed /var/db/timezone/tz/2025z.1.0"), ("zone Etc/UTC", "zone: Etc/UTC")])
@pytest.mark.parametrize("limit", ["nr_inodes=$(($(df --output=iused /var | tail -n 1)))",
                                   "size=$(($(df -B1 --output=used /var | tail -n 1)))"])
def test_full_storage(line, said, limit):
    publish("2026b", "2026c")
    shutil.copytree(STORAGE / "tz/2026b.1.0", STORAGE / "tz/2025z.1.0")
    remount = "mount --options-source=disable -o remount,"
    if sh(f"{remount}{limit} /var").returncode:
        pytest.skip("only root can remount")
    ended = ctl(line)
    sh(f"{remount}nr_inodes=1000000,size=50% /var")
    assert ended[1] == 0 and said in ended[0], ended
    assert ("is not withdrawn" in ended[0]) == line.startswith("back"), ended
    assert well() is True


def test_no_room_to_publish():
    publish("2026b")
    fetch("2026c")
    if sh("mount --options-source=disable -o remount,nr_inodes="
          "$(($(df --output=iused /var | tail -n 1))) /var").returncode:
        pytest.skip("only root can remount")
    before = found()
    said = ctl("publish 2026c.1.0 DIR")
    sh("mount --options-source=disable -o remount,nr_inodes=1000000 /var")
    assert said[0].endswith("there is no room: kestrelctl prune makes some\n") and said[1] == 5
    assert found() == before


def test_prune():
    publish("2026b", "2026c", "2026d")
    sh("ln -s x tz_latest.new; : >withdrawn.new; cp -r tz/2026b.1.0 tz/2025z.1.0;"
       "mkdir -p tz/.kestrelctl/x tz/lost+found tz/2026e;"
       "ln -s 2026b.1.0 tz/2026y; ln -s 2026z tz/2026z; : >tz/2026x; ln -s $PWD/tz/2026e held")
    assert ctl("prune") == ("removed /var/db/timezone/tz/.kestrelctl\n"
                            "removed /var/db/timezone/tz/2025z.1.0\n", 0)
    assert sorted(os.listdir(STORAGE / "tz")) == [
        "2026b.1.0", "2026c.1.0", "2026d.1.0", "2026e", "2026x", "2026y", "2026z", "lost+found"]
    assert not [name for name in os.listdir(STORAGE) if name.endswith(".new")]


def test_prune_keeps_no_withdrawn_copy_but_the_last():
    publish("2026b", "2026c")
    ctl("back 2026b.1.0")
    assert ctl("prune") == ("", 0)
    publish("2026d")
    assert ctl("prune") == ("removed /var/db/timezone/tz/2026c.1.0\n", 0)


def test_one_at_a_time():
    lock = os.open(STORAGE / "tz", os.O_RDONLY)
    fcntl.flock(lock, fcntl.LOCK_EX)
    for line in ("publish 2026b.1.0 DIR", "back", "prune", "zone Etc/UTC"):
        assert ctl(line) == ("kestrelctl: another kestrelctl is at work: "
                             "start again when it has ended\n", 5)
    os.close(lock)
    publish("2026b")


@several_users
def test_closed_zones_of_another_user():
    publish("2026b")
    os.chmod(STORAGE / "tz/2026b.1.0/zoneinfo/Asia", 0o700)
    said = ctl("status", "setpriv", "--reuid=4321", "--clear-groups")
    assert said[0].endswith("/zoneinfo/Asia: chmod 755 it\n") and said[0].count("kestrelctl: ") == 1


@several_users
def test_system_copy_that_the_owner_cannot_read():
    publish("2026b")
    sh("chown -hR 1234:1234 .; chmod 600 /usr/share/zoneinfo.default/+VERSION")
    for line in ("back", "prune", "publish 2026b.1.0 DIR"):
        said = ctl(line)
        assert said[1] == 1 and "not everyone can read /usr/share/zoneinfo.default/+V" in said[0]


@several_users
def test_storage_of_another_user():
    sh("chown -hR 1234:1234 .")
    publish("2026b")
    assert {os.stat(path).st_uid for path in (STORAGE / "tz").rglob("*")} == {1234}
    record = os.stat(STORAGE / "TZVersionDiffRecord")
    assert (record.st_uid, record.st_gid) == (0, 0)
    for line, said in (("publish 2026d.1.0 DIR", "2026d.1.0 waits for the next run of kestrel\n"),
                       ("publish 2026b.1.0 /var/db/timezone/tz/2026b.1.0", "2026b.1.0 is active\n"),
                       ("zone Etc/UTC", "zone: Etc/UTC\n"), ("back", "2026a.1.0 is active\n")):
        fetch("2026d")
        assert ctl(line, *AS_OWNER) == (said, 0)
    assert "withdrawn: 2026b.1.0 2026d.1.0" in ctl("status")[0]
    fetch("2026c")
    ctl("publish 2026e.1.0 DIR", *AS_OWNER)
    said = ctl("prune", "setpriv", "--reuid=4321", "--clear-groups")
    assert said[1] == 1 and "/var/db/timezone/ cannot be changed: Permission denied" in said[0]
    os.mkdir(STORAGE / "tz/2025y")
    (STORAGE / "tz/2025y/root").touch()
    said = ctl("prune", *AS_OWNER)
    assert said[1] == 1 and "tz/2025y cannot be removed: Permission denied" in said[0]
    for line in ("status", "prune"):
        ctl(line, *TRACER)
        assert re.search(r"setgroups\(0, NULL\) += 0\nsetresgid\(-1, 1234, -1\) += 0\n"
                         r"setresuid\(-1, 1234, -1\) += 0", TRACE.read_text())


# A lower version while a newer one waits for its run.
@several_users
def test_a_download_that_waits():
    sh("chown -hR 1234 .")
    for release, status in (("2026c", 0), ("2026b", 3)):
        fetch(release)
        assert ctl(f"publish {release}.1.0 DIR", *AS_OWNER)[1] == status
    assert os.readlink(STORAGE / "tz_latest").endswith("2026c.1.0")


@pytest.mark.parametrize("line", ["publish 2026b.1.0 DIR", "back", "prune", "zone Etc/UTC"])
@pytest.mark.parametrize("opened, reason", [
    ("chmod g+w .", "others than its owner can write /var/db/timezone/: chmod go-w it"),
    ("chmod o+w tz", "others than its owner can write /var/db/timezone/tz/: chmod go-w it"),
    pytest.param("chown 1234 tz", "/var/db/timezone/tz/ has another owner than /var/db/timezone/: "
                 "chown it", marks=several_users)])
def test_unsafe_storage(line, opened, reason):
    sh(opened)
    before = found()
    assert ctl(line) == (f"kestrelctl: {reason}\n", 1) and found() == before


# What is as it should be already is not made again, so that it needs no room.
def test_nothing_to_change():
    publish("2026b")
    before = found()
    for line in ("publish 2026b.1.0 DIR", "back 2026b.1.0", "zone Asia/Tokyo", "prune"):
        assert ctl(line)[1] == 0 and found() == before, line


# Where the disk or the system fails to read, prune takes no copy for a bad one.
def test_prune_that_cannot_read():
    publish("2026b", "2026c", "2026d")
    tracer = [*TRACER, "-f", "--seccomp-bpf", "-e", "trace=openat,getdents64,read"]
    ctl("prune", *tracer)
    seen = Counter(re.findall(r"^\d+ +(openat|getdents64|read)\(", TRACE.read_text(), re.M))
    assert len(seen) == 3
    for name, times in seen.items():
        for when in range(1, times + 1, 1 + times // 8):
            error = "EIO" if name != "openat" else "EMFILE"
            said = ctl("prune", *tracer, "-e", f"inject={name}:error={error}:when={when}")
            if "cannot open shared object" in said[0] or said[1] == 127:
                continue  # it was the loader that failed
            kept = os.listdir(STORAGE / "tz")
            assert "2026c.1.0" in kept and (said[1] or "2026b.1.0" not in kept), (name, when, said)
            shutil.copytree(STORAGE / "tz/2026c.1.0", STORAGE / "tz/2026b.1.0", dirs_exist_ok=True)
            (STORAGE / "tz/2026b.1.0/zoneinfo/+VERSION").write_text("2026b")
            (STORAGE / "tz/2026b.1.0/zoneinfo/tzdata.zi").write_text("# version 2026b")


# A copy that not everyone can read is neither published nor gone back to.
@pytest.mark.parametrize("closed", [".", "zoneinfo", "icutz", "zoneinfo/Etc"])
def test_closed_copies(closed):
    fetch("2026b", STORAGE / "tz/2026b.1.0")
    os.chmod(STORAGE / "tz/2026b.1.0" / closed, 0o700)
    assert ctl("publish 2026b.1.0 /var/db/timezone/tz/2026b.1.0") == ("2026b.1.0 is active\n", 0)
    assert well() is True
    publish("2026c")
    os.chmod(STORAGE / "tz/2026b.1.0" / closed, 0o700)
    assert ctl("back 2026b.1.0")[1] == 4 and "downloads: 2026c.1.0\n" in ctl("status")[0]


# What others can change is copied anew, and only with the same content.
def test_copies_that_others_can_change():
    publish("2026b")
    os.chmod(STORAGE / "tz/2026b.1.0/zoneinfo/Etc/UTC", 0o666)
    fetch("2026b")
    for change in ("echo more >zoneinfo/more", "rm -r zoneinfo/more icutz"):
        subprocess.run(change, shell=True, cwd=FETCHED, check=True)
        said = ctl("publish 2026b.1.0 DIR")
        assert said[1] == 4 and "has other content" in said[0]
    publish("2026b")
    assert os.stat(STORAGE / "tz/2026b.1.0/zoneinfo/Etc/UTC").st_mode & 0o777 == 0o644


# A link stays where its replacement fails, whatever the reason.
def test_no_link_is_lost():
    publish("2026b", "2026c")
    for line in ("zone Etc/UTC", "back 2026b.1.0", "back"):
        for error in ("rename:error=EIO", "symlink:error=EROFS", "symlink:error=EIO:when=2+"):
            done = ctl(line, *TRACER, "-e", f"inject={error}")[1] == 0
            assert (STORAGE / "localtime").exists() and (STORAGE / "zoneinfo").exists(), line
            assert done or (STORAGE / "icutz").exists() and (STORAGE / "tz_latest").exists(), line


# The first run has to go back, the second one switches.
def test_publishing_beside_a_copy_of_another_schema():
    fetch("2099z", STORAGE / "tz/2099z.1.0")
    sh("cd tz/2099z.1.0; mv icutz/icutz44{l,b}.dat; ln -sfn $PWD/zoneinfo $PWD/icutz ../..;"
       "ln -sfn $PWD ../../tz_latest")
    fetch("2026b")
    said = ctl("publish 2026b.1.0 DIR")
    assert said[0].startswith("2026b.1.0 is active\n") and said[1] == 0


def test_many_faults():
    sh("for i in {1..30}; do : >/tmp/fetched/zoneinfo/empty$i; done")
    said = ctl("publish 2026b.1.0 DIR")
    assert said[0].count("\n") == 21 and said[0].endswith("kestrelctl: 10 more lines like these\n")


# The data is on the disk before its name is, and the name before the run.
def test_order_of_writes():
    ctl("publish 2026b.1.0 DIR", "strace", "-fqqyo", str(TRACE))
    done = "\n".join(re.findall(r"(?:syncfs|execve|rename).* = 0", TRACE.read_text()))
    order = re.findall(r'syncfs|execve(?=.*kestrel")|(?<=timezone/)\S+(?="\) = 0)', done)
    assert order == ["syncfs", "tz/2026b.1.0", "syncfs", "tz_latest", "syncfs", "execve",
                     "zoneinfo", "icutz"]
    opened = re.findall(r"openat\(\d+<.*", TRACE.read_text())
    assert opened and all("O_NOFOLLOW" in call for call in opened)
    ctl("zone Etc/UTC", *TRACER)
    assert re.search(r'timezone/localtime"\) = 0\n(.*\n)*syncfs', TRACE.read_text())
    publish("2026c")
    ctl("back 2026b.1.0", *TRACER)
    order = re.findall(r'^(f?sync)|^rename.*(?<=timezone/)(\S+)"\) = 0', TRACE.read_text(), re.M)
    assert [sync or name for sync, name in order] == ["fsync", "withdrawn", "fsync", "tz_latest",
                                                      "zoneinfo", "icutz", "sync"]


def test_the_run():
    alone = ctl("publish 2026b.1.0 DIR", "env", "PATH=/usr/bin", "bash", "-c",
                f'exec -a /nowhere/kestrelctl {shutil.which("kestrelctl")} "${{@:2}}"', "bash")
    assert alone[1] == 1 and "kestrel is neither beside kestrelctl nor in the PATH" in alone[0]
    assert "2026b.1.0 is not active" in alone[0] and "the next run of kestrel switches" in alone[0]
    os.makedirs("/run/systemd/system", exist_ok=True)
    os.makedirs("/tmp/bin", exist_ok=True)
    Path("/tmp/bin/systemctl").write_text("#!/bin/sh\necho $@ >/tmp/asked; kestrel\n")
    os.chmod("/tmp/bin/systemctl", 0o755)
    assert ctl("publish 2026b.1.0 DIR", "env", "PATH=/tmp/bin:" + os.environ["PATH"])[1] == 0
    os.rmdir("/run/systemd/system")
    assert Path("/tmp/asked").read_text() == "start kestrel.service\n"


@pytest.mark.parametrize("name", ["Asia/Seoul", "Asia", "", "/etc/passwd", "Asia/../Japan", "..",
                                  "./Japan", "Japan/", "localtime", "Etc/UTC\n", "+VERSION",
                                  "/tmp/machine/share/zoneinfo/Asia/Tokyo"])
def test_no_zone(name):
    before = found()
    said = subprocess.run(["kestrelctl", "zone", name], capture_output=True, text=True, check=False)
    assert said.returncode == 4 and "is no whole zone of the active copy" in said.stderr
    assert found() == before


def test_failed_calls():
    publish("2026b")
    for error, said in (("EIO", "kestrelctl: /var/db/timezone/: Input/output error\n"),
                        ("ENOSPC", "kestrelctl: /var/db/timezone/: No space left on device\n"
                         "kestrelctl: there is no room: kestrelctl prune makes some\n")):
        ended = ctl("zone Asia/Tokyo", *TRACER, "-e", f"inject=syncfs:error={error}")
        assert ended == (said, 1 if error == "EIO" else 5)


def test_signals():
    publish("2026b")
    fetch("2026c")
    assert sh("{ sleep .1; kestrelctl status; } | true; exit ${PIPESTATUS[0]}").returncode == 1
    assert sh("ulimit -f 0; kestrelctl publish 2026c.1.0 /tmp/fetched").returncode == 1
    assert well() is True


def test_usage():
    for line in ("", "stat", "status x", "publish 2026b.1.0", "back a b", "zone", "zone a b",
                 "back x"):
        said = ctl(line)
        assert said[1] == 2 and said[0].startswith("kestrelctl: "), line
    assert ctl("--help") == ("usage: kestrelctl status | publish VERSION DIRECTORY | "
                             "back [VERSION] | prune | zone NAME\n", 0)
    assert ctl("--version")[1] == 0
    assert sh("kestrelctl --version >/dev/full").returncode == 1

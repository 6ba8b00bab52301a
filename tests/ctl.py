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
    command = f"cd {STORAGE}; {command}"
    return subprocess.run(["bash", "-c", command], capture_output=True, check=False)


def publish(*releases):
    for release in releases:
        fetch(release)
        assert ctl(f"publish {release}.1.0 DIR") == (f"{release}.1.0 is active\n", 0)


REMOUNT = "mount --options-source=disable -o remount"
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
        assert "/timezone" not in path or mode == {"/": 0o755, "=": 0o644, ">": 0o777}[sign], path
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
    assert ctl("back") == ctl("back") == ("2026a.1.0 is active\n", 0)
    assert "withdrawn: 2026c.1.0\n" in ctl("status")[0] and well() is True
    publish("2026d")


# Versions beside a system copy 2026a, the active 2026c, and the withdrawn 2026d.
@pytest.mark.parametrize("version, status, line", [
    ("2026a.1.0", 3, "2026a.1.0 is not newer than the system copy, 2026a.1.0"),
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
    sh("rm tz_latest")
    fetch("2026f")
    before = found()
    said = ctl(f"publish {version} DIR")
    assert (line in said[0], said[1], found()) == (True, status, before), said


# What stands for long texts in the tables below, and is known to the shell.
NAMES = {
    "S": str(STORAGE), "A": str(SYSTEM), "B": str(STORAGE / "tz/2026b.1.0"), "F": str(FETCHED),
    "AGAIN": "publish 2026b.1.0 again, from good data", "RUN": "start a run of kestrel",
    "LEAVES": "the next run of kestrel goes back to the system copy: see the other lines",
    "FAILS": "the next run of kestrel fails: see the other lines",
    "IMMUTABLE": "is missing, read-only, or append-only: make it a directory that can be changed",
    "NO_PATH": f"which is no path of a download: remove {STORAGE}/tz_latest",
    "RETURNS": f"the next run of kestrel switches to {STORAGE}/tz/2026b.1.0: see the other lines",
    "LEADS_OUT": "is a link that leads out of the copy or nowhere",
    "STAGED": f"create_symlink: from {STORAGE}/localtime to {STORAGE}/zoneinfo/Etc/UTC",
    "UNSWITCHED": f"create_symlink: from {STORAGE}/zoneinfo to {SYSTEM}",
    "NO_ROOM": "there is no room: kestrelctl prune makes some",
    "IN_STEPS": f"this file system cannot replace {STORAGE}/tz/2026b.1.0 in one step: "
                "publish the data under a higher version",
    "LONG": "c" * 300, "DEEP": "/d" * 63}
os.environ |= NAMES
ADD = "kestrelctl publish 2026b.1.0 /tmp/fetched"


def lines_of(said):
    return sorted(line for line in said.splitlines() if line.startswith("kestrelctl: "))


def wanted(lines):
    return sorted("kestrelctl: " + os.path.expandvars(line) for line in lines)


# What is wrong with a download, after a shell's command in its directory; and the lines about it.
@pytest.mark.parametrize("row", [
    ("mv icutz/icutz44l.dat icutz/icutz44b.dat",
     "$F/icutz has schema 44b, and the system copy has 44l"),
    ("rm icutz/icutz44l.dat", "$F/icutz/icutz44l.dat is missing or no file"),
    ("truncate -s 40 icutz/metaZones.res", "$F/icutz/metaZones.res is not whole"),
    ("rm -r icutz", "$F/icutz is missing or no directory"),
    ("truncate -s 100 zoneinfo/Asia/Tokyo",
     "$F/zoneinfo/Asia/Tokyo is not whole", "$F/zoneinfo has not the local zone, Asia/Tokyo"),
    (": >zoneinfo/+VERSION", "$F/zoneinfo/+VERSION is not whole",
     "$F/zoneinfo/+VERSION is of release , not 2026c"),
    ("echo '# version 2026d' >zoneinfo/tzdata.zi",
     "$F/zoneinfo/tzdata.zi is of release 2026d, not 2026c"),
    ("echo x >zoneinfo/Z", "$F/zoneinfo/Z is not whole"),
    ("rm zoneinfo/Etc/UTC", "$F/zoneinfo/Etc/UTC is missing"),
    ("mv zoneinfo/Etc .; ln -s ../Etc zoneinfo", "$F/zoneinfo/Etc $LEADS_OUT"),
    ("ln -s ../../../2026b.1.0/zoneinfo/Japan zoneinfo/New", "$F/zoneinfo/New $LEADS_OUT"),
    ("ln -s /tmp/fetched/zoneinfo/Japan zoneinfo/New", "$F/zoneinfo/New $LEADS_OUT"),
    ("mkfifo zoneinfo/New", "$F/zoneinfo/New is neither a file, nor a directory, nor a link"),
    pytest.param(
        ("chown 4321 zoneinfo/Etc", "$F/zoneinfo/Etc belongs to another user: chown -R it"),
        marks=several_users),
    ("chmod g+w icutz", "others than its owner can write $F/icutz: chmod -R go-w it"),
    (": >\"zoneinfo/$(printf '\\033')~\"", "$F/zoneinfo/?~ is not whole"),
    ("mkdir -p zoneinfo$DEEP/d/d", "$F/zoneinfo$DEEP lies too deep"),
    ("rm -r /tmp/fetched", "$F is missing or no directory"),
], ids=lambda row: row[0])
def test_damaged_downloads(row):
    damage, *lines = row
    publish("2026b")
    fetch("2026c")
    before = found()
    subprocess.run(["bash", "-c", damage], cwd=FETCHED, check=True)
    said = ctl("publish 2026c.1.0 DIR")
    assert (lines_of(said[0]), said[1], found()) == (wanted(lines), 4, before)


# What is wrong on a device that reads 2026b, after a command in the storage; the cure, after
# which nothing is wrong; and the lines.
@pytest.mark.parametrize("row", [
    # The data of the active copy.
    ("truncate -s 99 $B/zoneinfo/Etc/UTC", ADD, "$B/zoneinfo/Etc/UTC is not whole: $AGAIN"),
    ("rm $B/zoneinfo/Asia/Tokyo", ADD, "$B/zoneinfo/Japan $LEADS_OUT: $AGAIN",
     "$B/zoneinfo/Asia/Tokyo is missing: $AGAIN",
     "the local zone Asia/Tokyo is not whole in the active copy: $AGAIN"),
    ("rm $B/icutz/metaZones.res", ADD, "$B/icutz/metaZones.res is missing: $AGAIN"),
    ("rm $B/zoneinfo/Etc/UTC; mkfifo $B/zoneinfo/Etc/UTC", ADD,
     "$B/zoneinfo/Etc/UTC is neither a file, nor a directory, nor a link: $AGAIN"),
    ("cp /tmp/big $B/icutz/metaZones.res", ADD,
     "$B/icutz/metaZones.res has not the byte order of schema 44l: $AGAIN"),
    ("ln -sfn /etc/localtime $B/zoneinfo/Etc/UTC", ADD, "$B/zoneinfo/Etc/UTC $LEADS_OUT: $AGAIN"),
    ("ln -sfn /x $B/zoneinfo/localtime", ADD, "$B/zoneinfo/localtime $LEADS_OUT: $AGAIN"),
    ("ln -s UTC/../UTC $B/zoneinfo/Etc/New", ADD, "$B/zoneinfo/Etc/New $LEADS_OUT: $AGAIN"),
    ("ln -s Asia/ $B/zoneinfo/Area; ln -s Area/../../zoneinfo/Japan $B/zoneinfo/New", ADD,
     "$B/zoneinfo/New $LEADS_OUT: $AGAIN"),
    ("mkdir $B/icutz/E; ln -s ../../x $B/icutz/E", ADD, "$B/icutz/E/x $LEADS_OUT: $AGAIN"),
    ("mkdir $B/icutz/E; ln -s ../icutz/E $B/zoneinfo", ADD, "$B/zoneinfo/E $LEADS_OUT: $AGAIN"),
    ("rm $B/icutz/metaZones.res; mkdir $B/icutz/metaZones.res", ADD,
     "$B/icutz/metaZones.res is not whole: $AGAIN"),
    ("rm -r $B/icutz; ln -s icutz $B/icutz", ADD,
     "$B/icutz/icutz44l.dat is missing or no file: $AGAIN", "$LEAVES"),
    ("cd $A; mv +VERSION ..; ln -s ../+VERSION .; rm $B/zoneinfo/+VERSION", ADD,
     "$B/zoneinfo/+VERSION is missing: $AGAIN"),
    ("ln -s /nowhere $A/Own; ln -s /nowhere $B/zoneinfo/Own", "rm $A/Own $B/zoneinfo/Own",
     "$B/zoneinfo/Own is not whole: $AGAIN"),
    (": >$B/zoneinfo/zone.tab", ADD, "$B/zoneinfo/zone.tab is not whole: $AGAIN"),
    ("yes | head -c 3M >$B/zoneinfo/zone.tab", ADD, "$B/zoneinfo/zone.tab is not whole: $AGAIN"),
    ("printf 'a\\0' >$B/zoneinfo/zone.tab", ADD, "$B/zoneinfo/zone.tab is not whole: $AGAIN"),
    ("printf TZif >$B/zoneinfo/posixrules", ADD, "$B/zoneinfo/posixrules is not whole: $AGAIN"),
    ("ln -sfn /root $B/zoneinfo/Etc/X", ADD, "$B/zoneinfo/Etc/X $LEADS_OUT: $AGAIN"),
    ("rm $B/icutz/icutz44l.dat", ADD, "$B/icutz/icutz44l.dat is missing or no file: $AGAIN",
     "$LEAVES"),
    ("mv $B/icutz/icutz44{l,b}.dat", "kestrel; rm tz_latest",
     "$B has schema 44b, and the system copy has 44l: $RUN, and remove $S/tz_latest", "$LEAVES"),
    ("ln -sf ../+VERSION $B/zoneinfo/Asia/Tokyo", ADD, "$B/zoneinfo/Japan is not whole: $AGAIN",
     "$B/zoneinfo/Asia/Tokyo is not whole: $AGAIN",
     "the local zone Asia/Tokyo is not whole in the active copy: $AGAIN"),
    ("ln -sfn Etc $B/zoneinfo/Japan", ADD, "$B/zoneinfo/Japan is missing: $AGAIN"),
    ("mv $B/icutz /tmp/out; ln -s /tmp/out $B/icutz; : >/tmp/out/metaZones.res", ADD,
     "$B/icutz $LEADS_OUT: $AGAIN"),
    # Modes.
    ("chmod 705 $B", "chmod a+rX $B", "not everyone can read $B: chmod a+rX it"),
    ("chmod 644 $B/zoneinfo/Etc", "chmod a+rX $B/zoneinfo/Etc",
     "not everyone can read $B/zoneinfo/Etc: chmod a+rX it"),
    ("chmod 600 $B/icutz/icutz44l.dat", "chmod 644 $B/icutz/icutz44l.dat; kestrel",
     "not everyone can read $B/icutz/icutz44l.dat: chmod a+rX it", "$LEAVES"),
    ("kestrelctl back; chmod 711 tz", "chmod a+rX tz",
     "not everyone can read $S/tz: chmod a+rX it"),
    ("chmod 711 $B/zoneinfo/Asia", "chmod 755 $B/zoneinfo/Asia",
     "not everyone can read $B/zoneinfo/Asia: chmod a+rX it"),
    ("mkdir $B/icutz/x; mv $B/icutz/*.res $B/icutz/x; "
     "cd $B/icutz; ln -s x/* .; chmod 600 x/metaZones.res", "chmod a+rX $B/icutz/x/metaZones.res",
     "not everyone can read $B/icutz/x/metaZones.res: chmod a+rX it"),
    # The links to the active copy.
    ("cp -r $B tz/x; ln -sfn $S/tz/x/zoneinfo zoneinfo", "kestrel",
     "$S/tz/x has a name that is no version: $RUN", "$RETURNS"),
    ("kestrelctl back; ln -sfn $B/icutz icutz", "kestrelctl back",
     "$S/icutz is not that of the active copy: kestrelctl back"),
    ("kestrelctl back; mkdir icutz", "rmdir icutz",
     "$S/icutz is no link: remove it, and kestrelctl back"),
    ("ln -sfn $S/tz/2026c/zoneinfo zoneinfo", "kestrel; kestrel", "$S/tz/2026c is missing: $RUN",
     "$LEAVES"),
    ("for i in {1..37}; do ln -s L$((i+1)) $B/zoneinfo/L$i; done; ln -s Japan $B/zoneinfo/L38", ADD,
     "$B/zoneinfo/L1 $LEADS_OUT: $AGAIN", "$B/zoneinfo/L2 $LEADS_OUT: $AGAIN"),
    ("rm -r $B", "kestrel; rm tz_latest", "$B is missing: $RUN, and remove $S/tz_latest",
     "$LEAVES"),
    ("ln -sfn $B/icutz zoneinfo", "kestrelctl back 2026b.1.0",
     "$S/zoneinfo leads to $B/icutz, which no program expects: kestrelctl back 2026b.1.0"),
    ("rm zoneinfo", "kestrel", "$S/zoneinfo is missing: $RUN", "$RETURNS"),
    ("rm zoneinfo; mkdir zoneinfo", "rmdir zoneinfo; kestrel",
     "$S/zoneinfo is no link: remove it, and $RUN", "$FAILS"),
    ("rm icutz", "kestrelctl back 2026b.1.0",
     "$S/icutz is not that of the active copy: kestrelctl back 2026b.1.0"),
    ("ln -s $B/icutz icutz.new; rm icutz; mkdir icutz", "rmdir icutz; kestrel",
     "$S/icutz is no link: remove it, and kestrelctl back 2026b.1.0",
     "$S/icutz.new is of a run that was killed: $RUN", "$LEAVES"),
    ("ln -s $B/icutz icutz.new", "kestrelctl back 2026b.1.0",
     "$S/icutz.new is of a run that was killed: $RUN"),
    # The newest download.
    ("cp -r $B tz/2026c; echo 2026c >tz/2026c/zoneinfo/+VERSION; rm tz/2026c/zoneinfo/tz*;"
     "ln -sfn $S/tz/2026c tz_latest",
     "kestrel", "the next run of kestrel switches to $S/tz/2026c: $RUN"),
    ("ln -sfn $S/tz/ tz_latest", "rm tz_latest",
     "$S/tz_latest leads to $S/tz/, $NO_PATH", "$LEAVES"),
    ("mkdir -pm 700 /tmp/closed; ln -sfn $S/tz/../../../../tmp/closed tz_latest", "rm tz_latest",
     "$S/tz_latest names ../../../../tmp/closed, which is no version: remove $S/tz_latest"),
    ("mkdir tz/2147483648a; ln -sfn $S/tz/2147483648a tz_latest", "rm -r tz_latest tz/21*",
     "$S/tz_latest names 2147483648a, which is no version: remove $S/tz_latest", "$LEAVES"),
    ("ln -sfn $S/tz/2026$LONG tz_latest", "rm tz_latest",
     "$S/tz/2026$LONG, the newest download, is missing: remove $S/tz_latest"),
    ("rm tz_latest; mkdir tz_latest", "rmdir tz_latest", "$S/tz_latest is no link: remove it",
     "$LEAVES"),
    ("ln -sfn ../timezone/tz/2026b.1.0 tz_latest", "rm tz_latest",
     "$S/tz_latest leads to ../timezone/tz/2026b.1.0, $NO_PATH", "$LEAVES"),
    ("mkdir -p tz/2026c/icutz; : >tz/2026c/icutz/icutz44b.dat; ln -sfn $S/tz/2026c tz_latest",
     "rm tz_latest",
     "$S/tz/2026c has schema 44b, and the system copy has 44l: remove $S/tz_latest"),
    ("cp -r $B tz/2026c; truncate -s 9 tz/2026c/zoneinfo/Etc/UTC; ln -sfn $S/tz/2026c tz_latest",
     "rm tz_latest", "$S/tz/2026c/zoneinfo/Etc/UTC is not whole: remove $S/tz_latest",
     "$S/tz/2026c/zoneinfo/+VERSION is of release 2026b, not 2026c: remove $S/tz_latest",
     "$S/tz/2026c/zoneinfo/tzdata.zi is of release 2026b, not 2026c: remove $S/tz_latest",
     "the next run of kestrel switches to $S/tz/2026c: see the other lines"),
    # The local zone.
    ("ln -sfn $S/zoneinfo/localtime localtime", "kestrelctl zone Asia/Tokyo",
     "the local zone localtime is not whole in the active copy: kestrelctl zone NAME"),
    ("ln -sfn /usr/share/zoneinfo/Asia/Tokyo localtime", "kestrel",
     "$S/localtime leads to /usr/share/zoneinfo/Asia/Tokyo, not into $S/zoneinfo: "
     "kestrelctl zone NAME"),
    ("rm localtime", "kestrelctl zone Asia/Tokyo", "$S/localtime is missing: kestrelctl zone NAME"),
    ("rm localtime; mkdir localtime", "rmdir localtime; kestrelctl zone Asia/Tokyo",
     "$S/localtime is no link: remove it, and kestrelctl zone NAME"),
    ("mkdir -pm 700 /tmp/closed; : >/tmp/closed/z; "
     "ln -sfn $S/zoneinfo/../../../../../../tmp/closed/z localtime",
     "kestrelctl zone Asia/Tokyo", "not everyone can read /tmp/closed: chmod a+rX it"),
    # The image.
    ("mv $A /tmp/gone", "mv /tmp/gone $A", "$A is missing: repair the image"),
    ("kestrelctl back; echo x >$A/+VERSION", "echo 2026a >$A/+VERSION",
     "$A/+VERSION does not name a release such as 2026b: repair the image"),
    ("chmod 700 $A", "chmod a+rX $A", "not everyone can read $A: chmod a+rX it"),
    ("ln -sfn /x /etc/localtime", "ln -sfn $S/localtime /etc/localtime",
     "/etc/localtime does not lead to $S/localtime: ln -sfn $S/localtime /etc/localtime"),
    ("kestrelctl back; truncate -s 9 $A/Asia/Tokyo", "cp $B/zoneinfo/Asia/Tokyo $A/Asia",
     "$A/Asia/Tokyo is not whole: repair the image",
     "the local zone Asia/Tokyo is not whole in the active copy: kestrelctl zone NAME"),
    ("ln -sfn /usr/share /usr/share/zoneinfo", "ln -sfn $S/zoneinfo /usr/share/zoneinfo",
     "/usr/share/zoneinfo does not lead to $S/zoneinfo: ln -sfn $S/zoneinfo /usr/share/zoneinfo"),
    ("rm /usr/share/zoneinfo; mkdir /usr/share/zoneinfo",
     "rmdir /usr/share/zoneinfo; ln -sfn $S/zoneinfo /usr/share/zoneinfo",
     "/usr/share/zoneinfo does not lead to $S/zoneinfo: "
     "remove it, and ln -sfn $S/zoneinfo /usr/share/zoneinfo"),
    ("echo 2026c >$A/+VERSION", "kestrel",
     "$B is older than the system copy, 2026c.1.0: $RUN, and remove $S/tz_latest", "$LEAVES"),
    ("echo 2147483648a >$A/+VERSION", "echo 2026a >$A/+VERSION",
     "$A/+VERSION does not name a release such as 2026b: repair the image", "$FAILS"),
    ("rm $A/+VERSION", "echo 2026a >$A/+VERSION",
     "$A/+VERSION is missing, empty or unreadable: repair the image"),
    ("rm /usr/share/icu/*", "echo 44l >/usr/share/icu/icutzformat.txt",
     "/usr/share/icu/icutzformat.txt is missing, empty or unreadable: repair the image", "$LEAVES"),
    ("echo 44 >/usr/share/icu/icutzformat.txt", "echo 44l >/usr/share/icu/icutzformat.txt",
     "/usr/share/icu/icutzformat.txt does not name a schema such as 44l: repair the image",
     "$LEAVES"),
    # The storage.
    ("mv $S $S.old", "mv $S.old $S", "$S/ is missing or no directory: make it one",
     "$S/tz/ is missing or no directory: make it one", "$S/zoneinfo is missing: $RUN",
     "$S/localtime is missing: kestrelctl zone NAME", "$FAILS", "$S/ $IMMUTABLE"),
    ("rm -r tz", "mkdir tz; kestrel; rm tz_latest",
     "$S/tz/ is missing or no directory: make it one",
     "$B is missing: $RUN, and remove $S/tz_latest", "$LEAVES"),
    ("mkdir withdrawn", "rmdir withdrawn", "$S/withdrawn cannot be read: remove it"),
    ("ln -s /usr /var/db/icutz", "rm ../icutz", "/var/db/icutz is of an older system: remove it"),
    ("mkdir /var/db/icu", "rmdir ../icu", "/var/db/icu is of an older system: remove it"),
    ("ln -s /usr /var/db/icu", "rm ../icu", "/var/db/icu is of an older system: remove it"),
], ids=lambda row: row[0])
def test_status(row):
    damage, cure, *lines = row
    publish("2026b")
    Path("/tmp/big").write_bytes(bundle(">"))
    sh(damage)
    said = ctl("status")
    assert said[1] == 1 and lines_of(said[0]) == wanted(lines)
    assert ("active: none" in said[0]) == (f"{STORAGE}/zoneinfo is " in said[0])
    sh(cure)
    assert well() is True


# What looks odd and is no fault.
def test_what_is_well():
    publish("2026b")
    sh("cd $B; rm zoneinfo/localtime $A/Etc/UTC; echo x >zoneinfo/tzdata.zi;"
       "ln -s Etc/./../Asia/ zoneinfo/Area; ln -s Area/../Japan zoneinfo/New;"
       "yes | head -c 2M >zoneinfo/zone.tab; ln -s zone.tab zoneinfo/old.tab;"
       "ln -s metaZones.res icutz/other; mkdir icutz/more; : >icutz/more/x; chmod 600 icutz/more/x;"
       "cp zoneinfo/Etc/UTC /usr/share/x; ln -s /usr/share/x zoneinfo/Own; cp -P zoneinfo/Own $A;"
       "mkdir -p /var/db/icu/kept -m 700 ../other; : >../2026a; : >../../withdrawn;"
       "ln -sfn ../var/db/timezone/localtime /etc/localtime;"
       "ln -sfn ../../var/db/timezone/zoneinfo /usr/share/zoneinfo")
    assert well() is True


@pytest.mark.parametrize("close, reopen", [("chattr +i .", "chattr -i ."),
                                           ("chattr +a .", "chattr -a ."),
                                           (f"{REMOUNT},ro /var", f"{REMOUNT},rw /var")])
def test_storage_that_cannot_change(close, reopen):
    publish("2026b")
    if sh(f"ln -s $B/icutz icutz.new; {close}").returncode:
        pytest.skip("this file system, or this user, cannot")
    said = ctl("status")
    sh(reopen)
    assert lines_of(said[0]) == wanted([
        "$S/icutz.new is of a run that was killed: $RUN", "$FAILS", "$S/ $IMMUTABLE"])


def test_what_status_prints():
    publish("2026b", "2026c")
    ctl("back 2026b.1.0")
    fetch("2026e", STORAGE / "tz/2026e.1.0")
    sh("ln -sfn $S/tz/2026e.1.0 tz_latest; rm localtime; echo 2026d.1.0 >>withdrawn")
    assert ctl("status") == (
        "active: 2026b.1.0\nzoneinfo: /var/db/timezone/tz/2026b.1.0/zoneinfo\n"
        "system: 2026a.1.0\nschema: 44l\nnewest: 2026e.1.0\n"
        "next run: switches to /var/db/timezone/tz/2026e.1.0\nzone: none\n"
        "last switch: 2026b.1.0_2026c.1.0\ndownloads: 2026b.1.0 2026c.1.0 2026e.1.0\n"
        "withdrawn: 2026c.1.0 2026d.1.0\n"
        "kestrelctl: /var/db/timezone/localtime is missing: kestrelctl zone NAME\n"
        "kestrelctl: the next run of kestrel switches to /var/db/timezone/tz/2026e.1.0: "
        "see the other lines\n", 1)


# Another user is told what he cannot read, and nothing that he cannot know.
@several_users
@pytest.mark.parametrize("closed", ["$S/tz", "$B", "$B/zoneinfo", "$B/icutz", "$A", "$A/+VERSION",
                                    "$B/zoneinfo/Asia", "$B/zoneinfo/Asia/Tokyo",
                                    "/usr/share/icu/icutzformat.txt", "$S/tz/2026c"])
def test_status_of_another_user(closed):
    publish("2026b")
    sh("mkdir -m 700 /var/db/icu; : >/var/db/icu/in_use; cd $B/zoneinfo; mkdir Asia/Old;"
       "cp Etc/UTC Asia/Old; ln -s Asia/Old/UTC Old")
    if closed in ("$S/tz/2026c", "$B/icutz"):
        sh("cp -r $B tz/2026c; ln -sfn $S/tz/2026c tz_latest")
    path = os.path.expandvars(closed)
    os.chmod(path, 0o700)
    another = ["setpriv", "--reuid=4321", "--clear-groups"]
    line = wanted([f"not everyone can read {closed}: chmod a+rX it"])
    said = ctl("status", *another)
    assert lines_of(said[0]) == line and said[1] == 1
    assert ("next run" in said[0]) == ("downloads" in said[0]) == ("/Asia" in closed)
    os.chmod(path, 0o755)
    # An access list that keeps out that user alone.
    entries = ((1, 7, -1), (2, 0, 4321), (4, 5, -1), (16, 5, -1), (32, 5, -1))
    os.setxattr(path, "system.posix_acl_access",
                struct.pack("<I", 2) + b"".join(struct.pack("<HHi", *entry) for entry in entries))
    lines = lines_of(ctl("status", *another)[0])
    assert "/Asia" in closed or lines and all(f"everyone can read {path}" in line for line in lines)


# Why a command changes nothing, after a shell's command on a device that reads 2026c and has 2026b.
@pytest.mark.parametrize("row", [
    ("", "back 2026z.1.0", 4, "$S/tz/2026z.1.0 is missing"),
    ("mv $B/icutz/icutz44{l,b}.dat; rm -r $B/zoneinfo", "back 2026b.1.0", 4,
     "$B has schema 44b, and the system copy has 44l"),
    ("rm /usr/share/icu/*", "back 2026b.1.0", 4,
     "/usr/share/icu/icutzformat.txt is missing, empty or unreadable: repair the image"),
    ("echo 2026d >$A/+VERSION", "back 2026b.1.0", 4,
     "$B is older than the system copy, 2026d.1.0"),
    ("rm $B/zoneinfo/Etc/UTC", "back 2026b.1.0", 4, "$B/zoneinfo/Etc/UTC is missing"),
    ("ln -sfn $S/zoneinfo/New localtime", "back", 4, "$A has not the local zone, New"),
    ("echo 2147483648a >$A/+VERSION", "back", 4,
     "$A/+VERSION does not name a release such as 2026b: repair the image"),
    ("rm icutz; mkdir icutz", "back 2026b.1.0", 1,
     "$S/icutz is no link: remove it, and kestrelctl back 2026c.1.0"),
    ("rm tz_latest; mkdir tz_latest", "back", 1, "$S/tz_latest is no link: remove it"),
    ("mkdir withdrawn", "publish 2026d.1.0 DIR", 1, "$S/withdrawn cannot be read: remove it"),
    ("rm $A/+VERSION", "publish 2026d.1.0 DIR", 1,
     "$A/+VERSION is missing, empty or unreadable: repair the image"),
    ("chmod 700 tz", "publish 2026d.1.0 DIR", 1, "not everyone can read $S/tz: chmod a+rX it"),
    ("rm icutz; mkdir icutz", "prune", 1,
     "$S/icutz is no link: remove it, and kestrelctl back 2026c.1.0"),
    ("mkdir withdrawn", "prune", 1, "$S/withdrawn cannot be read: remove it"),
    ("ln -sfn $S/tz zoneinfo", "zone Etc/UTC", 1,
     "$S/zoneinfo leads to $S/tz, which is no copy: $RUN",
     "the next run of kestrel switches to $S/tz/2026c.1.0: see the other lines"),
    ("ln -sfn $S/tz/2026c.1.0/icutz zoneinfo", "zone Etc/UTC", 4,
     "Etc/UTC is no whole zone of the active copy"),
    ("rm localtime; mkdir localtime", "zone Etc/UTC", 1, "$S/localtime is no link: remove it"),
    ("chmod 711 $S/tz/2026c.1.0/zoneinfo/Etc/UTC", "zone Etc/UTC", 4,
     "not everyone can read $S/tz/2026c.1.0/zoneinfo/Etc/UTC: chmod a+rX it"),
], ids=lambda row: f"{row[0]} | {row[1]}")
def test_refusals(row):
    damage, command, status, *lines = row
    publish("2026b", "2026c")
    fetch("2026d")
    sh(f"cp tz/2026c.1.0/zoneinfo/{{Etc/UTC,New}}; {damage}")
    before = found()
    said = ctl(command)
    assert (lines_of(said[0]), said[1], found()) == (wanted(lines), status, before)


# What is withdrawn on the way back from 2026c, while 2026d waits or not.
@pytest.mark.parametrize("waits, version, withdrawn", [
    (False, "", "2026c.1.0"), (False, "2026b.1.0", "2026c.1.0"), (False, "2026c.1.0", "none"),
    (True, "", "2026c.1.0 2026d.1.0"), (True, "2026b.1.0", "2026c.1.0 2026d.1.0"),
    (True, "2026c.1.0", "2026d.1.0"), (True, "2026d.1.0", "none")])
def test_withdrawal(waits, version, withdrawn):
    publish("2026b", "2026c")
    fetch("2026d", STORAGE / "tz/2026d.1.0")
    sh("ln -sfn $S/tz/2026d.1.0 tz_latest" if waits else "")
    assert ctl(f"back {version}") == (f"{version or '2026a.1.0'} is active\n", 0)
    assert f"withdrawn: {withdrawn}\n" in ctl("status")[0] and well() is True


# Where the list cannot be written, the way back goes on, and says what a downloader will do.
def test_withdrawal_that_fails():
    publish("2026b", "2026c")
    ctl("back 2026b.1.0")
    sh("echo 2026a >>withdrawn; mkdir -p withdrawn.new/x")
    reason = "/var/db/timezone/withdrawn.new: File exists\n"
    assert ctl("back 2026c.1.0") == ("2026c.1.0 is active\n"
                                     f"kestrelctl: 2026c.1.0 is still withdrawn: {reason}", 0)
    sh("rm withdrawn")
    assert ctl("back 2026b.1.0") == (
        "2026b.1.0 is active\nkestrelctl: 2026c.1.0 is not withdrawn, and a downloader may "
        f"publish it again: {reason}", 0)
    sh("mkdir withdrawn")
    assert ctl("back 2026b.1.0") == ("2026b.1.0 is active\nkestrelctl: "
                                     "/var/db/timezone/withdrawn cannot be read: remove it\n", 0)


def test_publishing_in_place():
    fetch("2026b", STORAGE / "tz/2026b.1.0")
    sh("chmod -R go= tz/2026b.1.0; mkdir /var/db/icu; : >/var/db/icu/kept")
    there = ctl("publish 2026b.1.0 /var/db/timezone/tz/2026b.1.0", *STRICTLY)
    assert there == ("2026b.1.0 is active\n", 0) and well() is True
    fetch("2026c", STORAGE / "tz/2026d.1.0")
    assert ctl("publish 2026d.1.0 /var/db/timezone/tz/2026d.1.0")[1] == 4
    sh("mv tz/2026d.1.0 /tmp/moved; ln -s /tmp/moved tz/2026c.1.0")
    publish("2026c")
    assert not (STORAGE / "tz/2026c.1.0").is_symlink()


# Before each call that changes something, a command is killed, or the call fails, once or for good.
# Then a reader finds the local zone, a failure is no success, and the same command completes the
# work and removes what was left. A version that could not be withdrawn is said.
CHANGING = r"(mkdir|symlink|rename|unlink|sync|fsync)|sendfile|openat.*O_CREAT|write\(\d+, \"\w"


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
    tracer = [*TRACER, *quickly, "-e"]
    calls = "trace=/^(mkdir|symlink|rename|unlink|sync|fsync|sendfile|open|write)"
    assert ctl(line, *tracer, calls)[1] == 0
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
            said = ctl(line, *tracer, f"trace={name}", "-e", f"inject={name}:{fault}")
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
    if sh(f"{REMOUNT},{limit} /var").returncode:
        pytest.skip("only root can remount")
    ended = ctl(line)
    sh(f"{REMOUNT},nr_inodes=1000000,size=50% /var")
    assert ended[1] == 0 and said in ended[0], ended
    assert ("is not withdrawn" in ended[0]) == line.startswith("back"), ended
    assert well() is True


def test_no_room_to_publish():
    publish("2026b")
    fetch("2026c")
    if sh(f"{REMOUNT},nr_inodes=$(($(df --output=iused /var | tail -n 1))) /var").returncode:
        pytest.skip("only root can remount")
    before = found()
    said = ctl("publish 2026c.1.0 DIR")
    sh(f"{REMOUNT},nr_inodes=1000000 /var")
    assert said[0].endswith("there is no room: kestrelctl prune makes some\n") and said[1] == 5
    assert found() == before


def test_prune():
    publish("2026b", "2026c", "2026d")
    sh("ln -s x tz_latest.new; : >withdrawn.new; cp -r tz/2026b.1.0 tz/2025z.1.0;"
       "mkdir -p tz/.kestrelctl tz/lost+found tz/2026e;"
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
    sh("rm localtime")
    assert ctl("publish 2026b.1.0 DIR")[1] == 0


@several_users
def test_system_copy_that_the_owner_cannot_read():
    publish("2026b")
    sh("chown -hR 1234:1234 .; chmod 600 /usr/share/zoneinfo.default/+VERSION")
    for line in ("back", "prune", "publish 2026b.1.0 DIR"):
        said = ctl(line)
        assert said[1] == 1 and "not everyone can read /usr/share/zoneinfo.default/+V" in said[0]
    sh("chmod 644 $A/+VERSION; chmod 700 $A/Asia")
    assert ctl("back 2026b.1.0") == ("2026b.1.0 is active\n", 0) and well() is True
    assert lines_of(ctl("back")[0]) == wanted(["$A has not the local zone, Asia/Tokyo"])


@several_users
def test_storage_of_another_user():
    sh("chown -hR 1234:5678 . $F")
    assert ctl("publish 2026b.1.0 DIR") == ("2026b.1.0 is active\n", 0)
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
    os.chmod(FETCHED, 0o700)
    said = ctl("publish 2026f.1.0 DIR", *AS_OWNER)
    assert said == ("kestrelctl: /tmp/fetched: Permission denied\n", 1)
    said = ctl("prune", "setpriv", "--reuid=4321", "--clear-groups")
    assert said[1] == 1 and "/var/db/timezone/ cannot be changed: Permission denied" in said[0]
    sh("chmod u-w tz")
    assert ctl("prune") == ("kestrelctl: /var/db/timezone/tz/ cannot be changed: "
                            "Permission denied\n", 1)
    sh("chmod u+w tz; mkdir -p tz/2025y/x tz/.kestrelctl/x")
    said = ctl("prune", *AS_OWNER)
    assert said[1] == 1 and "tz/2025y cannot be removed: Permission denied" in said[0]
    assert "/.kestrelctl" not in said[0]
    assert ctl("publish 2026f.1.0 DIR", *AS_OWNER) == (
        "kestrelctl: /var/db/timezone/tz/.kestrelctl: File exists\n", 1)
    for line in ("status", "prune"):
        ctl(line, *TRACER)
        assert re.search(r"setgroups\(0, NULL\) += 0\nsetresgid\(-1, 5678, -1\) += 0\n"
                         r"setresuid\(-1, 1234, -1\) += 0", TRACE.read_text())


# A lower version while a newer one waits for its run; the owner's storage may be open to a group.
@several_users
def test_a_download_that_waits():
    sh("chown -hR 1234 .; chmod g+w . tz")
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
    (FETCHED / "zoneinfo/Far").symlink_to("Asia")
    ctl("publish 2026b.1.0 DIR")
    before = found()
    for line in ("publish 2026b.1.0 DIR", "back 2026b.1.0", "zone Asia/Tokyo", "prune"):
        assert ctl(line)[1] == 0 and found() == before, line


# Where the disk fails to read, once, a command says so and does not take it for something else.
@pytest.mark.parametrize("line", ["status", "publish 2026d.1.0 DIR", "back 2026b.1.0", "prune",
                                  "zone Etc/UTC"])
def test_failed_reads(line):
    publish("2026b", "2026c")
    fetch("2026d")
    sh("cp -r tz/2026b.1.0 tz/2025z.1.0; rm -rf /tmp/db; cp -a /var/db /tmp/db")
    tracer = [*TRACER, "-f", "--seccomp-bpf", "-e"]
    undisturbed, left = ctl(line, *tracer, "trace=/^openat|getdents|^read|stat", "-y"), lasting()
    seen, kinds_seen = Counter(), set()
    for call in re.findall(r"(?m)^\d+ +(\w+\(.*)", TRACE.read_text()):
        name, kind = call.split("(")[0], re.sub(r"\d+\w?|\{.*|=.*|Asia|Tokyo|Etc|UTC", "", call)
        seen[name] += 1
        if not re.search("/var/db|/tmp/fetched", call) or kind in kinds_seen:
            continue
        kinds_seen.add(kind)
        if len(kinds_seen) % 3:
            continue  # every third one, to save time
        sh("rm -rf /var/db/*; cp -a /tmp/db/. /var/db")
        failing = f"inject={name}:error=EIO:when={seen[name]}"
        said = ctl(line, *tracer, f"trace={name}", "-e", failing)
        # The run that publish starts is disturbed, too, and speaks for itself.
        is_told = re.search("Input/output error|cannot be read|kestrel: ", said[0])
        assert (said, lasting()) == (undisturbed, left) or is_told and (
            said[1] == 1 or re.search("withdrawn|kestrel: ", said[0])), (call, said)
        for version, cure in re.findall(r"tz/(\S+) cannot be read: .*: (.*)", said[0]):
            assert (cure == "remove it") == (version != "2026c.1.0"), (call, said)
        assert {"2026b.1.0", "2026c.1.0"} <= set(os.listdir(STORAGE / "tz")), call


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
    sh("chmod g+w $B/zoneinfo/Etc/UTC; echo 2026b.1.0 >withdrawn")
    fetch("2026b")
    for change in ("echo more >zoneinfo/more", "rm -r zoneinfo/more icutz/*.dat",
                   "touch icutz/icutz44l.dat; cp --remove-destination zoneinfo/{Asia/Tokyo,Japan}",
                   "ln -sf Etc/UTC zoneinfo/Japan"):
        subprocess.run(["bash", "-c", change], cwd=FETCHED, check=True)
        said = ctl("publish 2026b.1.0 DIR")
        assert said[1] == 4 and "has other content" in said[0]
    for place in ("zoneinfo/Etc/UTC", "zoneinfo/Etc", "icutz"):
        sh(f"chmod g+w $B/{place}")
        publish("2026b")
        assert os.stat(STORAGE / "tz/2026b.1.0" / place).st_mode & 0o020 == 0


# A link stays where its replacement fails, whatever the reason.
def test_no_link_is_lost():
    publish("2026b", "2026c")
    for line in ("zone Etc/UTC", "back 2026b.1.0", "back"):
        for failing in ("rename", "symlink", "symlink:when=2+", "symlink:when=3+"):
            done = ctl(line, *TRACER, "-e", f"inject={failing}:error=EIO")[1] == 0
            assert (STORAGE / "localtime").exists() and (STORAGE / "zoneinfo").exists(), line
            assert done or (STORAGE / "icutz").exists() and (STORAGE / "tz_latest").exists(), line


# The first run has to go back, the second one switches.
def test_publishing_beside_a_copy_of_another_schema():
    fetch("2099z", STORAGE / "tz/2099z.1.0")
    sh("cd tz/2099z.1.0; mv icutz/icutz44{l,b}.dat; ln -sfn $PWD/zoneinfo $PWD/icutz ../..;"
       "ln -sfn $PWD ../../tz_latest")
    for release in ("2026b", "2026c"):
        fetch(release)
        said = ctl(f"publish {release}.1.0 DIR")
        assert said[0].startswith(f"{release}.1.0 is active\n") and said[1] == 0
        sh("ln -sfn $S/tz/2147483648a/zoneinfo zoneinfo")  # which is no version


def test_many_faults():
    sh("touch $F/zoneinfo/empty{1..20}")
    assert ctl("publish 2026b.1.0 DIR")[0].count("\n") == 20
    sh("touch $F/zoneinfo/more{1..10}")
    said = ctl("publish 2026b.1.0 DIR")
    assert said[0].count("\n") == 21 and said[0].endswith("kestrelctl: 10 more lines like these\n")


# The data is on the disk before its name is, and the name before the run.
def test_order_of_writes():
    written = r'(?:sync|rename).*timezone(\S*)[>"]\) += 0'
    ctl("publish 2026b.1.0 DIR", *TRACER, "-fy")
    assert re.findall(written, TRACE.read_text()) == [
        "/tz", "/tz/2026b.1.0", "/tz", "/tz_latest", "", "/zoneinfo", "/icutz"]
    for call in re.findall(r"openat\(.*(?:/db/|/fetched).*", TRACE.read_text()):
        assert "O_CLOEXEC" in call and ("openat(AT_FDCWD" in call or "O_NOFOLLOW" in call and
                                        re.search("O_DIRECTORY|O_NONBLOCK|O_EXCL", call)), call
    ctl("zone Etc/UTC", *TRACER, "-y")
    assert re.findall(written, TRACE.read_text()) == ["/localtime", ""]
    publish("2026c")
    ctl("back 2026b.1.0", *TRACER, "-y")
    assert re.findall(written, TRACE.read_text()) == [
        "/withdrawn.new", "/withdrawn", "", "/tz_latest", "/zoneinfo", "/icutz", ""]


def test_the_run():
    alone = ["env", "PATH=/usr/bin", "bash", "-c",
             f'exec -a /nowhere/kestrelctl {shutil.which("kestrelctl")} "${{@:2}}"', "bash"]
    for before, line in (
            (alone, "kestrel is neither beside kestrelctl nor in the PATH: install it"),
            ([*TRACER, "-e", "inject=/^clone:error=EAGAIN"],
             "no process can be started: Resource temporarily unavailable")):
        said = ctl("publish 2026b.1.0 DIR", *before)
        assert said[1] == 1 and lines_of(said[0]) == wanted([
            line, "2026b.1.0 is not active: see the next lines",
            "the next run of kestrel switches to $B: $RUN"])
    sh("mkdir -p /run/systemd/system /tmp/bin")
    for what_it_does, status in (("", 1), ("kestrel", 0)):
        Path("/tmp/bin/systemctl").write_text(f"#!/bin/sh\necho $@ >>/tmp/asked\n{what_it_does}")
        os.chmod("/tmp/bin/systemctl", 0o755)
        said = ctl("publish 2026b.1.0 DIR", "env", "PATH=/tmp/bin:" + os.environ["PATH"])
        assert said[1] == status, said
    os.rmdir("/run/systemd/system")
    assert Path("/tmp/asked").read_text() == 3 * "start kestrel.service\n"


@pytest.mark.parametrize("name", ["Asia/Seoul", "Asia", "", "/etc/passwd", "Asia/../Japan", "..",
                                  "./Japan", "Japan/", "localtime", "Etc/UTC\n", "+VERSION",
                                  "/tmp/machine/share/zoneinfo/Asia/Tokyo"])
def test_no_zone(name):
    before = found()
    said = subprocess.run(["kestrelctl", "zone", name], capture_output=True, text=True, check=False)
    assert said.returncode == 4 and "is no whole zone of the active copy" in said.stderr
    assert found() == before


# What a command says of a call that fails, and nothing of what it has complained of before.
@pytest.mark.parametrize("row", [
    ("zone Etc/UTC", "symlink:error=ENOSPC", 5, "$STAGED: No space left on device", "$NO_ROOM"),
    ("back", "symlink:error=EDQUOT", 5, "$UNSWITCHED: Disk quota exceeded", "$NO_ROOM"),
    ("zone Etc/UTC", "symlink:error=EROFS", 1, "$S/localtime.new: Read-only file system"),
    ("zone Etc/UTC", "symlink:error=EEXIST:when=1..2", 0),
    ("zone Etc/UTC", "rename:error=EEXIST", 0),
    ("zone Etc/UTC", "rename:error=EIO", 1, "$S/localtime: Input/output error"),
    ("zone Asia/Tokyo", "syncfs:error=EIO", 1, "$S/: Input/output error"),
    ("zone Asia/Tokyo", "syncfs:error=ENOSPC", 5, "$S/: No space left on device", "$NO_ROOM"),
    ("back", "unlink:error=EIO", 1, "remove: could not remove $S/tz_latest: Input/output error"),
    ("back", "unlink:error=EIO:when=4", 1, "2026a.1.0 is not active: see the next lines",
     "remove: could not remove $S/icutz: Input/output error",
     "unlink of ICU softlink failed: Input/output error",
     "$S/icutz is not that of the active copy: kestrelctl back"),
    ("prune", "flock:error=ENOLCK", 1, "$S/tz/: No locks available"),
    ("prune", "unlinkat:error=EPERM", 1, "$S/tz/2025z cannot be removed: Operation not permitted"),
    ("status", "openat:error=EIO -P /var/db/icu -P $B/zoneinfo/Etc/UTC", 1,
     "$B cannot be read: $B/zoneinfo/Etc/UTC: Input/output error: $AGAIN",
     "$S/tz_latest names x, which is no version: remove $S/tz_latest",
     "the device cannot be read: /var/db/icu: Input/output error"),
    ("publish 2026b.1.0 DIR", "openat:error=EIO:when=1 -P $B/zoneinfo/Etc/UTC", 0),
    ("publish 2026b.1.0 DIR", "renameat2:error=EIO", 1, "$B: Input/output error"),
    ("publish 2026b.1.0 DIR", "renameat2:error=EINVAL", 1, "$IN_STEPS"),
    ("publish 2026b.1.0 DIR", "renameat2:error=ENOSYS", 1, "$IN_STEPS"),
], ids=lambda row: f"{row[0]} | {row[1]}")
def test_failed_calls(row):
    line, failing, status, *lines = row
    publish("2026b")
    damage = {"publish": "truncate -s 99 $B/zoneinfo/Etc/UTC", "zone": "rm tz_latest; : >tz_latest"}
    sh(damage.get(line.split()[0], "mkdir -p tz/2025z/x ../icu/x; ln -sfn $S/tz/x tz_latest"))
    said = ctl(line, *TRACER, "-e", *os.path.expandvars(f"inject={failing}").split())
    assert (said[1], lines_of(said[0])) == (status, wanted(lines))


@several_users
@pytest.mark.parametrize("call", ["setgroups", "setresgid", "setresuid"])
def test_rights_that_cannot_be_given_up(call):
    sh("chown 1234 . tz")
    said = ctl("prune", *TRACER, "-e", f"inject=/^{call}:error=EPERM")
    assert said == ("kestrelctl: /var/db/timezone/: Operation not permitted\n", 1)


def test_signals():
    publish("2026b")
    fetch("2026c")
    assert sh("{ sleep .1; kestrelctl status; } | true; exit ${PIPESTATUS[0]}").returncode == 1
    assert sh("ulimit -f 0; kestrelctl publish 2026c.1.0 /tmp/fetched").returncode == 1
    assert well() is True


def test_usage():
    for line in ("", "stat", "status x", "publish 2026b.1.0", "publish 2026b.1.0 DIR x", "back x",
                 "back 2026b 2026c", "prune x", "zone", "zone a b"):
        said = ctl(line)
        assert said[1] == 2 and said[0].startswith("kestrelctl: "), line
    assert ctl("--help") == ("usage: kestrelctl status | publish VERSION DIRECTORY | "
                             "back [VERSION] | prune | zone NAME\n", 0)
    assert re.fullmatch(r"kestrelctl \d\S+\n", ctl("--version")[0])
    full = sh("kestrelctl --version >/dev/full")
    assert (full.returncode, full.stderr) == (1, b"kestrelctl: standard output cannot be written\n")

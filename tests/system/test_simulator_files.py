"""The files of a handset from outside: links of the handset lead where they lead in it."""

import os
from pathlib import Path

import pytest

from amt_simulator import Handset, HandsetError
from amt_simulator.files import HandsetFiles
from amt_simulator.root import build_root


@pytest.fixture
def files(tmp_path: Path) -> HandsetFiles:
    """The files of a handset that is not up."""
    directory = tmp_path / "handset"
    directory.mkdir()
    build_root(directory)
    made = HandsetFiles()
    made.attach(directory)
    return made


@pytest.fixture
def secret(tmp_path: Path) -> Path:
    """A file of the PC that no handset may reach."""
    path = tmp_path / "secret"
    path.write_text("secret")
    return path


def test_a_link_out_of_the_handset_is_not_followed(files: HandsetFiles, secret: Path) -> None:
    """Neither as the last name nor on the way, absolute or by way of the parents."""
    amt = files.path("/amt")
    (amt / "absolute").symlink_to(secret)
    (amt / "relative").symlink_to("../" * 30 + str(secret).lstrip("/"))
    (amt / "way").symlink_to(secret.parent)
    for inside in ("/amt/absolute", "/amt/relative", "/amt/way/secret"):
        with pytest.raises(FileNotFoundError):
            files.read(inside)
    files.place("/amt/absolute", "mine")
    files.place("/amt/way/made/secret", "mine too")
    assert secret.read_text() == "secret"
    assert not (secret.parent / "made").exists()
    assert files.text("/amt/absolute") == "mine"
    assert files.text(f"{secret.parent}/made/secret") == files.text("/amt/way/made/secret")


def test_links_lead_where_they_lead_in_the_handset(files: HandsetFiles) -> None:
    """Against its root, through what is mounted there, in whatever order."""
    files.place("/amt/real/imei.txt", "123")
    files.place("/handset/answers/ldt_btCtrl", "-1\n")
    files.path("/data/link").symlink_to("/amt/real")
    files.path("/data/up").symlink_to("../amt/./real/../real")
    files.path("/data/state").symlink_to("/handset/answers/ldt_btCtrl")
    files.path("/data/battery").symlink_to("../proc/driver")
    files.place("/proc/driver/sarvo_battery", "1")
    assert files.text("/data/link/imei.txt") == files.text("/data/up/imei.txt") == "123"
    assert files.text("/data/state") == "-1\n"
    assert files.text("/data/battery/sarvo_battery") == "1"
    assert files.path("/data/up/imei.txt") == files.path("/amt/real/imei.txt")
    assert files.path("/data/link").is_symlink()
    assert files.path("/amt/../../data/./x") == files.path("/data/x")


@pytest.mark.parametrize("inside", ["/data/sh", "/data/proc/status", "/bin/sh", "/proc", "/dev/x",
                                    "/proc/drivers", "/usr", "/storage/sdcard1/x"])
def test_what_is_only_inside_is_told(files: HandsetFiles, inside: str) -> None:
    """Also at the end of a link."""
    files.path("/data/sh").symlink_to("/usr/bin/sh")
    files.path("/data/proc").symlink_to("/proc/1")
    with pytest.raises(HandsetError, match="exists only inside the handset"):
        files.read(inside)


def test_links_in_a_circle_end(files: HandsetFiles) -> None:
    """With the kernel's own words."""
    files.path("/data/a").symlink_to("b")
    files.path("/data/b").symlink_to("/data/a")
    with pytest.raises(OSError, match="Too many levels"):
        files.read("/data/a")


def test_only_plain_files_are_read(files: HandsetFiles) -> None:
    """Nothing waits for the other end of a pipe."""
    os.mkfifo(files.path("/data/pipe"))
    with pytest.raises(HandsetError, match="/data/pipe is no plain file"):
        files.read("/data/pipe")
    with pytest.raises(IsADirectoryError):
        files.read("/data")


def test_a_file_replaces_what_stood_there(files: HandsetFiles) -> None:
    """A directory with all in it, a link, a file; nothing of the making is left."""
    files.place("/amt/x/y/z", "1")
    files.place("/amt/x", "2")
    files.path("/amt/link").symlink_to("x")
    files.place("/amt/link", ("3", 0o755))
    assert (files.text("/amt/x"), files.text("/amt/link")) == ("2", "3")
    assert files.path("/amt/link").stat().st_mode & 0o777 == 0o755
    files.place("/amt/x", None)
    files.place("/amt/no/such", None)
    assert os.listdir(files.path("/amt")) == ["link"]
    with pytest.raises(HandsetError, match="no place for a file"):
        files.place("/amt/..", "4")


def test_a_file_of_the_pc_that_is_not_there(files: HandsetFiles, tmp_path: Path) -> None:
    """It is told with both names, and nothing is placed."""
    with pytest.raises(HandsetError, match=r"cannot place .*/none as /amt/x: No such file"):
        files.place("/amt/x", tmp_path / "none")
    with pytest.raises(HandsetError, match="cannot place .*: Is a directory"):
        files.place("/amt/x", tmp_path)
    assert os.listdir(files.path("/amt")) == []


def test_a_link_that_the_handset_lays_while_it_is_up(fake: Handset, secret: Path) -> None:
    """Its log, its records and its files are read from the handset or not at all."""
    assert fake.run(["/bin/sh", "-c", f"""
        cd /handset && rm -r calls.txt properties log.txt &&
        ln -s {secret} calls.txt && ln -s {secret.parent} properties && ln -s {secret} log.txt
        """]).status == 0
    with pytest.raises(FileNotFoundError):
        fake.calls()
    assert fake.get_property("secret") is None
    fake.set_property("secret", "mine")
    assert secret.read_text() == "secret"
    assert fake.log.records() == []
    assert "secret" not in fake.log.tail()

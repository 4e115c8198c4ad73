"""Archives whose bytes depend on nothing but the names and contents of their files."""

import gzip
import io
import tarfile
from dataclasses import dataclass
from pathlib import Path
from typing import Iterable

from tools.package.source import epoch


@dataclass(frozen=True)
class Member:
    """A file of an archive."""

    name: str
    content: bytes
    mode: int = 0o644
    user: tuple[int, str] = (0, "root")
    group: tuple[int, str] = (0, "root")

    def header(self) -> tarfile.TarInfo:
        """What the archive says of it."""
        info = tarfile.TarInfo(self.name)
        info.size, info.mode, info.mtime = len(self.content), self.mode, epoch()
        info.uid, info.uname = self.user
        info.gid, info.gname = self.group
        return info


def write(path: Path, members: Iterable[Member]) -> None:
    """Write a compressed archive, its members in the order of their names."""
    plain = io.BytesIO()
    with tarfile.open(fileobj=plain, mode="w", format=tarfile.PAX_FORMAT) as archive:
        for member in sorted(members, key=lambda member: member.name):
            archive.addfile(member.header(), io.BytesIO(member.content))
    path.write_bytes(gzip.compress(plain.getvalue(), 9, mtime=epoch()))


def written_again(source: Path, target: Path) -> None:
    """Write the files of an archive that somebody else has made without their time and owner."""
    with tarfile.open(source) as archive:
        members = []
        for info in archive:
            stream = archive.extractfile(info)
            if stream is not None:
                members.append(Member(info.name, stream.read(), 0o755 if info.mode & 1 else 0o644))
    write(target, members)

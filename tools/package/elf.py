"""What a program or library says of where it can run."""

import re
from pathlib import Path
from typing import IO, Iterable

from elftools.common.exceptions import ELFError
from elftools.elf.dynamic import DynamicSection
from elftools.elf.elffile import ELFFile
from elftools.elf.gnuversions import GNUVerNeedSection

from tools.package.source import PackageFailed

# Libraries that every system with the GNU C library has in a version that is old enough.
EVERYWHERE = re.compile(r"(lib(c|m|dl|pthread|rt)\.so\.\d|ld-linux\S*|libz\.so\.1|"
                        r"lib(stdc\+\+\.so\.6|gcc_s\.so\.1))")
VERSION = re.compile(r"GLIBC_(\d+)\.(\d+)")
# The C++ library may be as old as the C library that is asked for: GCC 11's stands beside 2.34.
NEWEST_CXX = {"GLIBCXX": (3, 4, 29), "CXXABI": (1, 3, 13)}
MACHINES = {"EM_X86_64": "x86_64", "EM_AARCH64": "aarch64", "EM_ARM": "arm", "EM_386": "i686"}


def _open(stream: IO[bytes], path: Path) -> ELFFile:
    try:
        return ELFFile(stream)
    except ELFError:
        raise PackageFailed(f"{path} is neither a program nor a library") from None


def machine(path: Path) -> str:
    """The machine that a program is for."""
    with open(path, "rb") as stream:
        name = str(_open(stream, path)["e_machine"])
    return MACHINES.get(name, name.removeprefix("EM_").lower())


def libraries(path: Path) -> list[str]:
    """The libraries that are loaded with a program, by name."""
    with open(path, "rb") as stream:
        sections = _open(stream, path).iter_sections()
        return [tag.needed for section in sections if isinstance(section, DynamicSection)
                for tag in section.iter_tags() if tag.entry.d_tag == "DT_NEEDED"]


def versions(path: Path) -> list[str]:
    """The versions of interfaces that a program needs, such as GLIBC_2.34."""
    with open(path, "rb") as stream:
        sections = _open(stream, path).iter_sections()
        return [used.name for section in sections if isinstance(section, GNUVerNeedSection)
                for _, names in section.iter_versions() for used in names]


def interpreter(path: Path) -> str:
    """The loader that a program asks for; each C library has its own."""
    with open(path, "rb") as stream:
        for segment in _open(stream, path).iter_segments("PT_INTERP"):
            return str(segment.get_interp_name())
    return ""


def _check_cxx(path: Path, version: str) -> None:
    name, _, numbers = version.partition("_")
    newest = NEWEST_CXX.get(name)
    if newest and tuple(int(number) for number in numbers.split(".")) > newest:
        raise PackageFailed(f"{path.name} needs {version}, which older systems lack")


def platform_tag(paths: Iterable[Path]) -> str:
    """The wheel's tag for files of one machine: the oldest C library with which all of them run."""
    files = list(paths)
    own = {path.name for path in files}
    newest, machines = (2, 17), set()
    for path in files:
        foreign = [name for name in libraries(path)
                   if name not in own and not EVERYWHERE.fullmatch(name)]
        if foreign:
            raise PackageFailed(f"{path.name} needs {', '.join(foreign)}, which not every system "
                                "has")
        for version in versions(path):
            _check_cxx(path, version)
            match = VERSION.fullmatch(version)
            if match:
                newest = max(newest, (int(match[1]), int(match[2])))
        machines.add(machine(path))
    if len(machines) != 1:
        raise PackageFailed(f"files for different machines: {', '.join(sorted(machines))}")
    return f"manylinux_{newest[0]}_{newest[1]}_{machines.pop()}"

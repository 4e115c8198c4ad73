"""What the handset's own files say: its init file and its sample configuration."""

from dataclasses import dataclass
from functools import lru_cache
from pathlib import Path

from amt_simulator.errors import HandsetError

# In the tree, links to the files that ship.
PLATFORM = Path(__file__).with_name("platform")
INIT_FILE = "vx-kel-amt.rc"
CONFIG_FILE = "vx-kel-amt.cfg"


@dataclass
class ServiceEntry:
    """A service of the init file."""

    argv: list[str]
    # Not started again when it has ended.
    oneshot: bool = False
    # Not started at boot, but by a trigger.
    disabled: bool = False


def parse_services(text: str) -> dict[str, ServiceEntry]:
    """The services of an init file; everything else in it is passed over."""
    services: dict[str, ServiceEntry] = {}
    current: ServiceEntry | None = None
    for line in text.splitlines():
        words = line.split("#", 1)[0].split()
        if not words:
            continue
        if words[0] == "service":
            current = services[words[1]] = ServiceEntry(words[2:])
        elif not line[0].isspace():
            current = None
        elif current and words[0] in ("oneshot", "disabled"):
            setattr(current, words[0], True)
    return services


def parse_config(text: str) -> dict[str, str]:
    """The settings of a configuration file, in order."""
    settings = {}
    for line in text.splitlines():
        key, equals, value = line.partition("=")
        if equals and not line.lstrip().startswith("#"):
            settings[key.strip()] = value.strip()
    return settings


def _read(name: str) -> str:
    try:
        return (PLATFORM / name).read_text("utf-8")
    except OSError as error:
        raise HandsetError(f"cannot read {PLATFORM / name}: {error.strerror}") from None


def service_entry(name: str) -> ServiceEntry:
    """The service NAME as the handset's init file has it."""
    services = parse_services(_read(INIT_FILE))
    if name not in services:
        raise HandsetError(f"{PLATFORM / INIT_FILE} has no service {name}")
    return services[name]


@lru_cache(maxsize=1)
def sample_config() -> dict[str, str]:
    """The usual configuration."""
    return parse_config(_read(CONFIG_FILE))

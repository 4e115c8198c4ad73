"""What has arrived at the daemon and was not read yet."""

from amt_simulator import Handset

# What a terminal holds for its reader at most; more waits in front of it.
TERMINAL_SIZE = 4095

# Runs inside the handset: only there the daemon's descriptors can be borrowed. The largest number
# of bytes that wait on one of its terminals.
_COUNT = """
import array, ctypes, fcntl, os, sys, termios

SYS_PIDFD_GETFD = 438
libc = ctypes.CDLL(None, use_errno=True)
process = os.pidfd_open(int(sys.argv[1]))
most = 0
for number in sys.argv[2:]:
    borrowed = libc.syscall(SYS_PIDFD_GETFD, process, int(number), 0)
    if borrowed < 0:
        sys.exit(f"descriptor {number}: {os.strerror(ctypes.get_errno())}")
    count = array.array("i", [0])
    fcntl.ioctl(borrowed, termios.FIONREAD, count)
    most = max(most, count[0])
print(most)
"""
_TERMINALS = ("/dev/pts/", "/dev/ptmx")


def arrived(handset: Handset) -> int:
    """The bytes that the daemon would get if it read the fullest of its terminals."""
    info = handset.inspect()
    terminals = [str(number) for number, path in info.descriptors.items()
                 if path.startswith(_TERMINALS)]
    assert terminals, info.descriptors
    done = handset.run(["/usr/bin/python3", "-S", "-c", _COUNT, str(info.pid), *terminals])
    assert done.status == 0, done
    return int(done.stdout)

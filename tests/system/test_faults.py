"""A platform library that faults: on a worker's thread, and in the end itself."""

import signal
from pathlib import Path

import pytest

from amt_simulator import Handset
from conftest import HandsetFactory
from support.channels import PcChannel, integer
from support.replaced_cutils import replace_cutils
from support.trace import TAG, Trace

FAULT = "/handset/fault"
KINDS = pytest.mark.parametrize("kind, number", [("null", signal.SIGSEGV),
                                                 ("beyond", signal.SIGBUS)])


def start(make_handset: HandsetFactory, folder: Path, path: str) -> Handset:
    """A handset whose library of properties faults when it is told to."""
    handset = make_handset(path, ready=False, start=False, restart=False)
    if handset.program.sanitizer == "tsan":
        pytest.skip("a fault is treated where it happens, and the sanitizer forbids most calls "
                    "there")
    replace_cutils(handset, folder, "faulting_properties")
    handset.start()
    handset.wait_ready()
    return handset


@KINDS
def test_fault_of_a_request_ends_the_process(make_handset: HandsetFactory, tmp_path: Path,
                                             kind: str, number: signal.Signals) -> None:
    handset = start(make_handset, tmp_path, "pc")
    trace = Trace(handset)
    handset.place(FAULT, kind)
    PcChannel(handset).send_packet(45, integer(19, 16))
    assert handset.wait_exit() == 0
    trace.expect("signal_treatment()", f"receive signal: {number.value} - {number.name}",
                 "amt_deinit_resource()", "amt_handle_deinit()")
    assert trace.texts().count("signal_treatment()") == 1


@KINDS
def test_fault_of_the_end_ends_it_at_once(make_handset: HandsetFactory, tmp_path: Path,
                                          kind: str, number: signal.Signals) -> None:
    handset = start(make_handset, tmp_path, "usb-inserted")
    handset.place(FAULT, kind)
    handset.signal(signal.SIGTERM)
    assert handset.wait_exit() == 0
    texts = handset.log.texts(TAG)
    assert "receive signal: 15 - SIGTERM" in texts
    assert f"receive signal: {number.value} - {number.name}" not in texts

"""The camera: previews (139, 147) and its self-test (180), as the driver of its node sees them."""

import pytest

from conftest import HandsetFactory
from support.channels import AppChannel, integer, raw
from support.handler import (BUSY, INVALID, IO_ERROR, NO_DEVICE, NO_ENTRY, HandlerTrace,
                             device_error, done, refused)
from support.trace import Wanted

PREVIEW, SECOND_PREVIEW, PREVIEW_HANDLER = 139, 147, "amt_device_camera"
TEST, TEST_HANDLER = 180, "amt_device_camera_control"
STATE = "/handset/devices/camera"
NODE = "/dev/video0"
INPUT_CALL = "ioctl(video0, VIDIOC_S_INPUT, 1) = "


def ioctl_failure(handler: str, errno: int) -> list[Wanted]:
    """The lines of a request that the driver refuses."""
    return [device_error(handler, -100, errno), f"sys call: ioctl() failed! errno = {errno}"]


def remove_node(app: AppChannel) -> None:
    """Take the camera away."""
    assert app.handset.run(["/usr/bin/rm", NODE]).status == 0


def descriptors(app: AppChannel) -> list[int]:
    """The daemon's open descriptors."""
    return sorted(app.handset.inspect().descriptors)


# preview


def test_previews(app: AppChannel) -> None:
    before = descriptors(app)
    for command, value in ((PREVIEW, 1), (SECOND_PREVIEW, 0), (PREVIEW, 1), (PREVIEW, 1)):
        trace = HandlerTrace(app.handset)
        assert app.request(command) == done(command)
        trace.expect_handler(PREVIEW_HANDLER)
        assert trace.calls() == [f"ioctl(video0, SARVOCAM_IOCTL_PREVIEW, {value}) = 0"]
        assert f"preview = {value}\n" in app.handset.text(STATE)
    assert descriptors(app) == before


def test_preview_that_the_driver_answers(app: AppChannel) -> None:
    # Whatever is no error is a success.
    app.handset.answer("SARVOCAM_IOCTL_PREVIEW", "5")
    assert app.request(PREVIEW) == done(PREVIEW)


@pytest.mark.parametrize("command", [PREVIEW, SECOND_PREVIEW])
def test_preview_fails(app: AppChannel, command: int) -> None:
    before = descriptors(app)
    for name, errno in (("EIO", IO_ERROR), ("ENODEV", NO_DEVICE), ("EBUSY", BUSY)):
        app.handset.answer("SARVOCAM_IOCTL_PREVIEW", f"-1 {name}")
        trace = HandlerTrace(app.handset)
        refused(app, command)
        trace.expect_handler(PREVIEW_HANDLER, *ioctl_failure(PREVIEW_HANDLER, errno))
    assert descriptors(app) == before
    remove_node(app)
    trace = HandlerTrace(app.handset)
    refused(app, command)
    trace.expect_handler(PREVIEW_HANDLER, device_error(PREVIEW_HANDLER, -100, NO_ENTRY))
    assert trace.calls() == []


# self-test


def test_self_test(app: AppChannel) -> None:
    before = descriptors(app)
    for answer, result in ((None, 0), ("1", 1), ("2147483647", 0x7FFFFFFF), ("0", 0), ("3", 3)):
        app.handset.answer("SARVOCAM_IOCTL_SELF_TEST", *([answer] if answer else []))
        for control, value in ((1, 0), (2, 1)):
            trace = HandlerTrace(app.handset)
            assert app.request(TEST, integer(112, control)) == done(TEST, integer(113, result))
            # The conversion is none of this C library's: it stands in the text as it is.
            trace.expect_handler(TEST_HANDLER, "control_id = %D", f"update result: {result}")
            assert trace.calls() == [
                INPUT_CALL + "0", f"ioctl(video0, SARVOCAM_IOCTL_SELF_TEST, {value}) = {result}"]
            assert f"self_test = {value}\n" in app.handset.text(STATE)
            assert "input = 1\n" in app.handset.text(STATE)
    assert descriptors(app) == before


@pytest.mark.parametrize("control", [1, 2])
def test_camera_without_the_input(app: AppChannel, control: int) -> None:
    app.handset.answer("VIDIOC_S_INPUT", "-1 ENODEV")
    trace = HandlerTrace(app.handset)
    assert app.request(TEST, integer(112, control)) == done(TEST, integer(113, 3))
    trace.expect_handler(TEST_HANDLER, "control_id = %D", "update result: 3")
    assert trace.calls() == [INPUT_CALL + "-1 ENODEV"]


def test_self_test_fails(app: AppChannel) -> None:
    before = descriptors(app)
    for name, errno in (("EINVAL", INVALID), ("EIO", IO_ERROR), ("EBUSY", BUSY)):
        app.handset.answer("VIDIOC_S_INPUT", f"-1 {name}")
        trace = HandlerTrace(app.handset)
        refused(app, TEST, integer(112, 1))
        trace.expect_handler(TEST_HANDLER, "control_id = %D", *ioctl_failure(TEST_HANDLER, errno))
        assert trace.calls() == [INPUT_CALL + f"-1 {name}"]
    app.handset.answer("VIDIOC_S_INPUT")
    # A missing device is a verdict of the selection only.
    for name, errno in (("ENODEV", NO_DEVICE), ("EIO", IO_ERROR)):
        app.handset.answer("SARVOCAM_IOCTL_SELF_TEST", f"-1 {name}")
        trace = HandlerTrace(app.handset)
        refused(app, TEST, integer(112, 2))
        trace.expect_handler(TEST_HANDLER, "control_id = %D", *ioctl_failure(TEST_HANDLER, errno))
        assert trace.calls() == [INPUT_CALL + "0",
                                 f"ioctl(video0, SARVOCAM_IOCTL_SELF_TEST, 1) = -1 {name}"]
    assert descriptors(app) == before


def test_self_test_without_a_camera(app: AppChannel) -> None:
    remove_node(app)
    trace = HandlerTrace(app.handset)
    refused(app, TEST, integer(112, 1))
    trace.expect_handler(TEST_HANDLER, "control_id = %D",
                         device_error(TEST_HANDLER, -100, NO_ENTRY),
                         "sys call: open() failed! errno = 2")
    assert trace.calls() == []


def test_other_controls_do_not_touch_the_camera(app: AppChannel) -> None:
    remove_node(app)
    for atoms, control in (((), 0), ((integer(112, 0),), 0), ((integer(112, 3),), 3),
                           ((integer(112, -1),), -1), ((integer(112, 0x101),), 0x101),
                           ((raw(112, b""),), 0)):
        trace = HandlerTrace(app.handset)
        refused(app, TEST, *atoms)
        trace.expect_handler(TEST_HANDLER, "control_id = %D", device_error(TEST_HANDLER, -100),
                             f"invalid control_id: {control}")
        assert trace.calls() == []


def test_camera_on_the_wire(make_handset: HandsetFactory) -> None:
    app = AppChannel(make_handset("packet", answers={"SARVOCAM_IOCTL_SELF_TEST": "258"}))
    app.send(bytes.fromhex("0f00bbb40900" "ee70010400" "02000000"))
    assert app.line.read_exactly(24) == bytes.fromhex(
        "1800bbb51200" "ee71010400" "02010000" "ee01010400" "00000000")
    app.send(bytes.fromhex("0600bb930000"))
    assert app.line.read_exactly(15) == bytes.fromhex("0f00bb940900" "ee01010400" "00000000")

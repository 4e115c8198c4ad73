"""The whole way once: daemon, lines, modem and files of a handset together."""

from support.channels import AppChannel, PcChannel, string


def test_identity_write_through_the_modem(pc: PcChannel) -> None:
    """A station's IMEI write is answered by the modem and found in its file."""
    pc.at("AT^DCGSNW=860123456789012", "\r\nOK\r\n")
    pc.handset.wait_file("/amt/imei.txt", "860123456789012")


def test_board_number_from_the_modem(app: AppChannel) -> None:
    """An app's request is answered by the modem's table."""
    assert string(38, "KEL0000000000001") in app.request(85).atoms

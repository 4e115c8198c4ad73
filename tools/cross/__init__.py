"""The daemon for 32-bit Arm under emulation: `./dev cross`."""

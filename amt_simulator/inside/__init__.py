"""What runs inside the simulated handset: its init, its lines, its modem.

These modules use the standard library only and are copied into each handset, so a change of the
sources never disturbs a handset that is up.
"""

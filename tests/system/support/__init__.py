"""Helpers that the system tests share."""

"""Handsets, lines and codec that share nothing with the library, so that a shared mistake cannot cancel itself."""

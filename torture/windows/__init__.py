"""The 32-bit DLL under Wine, as if it were in this process."""

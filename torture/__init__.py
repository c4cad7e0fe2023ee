"""Programs that try to make the library break its promises, against handsets of their own."""

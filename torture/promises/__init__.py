"""One module for a promise; docs/promises.md says what each means."""

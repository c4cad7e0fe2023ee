"""torture [PROMISE...]: tries to break the promises, and prints what came of it."""
from __future__ import annotations

import sys

from torture.runner import main

sys.exit(main(sys.argv[1:]))

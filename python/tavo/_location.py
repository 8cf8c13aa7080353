"""Finds the library and the command relative to this package.

The two constants are the paths in a wheel. cmake --install replaces them.
"""

import os

_TO_LIBRARY = "lib/libtavo.so.1"
_TO_COMMAND = "bin/tavo"

_here = os.path.dirname(os.path.abspath(__file__))
LIBRARY = os.path.normpath(os.path.join(_here, _TO_LIBRARY))
COMMAND = os.path.normpath(os.path.join(_here, _TO_COMMAND))

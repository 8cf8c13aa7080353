"""Finds the library and the command relative to this package.

_TO_LIBRARY and _TO_COMMAND are the paths in a wheel. cmake --install installs a copy with other paths.
"""

import os

_TO_LIBRARY = "lib/libtavo.so.1"
_TO_COMMAND = "bin/tavo"

_here = os.path.dirname(os.path.abspath(__file__))
LIBRARY = os.path.normpath(os.path.join(_here, _TO_LIBRARY))
COMMAND = os.path.normpath(os.path.join(_here, _TO_COMMAND))

"""python3 -m tavo: the command tavo."""

import os
import sys

from ._location import COMMAND

os.execv(COMMAND, ["tavo", *sys.argv[1:]])

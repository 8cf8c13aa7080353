"""Runs the tavo command: python3 -m tavo."""

import os
import sys
from typing import NoReturn

from ._location import COMMAND


def main() -> NoReturn:
    os.execv(COMMAND, ["tavo", *sys.argv[1:]])


if __name__ == "__main__":
    main()

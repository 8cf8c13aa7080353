"""Writes samples to a file in memory, which the library can open."""

from __future__ import annotations

import contextlib
import os
import struct
from typing import Any, Iterator, Union

import numpy as np
import numpy.typing as npt

Samples = Union["npt.NDArray[np.floating[Any]]", "npt.NDArray[np.int16]"]
_HEADER = struct.Struct("<4sI4s4sIHHIIHH4sI")  # of a WAV file with one "fmt " and one "data" chunk
_MAX_BYTES = 0xFFFFFFFF - _HEADER.size


def to_mono(samples: Samples) -> npt.NDArray[np.int16]:
    """Returns the mean of the channels as 16-bit samples. Floats are clipped to full scale, 1.0.

    samples: shape (n,) or (n, channels), floating-point or int16. For two int16 channels, the result is
    bit-identical to the downmix that the library makes of the same channels in a file.
    """
    array: npt.NDArray[Any] = np.asarray(samples)
    if array.ndim not in (1, 2) or array.size == 0:
        raise ValueError(f"samples must have the shape (n,) or (n, channels), not {array.shape}")
    if array.dtype == np.int16:
        if array.ndim == 1:
            return array
        array = np.trunc(array.mean(axis=1, dtype=np.float64))
        return array.astype(np.int16)
    if not np.issubdtype(array.dtype, np.floating):
        raise ValueError(f"samples must be floating-point or int16, not {array.dtype}")
    if array.ndim == 2:
        array = array.mean(axis=1, dtype=np.float64)
    if not np.isfinite(array).all():
        raise ValueError("samples must be finite")
    array = np.clip(np.rint(array * 32768.0), -32768, 32767)
    return array.astype(np.int16)


@contextlib.contextmanager
def memory_file(mono: npt.NDArray[np.int16], rate: int) -> Iterator[bytes]:
    """Yields the path of a WAV file in memory, which exists during the with block."""
    data = mono.astype("<i2").tobytes()
    if len(data) > _MAX_BYTES:
        raise ValueError(f"samples must be at most {_MAX_BYTES // 2} for each channel, not {len(mono)}")
    descriptor = os.memfd_create("tavo")
    with os.fdopen(descriptor, "wb") as file:
        file.write(_HEADER.pack(b"RIFF", _HEADER.size - 8 + len(data), b"WAVE", b"fmt ", 16, 1, 1, rate, 2 * rate, 2,
                                16, b"data", len(data)))
        file.write(data)
        file.flush()
        yield b"/proc/self/fd/%d" % descriptor

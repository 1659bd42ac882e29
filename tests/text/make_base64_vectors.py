#!/usr/bin/env python3
"""Writes Base64 reference data with Python's own codec into the folder given as argument.

base64_vectors.txt: one line per case, "<hex of the bytes> <base64 text>" (the text may be
empty): several random inputs of every length from 0 to 64, NUL bytes frequent.
base64_large.bin / base64_large.b64: a few MiB of random bytes and their encoding.
"""
import base64
import os
import random
import sys

out = sys.argv[1]
rng = random.Random(20261206)


def random_bytes(n):
    # One byte in four is NUL so that every length meets embedded zeros.
    return bytes(0 if rng.random() < 0.25 else rng.randrange(256) for _ in range(n))


os.makedirs(out, exist_ok=True)
with open(os.path.join(out, "base64_vectors.txt"), "w", newline="\n") as f:
    for length in range(65):
        for _ in range(8):
            data = random_bytes(length)
            f.write("%s %s\n" % (data.hex(), base64.b64encode(data).decode("ascii")))

large = rng.randbytes(3 * 1024 * 1024 + 2)
with open(os.path.join(out, "base64_large.bin"), "wb") as f:
    f.write(large)
with open(os.path.join(out, "base64_large.b64"), "wb") as f:
    f.write(base64.b64encode(large))

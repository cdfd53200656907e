#!/usr/bin/env python3
# Copyright (C) 2026 The vyrservice Authors
# SPDX-License-Identifier: Apache-2.0

"""Writes the seed corpus of fuzz_binder_frames: one valid input of each kind."""
import os
import struct
import sys

MAGIC = 0x42525956
HELLO, TRANSACTION, REPLY, RELEASE = 1, 2, 3, 4


def header(kind, code=0, flags=0, data=b"", table=b"", count=0, txn=1, target=0, parent=0,
           descriptors=0):
    return struct.pack("<8I3Q", MAGIC, kind, flags, code, len(data), count, len(table),
                       descriptors, txn, target, parent)


def string(s):
    raw = s.encode() + b"\0"
    raw += b"\0" * (-len(raw) % 4)
    return struct.pack("<i", len(s.encode())) + raw


def token():
    return struct.pack("<i", 0x56595254) + string("android.vyr.IVYRService")


def main(out):
    os.makedirs(out, exist_ok=True)
    hello = b"p1-0000000000000001"
    lookup = string("vyrservice")
    obj = struct.pack("<IIQ", 1, 20, 7) + b"android.vyr.IEventCallback\0\0"[:20]
    # Two descriptor entries: the marker, then the index in the parcel's table.
    descriptors = struct.pack("<iiii", 1, 0, 1, 1)
    seeds = {
        "wire_header": b"\0" + header(TRANSACTION, 1, data=b"\0" * 8) + b"\0" * 8,
        "wire_objects": b"\0" + header(TRANSACTION, count=1, table=obj) + obj,
        # A stream's first byte is how many descriptors come with it.
        "stream_hello_lookup": b"\1\0" + header(HELLO, data=hello) + hello
        + header(TRANSACTION, 1, data=lookup, target=0) + lookup,
        "stream_callback_object": b"\1\0" + header(TRANSACTION, 2,
                                                    data=struct.pack("<ii", 1, 0), table=obj,
                                                    count=1, target=5)
        + struct.pack("<ii", 1, 0) + obj,
        "stream_release": b"\1\0" + header(RELEASE, 1, target=3),
        "stream_descriptors": b"\1\2" + header(TRANSACTION, 1, data=descriptors, target=5,
                                               descriptors=2) + descriptors,
        "transact_open": b"\2\0" + struct.pack("<i", 3),
        "transact_configure": b"\2\7" + struct.pack("<iii", 1, 2, 5) + struct.pack("<ii", 9, 9),
        "transact_setcallback": b"\2\4" + struct.pack("<iii", 1, 1, 0),
        "reads_event": b"\3\4\12\12\12" + struct.pack("<iiiqffi", 1, 40, 3, 5, 1.0, 2.0, 2)
        + struct.pack("<ff", 0.5, 0.25),
        "reads_descriptors": b"\3\4\15\15\15" + descriptors + struct.pack("<i", 0),
    }
    for name, data in seeds.items():
        with open(os.path.join(out, name), "wb") as f:
            f.write(data)


if __name__ == "__main__":
    main(sys.argv[1] if len(sys.argv) > 1 else os.path.join(os.path.dirname(__file__), "..",
                                                            "corpus"))

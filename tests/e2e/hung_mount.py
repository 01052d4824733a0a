#!/usr/bin/python3
"""Mounts a file system whose daemon stops answering: hung_mount.py FD FOLDER [ANSWERS]

FD is an open /dev/fuse. The daemon takes every request, but answers only the first ANSWERS look-ups
(beside the greeting), with a folder or a file that is empty; then none, as one that hangs.
"""
import ctypes
import os
import struct
import sys

INIT, LOOKUP, GETATTR, OPENDIR, STATFS = 26, 1, 3, 27, 17


def attributes(node):
    # A folder: ino, size, blocks, three times and their parts, mode, links, owner.
    return struct.pack('<6Q10I', node, 0, 0, 0, 0, 0, 0, 0, 0, 0o40755, 2, 0, 0, 0, 4096, 0)


def answer(opcode, node):
    if opcode == INIT:
        return struct.pack('<4I2H2I2H8I', 7, 31, 65536, 0, 0, 0, 65536, 1, 0, 0, *[0] * 8)
    if opcode == GETATTR:
        return struct.pack('<QII', 0, 0, 0) + attributes(node)
    if opcode == STATFS:
        return struct.pack('<5Q4I6I', 1000, 500, 500, 10, 5, 4096, 255, 4096, 0, *[0] * 6)
    if opcode == OPENDIR:
        return struct.pack('<QII', 1, 0, 0)
    return b''


def main():
    fd, folder = int(sys.argv[1]), sys.argv[2]
    left = int(sys.argv[3]) if len(sys.argv) > 3 else 0
    options = f'fd={fd},rootmode=40000,user_id=0,group_id=0,allow_other'
    if ctypes.CDLL(None, use_errno=True).mount(b'hung', folder.encode(), b'fuse.glusterfs', 0,
                                               options.encode()):
        sys.exit(os.strerror(ctypes.get_errno()))
    print('mounted', flush=True)
    while request := os.read(fd, 1 << 17):
        _, opcode, unique, node = struct.unpack('<IIQQ', request[:24])
        if opcode != INIT:
            left -= 1
        if opcode == INIT or left >= 0:
            body = answer(opcode, node)
            os.write(fd, struct.pack('<IiQ', 16 + len(body), 0, unique) + body)


main()

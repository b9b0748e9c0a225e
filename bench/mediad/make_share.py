#!/usr/bin/env python3
"""Writes N tiny tagged MP3 files: one short MPEG frame sequence made by sox, behind an ID3v2.3 tag
of title, artist, album and genre written here. Usage: make_share.py TEMPLATE.mp3 DIR N [PER_DIR]"""
import os
import sys


def frame(frame_id, text):
    data = b"\x03" + text.encode("utf-8")  # encoding 3: UTF-8
    return frame_id.encode() + len(data).to_bytes(4, "big") + b"\x00\x00" + data


def syncsafe(n):
    return bytes([(n >> 21) & 0x7F, (n >> 14) & 0x7F, (n >> 7) & 0x7F, n & 0x7F])


def main():
    template, root, count = sys.argv[1], sys.argv[2], int(sys.argv[3])
    per_dir = int(sys.argv[4]) if len(sys.argv) > 4 else count
    audio = open(template, "rb").read()
    for n in range(count):
        folder = os.path.join(root, "Artist %d" % (n % 200), "Folder %d" % (n // per_dir))
        os.makedirs(folder, exist_ok=True)
        body = (frame("TIT2", "Title %d" % n) + frame("TPE1", "Artist %d" % (n % 200)) +
                frame("TALB", "Album %d" % (n % 1000)) + frame("TCON", "Genre %d" % (n % 20)) +
                frame("TRCK", str(n % 12 + 1)))
        tag = b"ID3\x03\x00\x00" + syncsafe(len(body)) + body
        with open(os.path.join(folder, "Track %d.mp3" % n), "wb") as out:
            out.write(tag + audio)


main()

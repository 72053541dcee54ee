"""Holds as many connections of nobody's to a socket of the daemon's as its arguments say, until it is killed. Half of them
have half a frame sent."""
import os
import pathlib
import socket
import sys
import time

crowd = []
os.seteuid(65534)
for number in range(int(sys.argv[1])):
    peer = socket.socket(socket.AF_UNIX)
    peer.connect("/run/quorvel/" + sys.argv[2])
    if number % 2:
        peer.send(b"\x01\x00\x00")
    crowd.append(peer)
os.seteuid(0)
pathlib.Path("crowd-stands").touch()
time.sleep(60)

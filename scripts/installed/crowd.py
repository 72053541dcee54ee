"""Holds as many connections as its argument says, half of them with half a frame sent, until it is killed."""
import pathlib
import socket
import sys
import time

crowd = []
for number in range(int(sys.argv[1])):
    peer = socket.socket(socket.AF_UNIX)
    peer.connect("/run/quorvel/com.Orvane.quorveld.sock")
    if number % 2:
        peer.send(b"\x01\x00\x00")
    crowd.append(peer)
pathlib.Path("crowd-stands").touch()
time.sleep(60)

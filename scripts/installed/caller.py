"""Calls the daemon all the time with a new client each, as an ordinary user, until the file "stop" is there."""
import os
import subprocess

answered = lost = refused = 0
while not os.path.exists("stop"):
    call = subprocess.run(["quorvelctl", "regulatory-images"], user=65534, group=65534, text=True,
                          stdout=subprocess.DEVNULL, stderr=subprocess.PIPE)
    if call.returncode in (0, 1):  # 1: nothing is provisioned
        answered += 1
    elif "connect" in call.stderr and "ended the connection" not in call.stderr:
        refused += 1
        print(call.stderr)
    else:
        lost += 1
        print(call.stderr)
print(f"{answered} answered, {lost} lost, {refused} refused")

"""Records a number for each arriving line, as an ordinary user, and answers with a line."""
import os

import brimhold

starts = brimhold.Scalar("com.example.starts")
seconds = brimhold.Distribution("com.example.seconds")
# Opened in both directions, pipes neither end nor lose what the other side has not read yet.
with open(os.open("/run/recorder/in", os.O_RDWR)) as lines, \
        open(os.open("/run/recorder/out", os.O_RDWR), "w", buffering=1) as answers:
    for line in lines:
        starts.add(int(line))
        seconds.record(int(line) / 2)
        answers.write("recorded\n")

"""Records a number for each line that arrives, as an ordinary user, and answers with a line."""
import brimhold

starts = brimhold.Scalar("com.example.starts")
seconds = brimhold.Distribution("com.example.seconds")
while True:
    with open("/run/recorder/in") as lines, open("/run/recorder/out", "w") as answers:
        for line in lines:
            starts.add(int(line))
            seconds.record(int(line) / 2)
            answers.write("recorded\n")

#!/usr/bin/env python3
import brimhold

brimhold.Scalar("com.example.starts").add()
brimhold.Distribution("com.example.seconds").record(2.5)

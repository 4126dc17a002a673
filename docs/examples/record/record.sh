#!/bin/sh
tavrelctl stat add com.example.starts 1
tavrelctl stat record com.example.seconds 2.5

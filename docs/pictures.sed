#!/bin/sed -Ef
# Makes a page of the built documents of a Markdown file: gives it a name, and inserts the pictures, which the build makes.
1s#^(\# .*)$#\1 {\#command_line}#
s#^<!-- picture ([a-z-]+\.png): (.*) -->$#![\2](\1)#

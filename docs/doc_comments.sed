#!/bin/sed -Ef
# Turns the headers' plain comments into those that Doxygen reads, each paragraph as it stands.
s#^( *)// *-{3,}.*$##
s#^( *)//( |$)#\1///\2#
s#^(.*[;,{})] *)// #\1///< #
s#^( */// ) +([a-zA-Z0-9_, ]*[a-zA-Z0-9_])  +([^ ])#\1  - \2: \3#

#!/bin/sh
# Each public header by itself, in the C++17 of a host, with more warnings than the build has and two compilers.
# Usage: public_headers.sh DIRECTORY...: include directories. A compiler that is missing is said and left out.
set -u
warnings="-Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wsign-conversion -Wold-style-cast -Wnon-virtual-dtor
    -Woverloaded-virtual -Wundef -Wcast-align -Wextra-semi -Werror"
includes= failed=0 headers=0
for directory; do
    includes="$includes -I$directory"
done
for compiler in g++ clang++; do
    command -v "$compiler" >/dev/null || { echo "without $compiler"; continue; }
    for directory; do
        for header in "$directory"/zuv_client_pro/*.h; do
            headers=$((headers + 1))
            # shellcheck disable=SC2086 # the options are words
            echo "#include <zuv_client_pro/$(basename "$header")>" |
                "$compiler" -std=c++17 -fsyntax-only -x c++ $warnings $includes - || failed=$((failed + 1))
        done
    done
done
echo "$headers compilations, $failed failed"
[ $headers -gt 0 ] && [ $failed -eq 0 ]

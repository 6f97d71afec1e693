#!/bin/sh
# Each public header by itself, in the C++17 of a host, with more warnings than the build has and two compilers; and all of
# them together in the other ways in which hosts are compiled.
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
    while read -r options; do
        headers=$((headers + 1))
        for directory; do
            for header in "$directory"/zuv_client_pro/*.h; do
                echo "#include <zuv_client_pro/$(basename "$header")>"
            done
        done | "$compiler" -fsyntax-only -x c++ $options $warnings $includes - ||
            { echo "$compiler $options"; failed=$((failed + 1)); }
    done <<END
-std=c++20
-std=c++2b
-std=c++17 -fno-exceptions
-std=c++17 -fno-rtti
-std=gnu++20 -fno-rtti -fno-exceptions -ffast-math -funsigned-char -D_FILE_OFFSET_BITS=64
END
done
echo "$headers compilations, $failed failed"
[ $headers -gt 0 ] && [ $failed -eq 0 ]

#!/bin/sh
# Ways to build other than our own: within another project, the library alone, with a generator from elsewhere, and an installation
# that comes too early. Little is compiled: what is looked at is what CMake makes of it. Usage: build_ways.sh TREE CONTRACT2CPP WORK
set -eu
tree=$1 generator=$2 work=$3
rm -rf "$work"
mkdir -p "$work/parent"
configure() { # folder, source, option...
    folder=$work/$1 source=$2
    shift 2
    cmake -G Ninja -S "$source" -B "$folder" "$@" >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }
}
without() { printf -- '-DCMAKE_DISABLE_FIND_PACKAGE_%s=ON ' "$@"; }
has() { ninja -C "$work/$1" -t targets all | grep -q "^$2:"; }
lacks() { # folder, target
    ! has "$@" || { echo "$1 has the target $2"; exit 1; }
}

# shellcheck disable=SC2046 # options are words
configure alone "$tree" -DZUV_BUILD_PROGRAMS=OFF -DZUV_BUILD_TESTS=OFF "-DZUV_CONTRACT2CPP=$generator" \
    $(without SQLite3 CLI11 nlohmann_json pugixml GTest)
has alone libzuv_client_pro.so
lacks alone zuv
echo "ok    the library alone wants OpenSSL and zlib, and with a generator from elsewhere nothing more"

cat >"$work/parent/CMakeLists.txt" <<'PARENT'
cmake_minimum_required(VERSION 3.22)
project(parent LANGUAGES CXX)
add_subdirectory(${ZUV_TREE} zuv)
add_executable(parent main.cpp)
target_link_libraries(parent PRIVATE zuv_client_pro::zuv_client_pro)
PARENT
echo '#include <zuv_client_pro/client.h>
int main() { return zuv::profile_client("http://localhost").endpoint().empty(); }' >"$work/parent/main.cpp"
configure within "$work/parent" "-DZUV_TREE=$tree" "-DZUV_CONTRACT2CPP=$generator" -DCMAKE_CXX_STANDARD=17
ninja -C "$work/within" CMakeFiles/parent.dir/main.cpp.o >"$work/log" || { cat "$work/log"; exit 1; }
lacks within zuv/zuv-service
if cmake -LA -N "$work/within" | grep -q '^CMAKE_BUILD_TYPE:STRING=..*'; then
    echo "the other project's build type was set"
    exit 1
fi
echo "ok    within another project: headers before their users, no programs, its own settings"

configure early "$tree" -DZUV_BUILD_TESTS=OFF
if DESTDIR=$work/root cmake --install "$work/early" --component tools >"$work/log" 2>&1; then exit 1; fi
grep -q "isn't built: first run cmake --build" "$work/log" || { cat "$work/log"; exit 1; }
echo "ok    an installation before the build says what to do"

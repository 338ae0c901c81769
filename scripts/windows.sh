#!/usr/bin/env bash
# The Windows builds: installs what is missing (Debian's mingw-w64 cross
# compilers with the posix thread model, widl, Wine and its IDL files,
# dpkg-dev for unpacking pugixml's source package), cross-builds the 32-bit
# shipping target into build-win-i686/ and the 64-bit one into
# build-win-x86_64/ (warnings are errors; DLLs and programs in bin/ of each),
# and runs the x86_64 test programs under Wine, the COM servers' among them
# (registration, clients, and the differential against the Linux build/). The i686 build (what ships,
# with the compile-time checks of the record layouts) is not run: this machine
# cannot run 32-bit Windows code.
set -euo pipefail
cd "$(dirname "$0")/.."
bash scripts/deps.sh g++-mingw-w64-i686-posix g++-mingw-w64-x86-64-posix mingw-w64-tools wine64 libwine-dev \
  dpkg-dev cmake make

jobs="$(nproc)"
build() {
  local arch="$1"; shift
  local start=$SECONDS
  cmake -S . -B "build-win-$arch" -DCMAKE_TOOLCHAIN_FILE="cmake/mingw-$arch.cmake" -DCMAKE_BUILD_TYPE=RelWithDebInfo \
        -DVARNEL_WERROR=ON "$@" >/dev/null
  cmake --build "build-win-$arch" -j"$jobs" >&2
  echo "== Windows $arch build: $((SECONDS - start)) s"
}

# The differential's Linux client, built in the Linux build folder, whose
# output the Windows client's under Wine must equal.
[ -f build/CMakeCache.txt ] || cmake -S . -B build -DVARNEL_WERROR=ON >/dev/null
cmake --build build -j"$jobs" --target com_differential >&2

build x86_64 -DVARNEL_LINUX_BUILD="$PWD/build"
# What ships, without the test programs (they cannot run here); one fetch of
# pugixml's source serves both builds.
build i686 -DVARNEL_BUILD_TESTS=OFF -DVARNEL_PUGIXML_SOURCE_DIR="$PWD/build-win-x86_64/debian-sources/pugixml"

start=$SECONDS
(cd build-win-x86_64 && ctest --output-on-failure --timeout 900)
echo "== Windows x86_64 tests under Wine: $((SECONDS - start)) s"

#!/bin/sh
# SPDX-License-Identifier: Apache-2.0
# scripts/builds --clean runs this in a minimal system with a compiler, beside the sources: what
# a handset has can be built without the libraries of the reader.
set -eux
CDPATH='' cd "$(dirname "$0")"
cmake -S . -B build >cmake.log
grep 'kestlog is left out' cmake.log
cmake --build build -j "$(nproc)" --target all >build.log || {
    cat build.log
    exit 1
}
[ ! -e build/kestlog ]
build/kestctl --version
mkdir root
KESTMODEM_ROOT=$PWD/root build/kestmodem 2>service.log || true  # it has no settings
grep 'kestmodem start' service.log

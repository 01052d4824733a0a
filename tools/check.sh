#!/bin/bash
# What must hold besides the tests: formatting, clang-tidy, a Clang build without warnings, and the
# tests under AddressSanitizer and UBSan. Needs the packages of tools/packages.sh (test.sh installs
# them) and clang, clang-format, clang-tidy.
set -euo pipefail
cd "$(dirname "$0")/.."

mapfile -t sources < <(git ls-files '*.cpp' '*.hpp' '*.h')
mapfile -t units < <(git ls-files 'src/*.cpp' 'platform/*.cpp' 'ctl/*.cpp' 'report_format/*.cpp')

echo "check: formatting"
clang-format --dry-run -Werror "${sources[@]}"

echo "check: Clang build"
cmake --preset clang >/dev/null
cmake --build --preset clang

echo "check: clang-tidy"
printf '%s\n' "${units[@]}" | xargs -P "$(nproc)" -n 4 clang-tidy -quiet -p build-clang

echo "check: tests with sanitizers"
cmake --preset asan >/dev/null
cmake --build --preset asan
ctest --preset asan --no-tests=error

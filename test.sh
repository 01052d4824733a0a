#!/bin/bash
# Builds the product with warnings as errors and runs all tests: test.sh [CTEST-OPTION...]
# Missing packages are installed first, as root or with sudo.
set -euo pipefail

root=$(realpath -- "$(dirname -- "$0")")
cd "$root"

# shellcheck source=tools/packages.sh
. tools/packages.sh
install_missing "${build_packages[@]}" "${test_packages[@]}"

# A later run without sudo must be able to write there.
# shellcheck disable=SC2317  # the trap calls it
give_back() {
  if [[ $EUID -eq 0 && -n ${SUDO_UID-} ]]; then
    chown -Rh "$SUDO_UID:${SUDO_GID:-$SUDO_UID}" build
  fi
}
trap give_back EXIT

cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=Release -DVORN_WERROR=ON -DBUILD_TESTING=ON
cmake --build build --parallel "$(nproc)"
tested=0
ctest --test-dir build --output-on-failure --no-tests=error -j2 "$@" || tested=$?
# A test that can't run on this machine says what it lacks.
sed -n "s/.* skipped ['\"]\(.*\)['\"]\$/test.sh: not everything was tested: \1/p" \
  build/Testing/Temporary/LastTest.log | sort -u
[[ $tested -eq 0 ]]

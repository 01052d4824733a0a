# shellcheck shell=bash disable=SC2034
# The Debian packages that the project needs, and how they get onto a machine. Sourced.

# To build, try and package the product.
build_packages=(
  g++ cmake ninja-build pkg-config
  libsqlite3-dev libcurl4-openssl-dev zlib1g-dev libmount-dev libssl-dev libxxhash-dev
  libcli11-dev nlohmann-json3-dev
  bubblewrap dpkg-dev
)
# Besides those, to run all tests. (CMake looks for GoogleTest only when tests are built.)
test_packages=(
  libgtest-dev python3 python3-aiosmtpd openssl chromium shellcheck quota samba-common-bin
  lintian systemd systemd-container cron strace glusterfs-server glusterfs-client iproute2
  prometheus zsh bash-completion
  clickhouse-server clickhouse-client libzookeeper-java default-jre-headless
)

# npm bundles the page. Where it came with another Node.js, Debian's stays away: they conflict.
if ! command -v npm >/dev/null; then
  build_packages+=(npm)
fi

as_root() {
  if [[ $EUID -eq 0 ]]; then
    "$@"
  else
    sudo "$@"
  fi
}

install_missing() { # PACKAGE...
  local package missing=()
  for package; do
    if ! dpkg-query -W -f '${db:Status-Status}\n' "$package" 2>/dev/null | grep -qx installed; then
      missing+=("$package")
    fi
  done
  if [[ ${#missing[@]} -eq 0 ]]; then
    return 0
  fi
  echo "Installing: ${missing[*]}"
  if [[ $EUID -ne 0 ]] && ! command -v sudo >/dev/null; then
    echo "Run this as root, or install the packages above." >&2
    return 1
  fi
  as_root env DEBIAN_FRONTEND=noninteractive apt-get update -q
  as_root env DEBIAN_FRONTEND=noninteractive apt-get install -qy --no-install-recommends \
    "${missing[@]}"
}

# Shared by the scripts: sets up packages and says what is going on. Sourced, from the top of the tree.
set -eu

say() { printf '== %s\n' "$*"; }
fail() {
  printf '%s: %s\n' "$0" "$*" >&2
  exit 1
}

as_root() {
  if [ "$(id -u)" = 0 ]; then
    "$@"
  elif command -v sudo >/dev/null; then
    sudo "$@"
  else
    fail "packages are missing ($missing), and installing them needs root: run this as root, or install sudo"
  fi
}

# Also true when another package provides it, as a Node.js from elsewhere provides npm.
installed() {
  dpkg-query -W -f '${db:Status-Status}' "$1" 2>/dev/null | grep -qx installed ||
    dpkg-query -W -f '${db:Status-Status}, ${Provides},\n' | grep -q "^installed,.* $1[ ,]"
}

# install_packages KIND...: installs what packages.txt marks with one of the kinds and this machine lacks.
install_packages() {
  command -v dpkg-query >/dev/null || fail "this is no Debian system: install what packages.txt lists by hand"
  missing=
  for kind in "$@"; do
    for package in $(sed 's/#.*//' packages.txt | awk -v kind="$kind" '$2 == kind {print $1}'); do
      installed "$package" || missing="$missing $package"
    done
  done
  [ -n "$missing" ] || return 0
  say "Installing:$missing"
  as_root env DEBIAN_FRONTEND=noninteractive apt-get -q update ||
    fail "the package lists can't be fetched; is the network up, and does /etc/apt name a Debian mirror?"
  # shellcheck disable=SC2086  # one word a package
  as_root env DEBIAN_FRONTEND=noninteractive apt-get -q install -y --no-install-recommends $missing ||
    fail "a package can't be had:$missing"
}

jobs=$(nproc)

#!/usr/bin/env bash
# Installs the Debian packages that building, testing and running evwatch need.
# Idempotent: asks apt only for what is missing, and refreshes the package lists first
# only when something must be installed. Runs apt-get as root, or through sudo.
#
# Usage: scripts/install-deps.sh [extra-package ...]
set -euo pipefail

packages=(
  build-essential cmake pkg-config ccache
  libcurl4-openssl-dev libssl-dev
  libjpeg62-turbo-dev libxml2-dev
  libyaml-cpp-dev libcli11-dev nlohmann-json3-dev
  libgtest-dev libgmock-dev libbenchmark-dev
  python3
)
packages+=("$@")

missing=()
for p in "${packages[@]}"; do
  status=$(dpkg-query -W -f='${db:Status-Status}' "$p" 2>/dev/null || true)
  [ "$status" = "installed" ] || missing+=("$p")
done
[ ${#missing[@]} -eq 0 ] && exit 0

if [ "$(id -u)" -eq 0 ]; then
  run=()
elif command -v sudo >/dev/null 2>&1 && sudo -n true 2>/dev/null; then
  run=(sudo -n)
else
  echo "install-deps: missing Debian packages: ${missing[*]}" >&2
  echo "install-deps: cannot install them: not root and no password-less sudo." >&2
  echo "install-deps: install them by hand (apt-get install ${missing[*]}) and run again." >&2
  exit 1
fi

echo "install-deps: installing ${missing[*]}" >&2
export DEBIAN_FRONTEND=noninteractive
"${run[@]}" apt-get update -qq
"${run[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"

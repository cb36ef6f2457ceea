#!/bin/sh
# Installs the Debian packages of scripts/packages.txt that are missing. Quick when none is.
set -eu
cd "$(dirname "$0")/.."
wanted=$(sed -e 's/#.*//' scripts/packages.txt)
missing=
for package in $wanted; do
  state=$(dpkg-query -W -f='${db:Status-Status}' "$package" 2>/dev/null || true)
  [ "$state" = installed ] || missing="$missing $package"
done
[ -n "$missing" ] || exit 0

as_root=
if [ "$(id -u)" -ne 0 ]; then
  command -v sudo >/dev/null 2>&1 || {
    echo "setup: these packages are missing and there is no sudo; install them as root:$missing" >&2
    exit 1
  }
  as_root=sudo
fi
echo "setup: installing$missing"
log=$(mktemp)
if ! { $as_root apt-get update -qq &&
       $as_root env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends \
         $missing; } >"$log" 2>&1; then
  tail -n 20 "$log" >&2
  echo "setup: apt-get failed; its last lines are above" >&2
  rm -f "$log"
  exit 1
fi
rm -f "$log"

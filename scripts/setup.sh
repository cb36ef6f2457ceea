#!/bin/sh
# Installs the Debian packages of scripts/packages.txt that are missing. Quick when none is. Without
# the optional ones, at its end, everything works but what needs them.
set -eu
cd "$(dirname "$0")/.."

missing_of() {
  for package in $1; do
    state=$(dpkg-query -W -f='${db:Status-Status}' "$package" 2>/dev/null || true)
    [ "$state" = installed ] || printf ' %s' "$package"
  done
}
needed=$(missing_of "$(sed -e '/^# Optional/,$d' -e 's/#.*//' scripts/packages.txt)")
optional=$(missing_of "$(sed -e '1,/^# Optional/d' -e 's/#.*//' scripts/packages.txt)")
[ -n "$needed$optional" ] || exit 0

as_root=
if [ "$(id -u)" -ne 0 ]; then
  if ! command -v sudo >/dev/null 2>&1; then
    [ -z "$optional" ] || echo "setup: there is no sudo; done without:$optional" >&2
    [ -n "$needed" ] || exit 0
    echo "setup: these packages are missing and there is no sudo; install them as root:$needed" >&2
    exit 1
  fi
  as_root=sudo
fi

log=$(mktemp)
trap 'rm -f "$log"' EXIT
install_packages() {
  $as_root env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends "$@" \
    >>"$log" 2>&1
}
echo "setup: installing$needed$optional"
$as_root apt-get update -qq >>"$log" 2>&1 || echo "setup: the lists of packages cannot be renewed" >&2
# shellcheck disable=SC2086  # names of packages have no blanks
install_packages $needed $optional && exit 0
if [ -n "$needed" ] && ! install_packages $needed; then
  tail -n 20 "$log" >&2
  echo "setup: apt-get failed; its last lines are above" >&2
  exit 1
fi
for package in $optional; do
  install_packages "$package" || echo "setup: done without $package, which cannot be had" >&2
done

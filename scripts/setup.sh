#!/usr/bin/env bash
# Installs the Debian packages that are missing, or says which they are.
#
# usage: setup.sh [run] [test] [check]    sections of packages.txt; none: all of them
set -euo pipefail

here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
sections=("$@")
[[ $# -gt 0 ]] || sections=(run test check)

wanted=()
section=""
while read -r line; do
  case $line in
    "" | "#"*) ;;
    "["*"]") section=${line:1:-1} ;;
    *) [[ " ${sections[*]} " != *" $section "* ]] || wanted+=("$line") ;;
  esac
done <"$here/packages.txt"

if ! command -v dpkg-query >/dev/null; then
  echo "setup: this is no Debian system; install what answers to these packages yourself:" >&2
  printf '  %s\n' "${wanted[@]}" >&2
  exit 1
fi

# A package for another architecture, or removed with its configuration left behind, is missing.
installed=$(dpkg-query -W -f '${db:Status-Abbrev}${Package}\n' | sed -n 's/^.i //p')
missing=()
for package in "${wanted[@]}"; do
  grep -qxF -- "$package" <<<"$installed" || missing+=("$package")
done
[[ ${#missing[@]} -gt 0 ]] || exit 0

echo "setup: ${#missing[@]} packages are missing:"
printf '  %s\n' "${missing[@]}"
if [[ $(id -u) -ne 0 ]]; then
  echo "setup: install them as root with this command, then try again:" >&2
  echo "  apt-get install --no-install-recommends ${missing[*]}" >&2
  exit 1
fi

export DEBIAN_FRONTEND=noninteractive
install_missing() {
  apt-get install --yes --quiet --no-install-recommends -o DPkg::Lock::Timeout=300 -o Dpkg::Use-Pty=0 \
    "${missing[@]}" </dev/null
}
# The lists of packages can be absent (a fresh image) or older than what the mirror has.
if ! apt-get install --simulate --no-install-recommends "${missing[@]}" >/dev/null 2>&1 || ! install_missing; then
  apt-get update --quiet -o DPkg::Lock::Timeout=300 </dev/null
  install_missing
fi

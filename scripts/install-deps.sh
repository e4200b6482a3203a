#!/usr/bin/env bash
# Installs the Debian packages the host build, the tests and the tools need,
# skipping those already present. Runs apt-get through sudo when not root.
# Extra package names given as arguments are installed too (make msc asks
# for mscgen this way; nothing else needs it).
set -euo pipefail

PACKAGES=(
  cmake make g++ pkg-config
  googletest libgtest-dev libgmock-dev
  android-libutils-dev android-liblog-dev android-libcutils-dev android-libbase-dev
  android-platform-frameworks-native-headers android-libnativehelper-dev
  default-jdk-headless
  clang libclang-rt-14-dev
  "$@"
)

missing=()
for pkg in "${PACKAGES[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$pkg" 2>/dev/null | grep -q "install ok installed"; then
    missing+=("$pkg")
  fi
done
[ ${#missing[@]} -eq 0 ] && exit 0

sudo=""
[ "$(id -u)" -ne 0 ] && sudo="sudo"
echo "install-deps: installing ${missing[*]}"
$sudo apt-get update -qq
DEBIAN_FRONTEND=noninteractive $sudo apt-get install -y -qq --no-install-recommends "${missing[@]}"

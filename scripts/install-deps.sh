#!/usr/bin/env bash
# Installs the Debian packages the host build, the tests and the tools need,
# skipping those already present. Runs apt-get through sudo when not root.
# Extra package names given as arguments are installed too (make msc asks
# for mscgen this way; nothing else needs it).
#
# --i386 adds what the 32-bit build (make test32) needs: the i386
# architecture, the multilib compiler, the i386 AOSP and GoogleTest
# libraries, qemu-user where this kernel cannot execute 32-bit programs, and
# a 32-bit JVM when the mirror can provide one (the JVM-hosting tests are
# skipped without it; nothing else is).
set -euo pipefail
cd "$(dirname "$0")/.."

i386=0
extra=()
for arg in "$@"; do
  case "$arg" in
    --i386) i386=1 ;;
    *) extra+=("$arg") ;;
  esac
done

PACKAGES=(
  cmake make g++ pkg-config
  googletest libgtest-dev libgmock-dev
  android-libutils-dev android-liblog-dev android-libcutils-dev android-libbase-dev
  android-platform-frameworks-native-headers android-libnativehelper-dev
  default-jdk-headless
  clang libclang-rt-14-dev
  ${extra[@]+"${extra[@]}"}
)
PACKAGES_I386=(
  g++-multilib
  android-libutils-dev:i386 android-liblog-dev:i386 android-libcutils-dev:i386 android-libbase-dev:i386
  libgtest-dev:i386 libgmock-dev:i386 zlib1g:i386
)
# libbacktrace (pulled in by libutils) loads 7z.so, which the i386 p7zip
# cannot install beside the amd64 one: it is unpacked into a folder of its
# own, which the 32-bit build links and runs against. So is the 32-bit JVM:
# installing it beside the amd64 JDK needs every library both depend on at
# the same version on both architectures, which a lagging i386 index breaks,
# while libjvm itself needs only libc and libstdc++.
P7ZIP_I386=p7zip-full:i386
P7ZIP_I386_DIR=/opt/quellborn-i386/p7zip
JRE_I386=openjdk-17-jre-headless:i386
JRE_I386_DIR=/opt/quellborn-i386/jdk

sudo=""
[ "$(id -u)" -ne 0 ] && sudo="sudo"
apt_get() { DEBIAN_FRONTEND=noninteractive $sudo apt-get "$@"; }

installed() { dpkg-query -W -f='${Status}' "$1" 2>/dev/null | grep -q "install ok installed"; }
missing_of() {
  local pkg
  for pkg in "$@"; do installed "$pkg" || echo "$pkg"; done
}

# A mirror whose index for one architecture lags behind (a sync in
# progress) makes apt-get update fail although every other index is fresh:
# retry a few times, then go on with the indexes at hand. Only a package
# that then cannot be installed fails the step.
updated=0
update_indexes() {
  [ $updated -eq 1 ] && return 0
  updated=1
  local attempt
  for attempt in 1 2 3; do
    if apt_get update -qq; then return 0; fi
    echo "install-deps: apt-get update failed (attempt $attempt of 3)"
    [ $attempt -lt 3 ] && sleep $((attempt * 10))
  done
  echo "install-deps: going on with the package indexes at hand"
}

install_all() {
  [ $# -eq 0 ] && return 0
  echo "install-deps: installing $*"
  update_indexes
  apt_get install -y -qq --no-install-recommends "$@"
}

mapfile -t missing < <(missing_of "${PACKAGES[@]}")
install_all ${missing[@]+"${missing[@]}"}
[ $i386 -eq 1 ] || exit 0

if ! dpkg --print-foreign-architectures | grep -qx i386; then
  echo "install-deps: adding the i386 architecture"
  $sudo dpkg --add-architecture i386
  updated=0
fi
mapfile -t missing < <(missing_of "${PACKAGES_I386[@]}")
install_all ${missing[@]+"${missing[@]}"}

# Kernels built without 32-bit support refuse i386 programs (Exec format
# error); qemu-user runs them there.
probe=$(mktemp -d)
chmod 755 "$probe"  # apt-get download fetches as the _apt user
trap 'rm -rf "$probe"' EXIT
echo 'int main() { return 0; }' > "$probe/p.c"
gcc -m32 -o "$probe/p" "$probe/p.c"
if ! "$probe/p" 2>/dev/null && ! installed qemu-user; then
  install_all qemu-user
fi

# Unpacks an i386 package into a folder of its own.
unpack() {
  local package=$1 dir=$2
  update_indexes
  echo "install-deps: unpacking $package into $dir"
  rm -f "$probe"/*.deb
  (cd "$probe" && apt_get download -qq "$package") || return 1
  $sudo mkdir -p "$dir"
  $sudo dpkg-deb -x "$probe"/*.deb "$dir"
}

if [ ! -e "$P7ZIP_I386_DIR/usr/lib/p7zip/7z.so" ]; then
  unpack "$P7ZIP_I386" "$P7ZIP_I386_DIR"
fi
if [ ! -e "$JRE_I386_DIR/usr/lib/jvm/java-17-openjdk-i386/lib/server/libjvm.so" ] &&
   [ ! -e /usr/lib/jvm/java-17-openjdk-i386/lib/server/libjvm.so ]; then
  if ! unpack "$JRE_I386" "$JRE_I386_DIR"; then
    echo "install-deps: $JRE_I386 cannot be fetched from these indexes; the 32-bit JVM-hosting tests will be skipped"
  fi
fi
exit 0

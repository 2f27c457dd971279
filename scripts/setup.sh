# Sourced by ./run and ./test: installs the Debian packages that are missing, and only those, so that a
# machine that is set up needs no network.

need_packages() {
  local missing=() package
  for package in "$@"; do
    dpkg-query -W -f='${Status}' "$package" 2>/dev/null | grep -q 'ok installed' ||
      missing+=("$package")
  done
  [ ${#missing[@]} -eq 0 ] && return
  echo "Installing: ${missing[*]}"
  local as_root=()
  [ "$(id -u)" -eq 0 ] || as_root=(sudo)
  "${as_root[@]}" apt-get update -qq
  "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive \
    apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
}

build_packages=(g++ cmake ninja-build nlohmann-json3-dev libcli11-dev)
test_packages=(libgtest-dev libgmock-dev libbenchmark-dev clang-14 libclang-rt-14-dev lld-14
  clang-format-14 git)
windows_build_packages=("${build_packages[@]}" g++-mingw-w64-i686-posix g++-mingw-w64-x86-64-posix
  mingw-w64-tools googletest perl clang-14 lld-14)
windows_run_packages=(wine wine64)
# Beyond those, for ./test all. Without a browser and without a typesetter the tests that use them are skipped, aloud.
all_packages=(clang-tidy-14)
browser_packages=(chromium groff-base xvfb xauth imagemagick)

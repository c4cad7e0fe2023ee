# Shared by the scripts of this folder: where things are, installing packages, running programs as root.
set -euo pipefail

tree=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd -P)
cache=${KRAL_CACHE_DIR:-${XDG_CACHE_HOME:-${HOME:-/root}/.cache}/kral}

say() { printf '%s\n' "$*" >&2; }

die() {
  say "$(basename "$0"): $*"
  exit 1
}

as_root() {
  if [ "$(id -u)" -eq 0 ]; then "$@"; else sudo "$@"; fi
}

# be_patient: programs that are started in this folder wait longer for a sign of life than the 80 ms of a handset that
# has a machine to itself.
be_patient() { echo "ConnectDelay 2000" >WLANEVKConfig.txt; }

# need_packages PACKAGE...: installs what is missing with apt-get, and does not touch apt when nothing is.
need_packages() {
  local missing=() package
  for package in "$@"; do
    dpkg-query -W -f '${Status}\n' "$package" 2>/dev/null | grep -q '^install ok installed$' || missing+=("$package")
  done
  [ ${#missing[@]} -eq 0 ] && return
  say "installing: ${missing[*]}"
  local log
  log=$(mktemp)
  # Others may be installing on this machine: wait for apt's own lock.
  local apt=(env DEBIAN_FRONTEND=noninteractive apt-get -qq -o DPkg::Lock::Timeout=300)
  { as_root "${apt[@]}" update && as_root "${apt[@]}" install -y --no-install-recommends "${missing[@]}"; } \
    >"$log" 2>&1 || { cat "$log" >&2; rm -f "$log"; die "these packages could not be installed: ${missing[*]}"; }
  rm -f "$log"
}

# machine_sources SUITE TYPE: the machine's own mirrors of a Debian suite, as sources.list lines. Updates and security
# fixes are left out: the fewer indexes, the fewer mirrors that can be out of step.
machine_sources() {
  apt-get indextargets --format '$(CREATED_BY) $(REPO_URI) $(RELEASE) $(COMPONENT)' |
    awk -v suite="$1" -v type="$2" '$1 == "Packages" && $4 == "main" && $3 == suite && !seen[$2]++ {
      print type, $2, $3, $4 }'
}

# Options that carry the machine's proxy settings into a new root.
proxy_options() {
  local scheme proxy
  for scheme in http https; do
    eval "$(apt-config shell proxy "Acquire::$scheme::Proxy")"
    [ -z "${proxy:-}" ] || printf '%s\n' "--aptopt=Acquire::$scheme::Proxy \"$proxy\""
    unset proxy
  done
}

# What every build needs.
build_packages=(cmake ninja-build g++ pkg-config zlib1g-dev libxml2-dev googletest libfmt-dev libcli11-dev nlohmann-json3-dev
  libtomlplusplus-dev python3 python3-pycparser libxml2-utils srecord libgsf-bin python3-olefile)
# What the checks of the sources need.
check_packages=(clang-format)
# What reads them as clang does; only the whole scripts/test needs it.
tidy_packages=(clang clang-tidy)
# What looks for inputs that break it.
fuzz_packages=(clang llvm)
# What tries the library from other languages.
language_packages=(flake8 libmono-system-core4.0-cil mono-mcs mono-runtime mypy python3-build python3-cffi python3-pytest
  python3-setuptools python3-venv python3-wheel)
# What reads traces.
trace_packages=(tshark)
# What makes the packages whole (man pages, reference), and tries them.
package_packages=(doxygen lintian man-db mmdebstrap util-linux)
# What the Windows platform needs beside it, of 32 and of 64 bits.
windows_packages=(doxygen g++-mingw-w64-i686-posix g++-mingw-w64-x86-64-posix libz-mingw-w64-dev llvm)
wine_packages=(mmdebstrap util-linux)
# What builds for 64-bit ARM Linux, and runs it.
arm64_packages=(g++-aarch64-linux-gnu mmdebstrap qemu-user)

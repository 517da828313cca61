# Sourced by the scripts of this folder: where the tree is, how many jobs, and the packages of the distribution.
# shellcheck shell=bash disable=SC2034,SC2191

root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
cd "$root" || exit 2
exec </dev/null # nothing here asks
jobs=$(nproc 2>/dev/null || echo 2)

# What the command and its libraries need, what the tests need on top, and what the checks with clang need. An entry
# "package=command" counts as there when the command is, wherever it comes from.
packages_build=(g++=g++ cmake=cmake ninja-build=ninja libblas-dev libcli11-dev libcsv-dev libeigen3-dev libfmt-dev
  libmetis-dev libnlopt-dev libsuitesparse-dev nlohmann-json3-dev zlib1g-dev)
packages_tests=(ccache=ccache pkgconf=pkg-config binutils=readelf libgtest-dev mandoc=mandoc)
packages_clang=(clang=clang++ libclang-rt-dev clang-format=clang-format clang-tidy=run-clang-tidy)
packages_coverage=(gcovr=gcovr)
packages_bench=(libsuitesparse-dev libmetis-dev libeigen3-dev libopenblas-dev python3=python3)
packages_bench_mixed=(python3=python3 r-base-core=Rscript r-cran-lme4)

has_package() {
  case $1 in
    *=*) command -v "${1#*=}" >/dev/null ;;
    *) [ "$(dpkg-query -W -f='${db:Status-Status}' "$1" 2>/dev/null)" = installed ] ;;
  esac
}

# Installs whichever of its arguments is missing; exits 2, naming them, when that is not allowed here.
need_packages() {
  local missing=() entry sudo=()
  if ! command -v dpkg-query >/dev/null; then
    echo "Not a Debian system: going on without a look at the packages. Debian calls them ${*%%=*}"
    return 0
  fi
  for entry in "$@"; do
    has_package "$entry" || missing+=("${entry%%=*}")
  done
  [ ${#missing[@]} -gt 0 ] || return 0
  if [ "$(id -u)" -ne 0 ]; then
    if ! sudo -n true 2>/dev/null; then
      echo "These packages are missing, and there is no right to install them here. As root, run" >&2
      echo "  apt-get install --no-install-recommends ${missing[*]}" >&2
      exit 2
    fi
    sudo=(sudo -n)
  fi
  echo "Installing ${missing[*]}"
  # An unreachable archive of somebody else's must not stop what the others can serve.
  "${sudo[@]}" apt-get update -qq || echo "apt-get update failed; trying with the lists that are there" >&2
  "${sudo[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends \
    -o DPkg::Lock::Timeout=300 "${missing[@]}" >/dev/null
}

# With a compiler cache the tests of a sanitizer build, which are compiled as in a release build, are compiled once.
use_compiler_cache() {
  if command -v ccache >/dev/null; then
    export CMAKE_C_COMPILER_LAUNCHER=ccache CMAKE_CXX_COMPILER_LAUNCHER=ccache
  fi
}

# What the scripts in this folder share; they source it and then stand in the project's root.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

CMAKE_BUILD_PARALLEL_LEVEL=${CMAKE_BUILD_PARALLEL_LEVEL:-$(nproc)}
export CMAKE_BUILD_PARALLEL_LEVEL

fail() {
  echo "tools/${0##*/}: $*" >&2
  exit 1
}

# Runs a command whose output matters only when it fails.
quietly() {
  local log status=0
  log=$(mktemp)
  "$@" >"$log" 2>&1 </dev/null || status=$?
  if ((status != 0)); then tail -n 100 "$log" >&2; fi
  rm -f "$log"
  return "$status"
}

# Installs the missing packages of the named groups in packages.txt.
need() {
  local group package missing=() as_root=()
  if ! command -v dpkg-query >/dev/null; then
    echo "Not a Debian system; tools/packages.txt names what has to be installed." >&2
    return
  fi
  for group in "$@"; do
    for package in $(sed -n "s/^$group://p" tools/packages.txt); do
      if [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) != installed ]]; then
        missing+=("$package")
      fi
    done
  done
  if ((${#missing[@]} == 0)); then return; fi

  if ((EUID != 0)); then
    # Without a terminal sudo must not ask for a password.
    if ! command -v sudo >/dev/null || ! { [[ -t 0 ]] || sudo -n true 2>/dev/null; }; then
      fail "missing packages, and no rights to install them; run as root:" \
        "apt-get install ${missing[*]}"
    fi
    as_root=(sudo)
  fi
  echo "Installing ${missing[*]}"
  local apt=(${as_root[@]+"${as_root[@]}"} env DEBIAN_FRONTEND=noninteractive
    apt-get -qq --yes -o DPkg::Lock::Timeout=300)
  # One unreachable source need not matter; if it does, the installation says so.
  quietly "${apt[@]}" update || true
  quietly "${apt[@]}" install --no-install-recommends "${missing[@]}" ||
    fail "could not install ${missing[*]}"
}

# Configures and builds a preset. What another clone has compiled serves this one, where there is
# ccache: names of files count from the root.
export CCACHE_BASEDIR=$PWD CCACHE_NOHASHDIR=1
build() {
  local preset=$1
  echo "Building build/$preset"
  quietly cmake --preset "$preset" || fail "configuring the preset $preset failed"
  if [[ -t 1 ]]; then
    cmake --build --preset "$preset"
  else
    quietly cmake --build --preset "$preset"
  fi || fail "building the preset $preset failed"
}

# Debian packages that the other scripts need. To be sourced.

# What it takes to configure and build everything, tests included.
build_packages=(g++ cmake ninja-build libcli11-dev nlohmann-json3-dev libgtest-dev)

# ensure_packages PACKAGE...: installs those that are missing, through sudo when this is not root. Quick when none is.
ensure_packages() {
  local missing=() package as_root=()
  if ! command -v dpkg-query >/dev/null || ! command -v apt-get >/dev/null; then
    echo "This is no Debian system: the equivalents of these packages must be there: $*" >&2
    return 0
  fi
  for package; do
    dpkg-query -W -f='${db:Status-Status}\n' "$package" 2>/dev/null | grep -qx installed || missing+=("$package")
  done
  ((${#missing[@]})) || return 0
  if ((EUID != 0)); then
    if ! command -v sudo >/dev/null; then
      echo "Missing packages: ${missing[*]}. Install them as root, then try again." >&2
      return 1
    fi
    as_root=(sudo)
  fi
  echo "Installing: ${missing[*]}" >&2
  "${as_root[@]}" apt-get update -qq >&2 &&
    "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends "${missing[@]}" >&2
}

# Where this machine's apt takes Debian itself from, for roots of other releases.
debian_mirror() {
  local uri
  uri=$(apt-get indextargets --format '$(REPO_URI)' 2>/dev/null | grep '/debian/*$' | head -n 1)
  echo "${uri:-http://deb.debian.org/debian}"
}

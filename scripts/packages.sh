# shellcheck shell=bash
# The Debian packages that the scripts need, each list once. To be sourced.

declare -A packages=(
  # To configure and build everything, tests included. The compiler optimises across files in parallel by means of make.
  [build]="g++ cmake make ninja-build libcli11-dev nlohmann-json3-dev libgtest-dev"
  # To build the bridge to ModemManager, and to test it on the real one.
  [bridge]="libsystemd-dev modemmanager dbus-daemon"
  # To cut the power of a disk: one whose content a process serves, and the file systems on it.
  [powercut]="libfuse3-dev e2fsprogs xfsprogs btrfs-progs"
  [clang]="clang"
  [lint]="clang clang-format clang-tidy shellcheck"
  [coverage]="clang llvm"
  [mutants]="git python3"
  [bench]="libbenchmark-dev pkg-config gnuplot-nox"
  [package]="build-essential libsystemd-dev debhelper fakeroot lintian lowdown"
  [cross-arm64]="g++-aarch64-linux-gnu"
  [arm64]="qemu-system-arm cpio"
  [elsewhere]="debootstrap"
  [installed]="debootstrap systemd-container procps bsdextrautils"
  # The contenders of the benchmarks.
  [contenders]="libmsgpack-cxx-dev libglib2.0-dev libabsl-dev libspdlog-dev libsystemd-dev dbus-daemon redis-server"
)

# ensure_packages LIST...: installs what is missing of these lists, through sudo when this is not root. Quick when nothing
# is missing.
ensure_packages() {
  local missing=() list package as_root=()
  if ! command -v dpkg-query >/dev/null || ! command -v apt-get >/dev/null; then
    echo "This is no Debian system: the equivalents of the packages in scripts/packages.sh must be there." >&2
    return 0
  fi
  for list; do
    for package in ${packages[$list]:?no list of packages is called so}; do
      dpkg-query -W -f='${db:Status-Status}\n' "$package" 2>/dev/null | grep -qx installed || missing+=("$package")
    done
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

# with_lists_of ARCHITECTURE FOLDER COMMAND...: runs COMMAND in FOLDER with apt on lists of that architecture, which the
# machine itself does not see. For packages that are fetched, not installed.
with_lists_of() {
  local arch=$1 folder=$2 status=0
  shift 2
  mkdir -p "$folder"/apt/{lists/partial,archives/partial} || return
  : >"$folder/apt/status"
  cat >"$folder/apt/apt.conf" <<CONF
APT::Architecture "$arch";
APT::Architectures { "$arch"; };
APT::Sandbox::User "";
Acquire::Languages "none";
Dir::State::Lists "$folder/apt/lists";
Dir::State::status "$folder/apt/status";
Dir::Cache "$folder/apt";
CONF
  (export APT_CONFIG=$folder/apt/apt.conf && cd "$folder" && apt-get update -qq && "$@") || status=$?
  rm -rf "$folder/apt"
  return $status
}

#!/usr/bin/env bash
# Installs the C library into a scratch folder, builds the examples against what lies there as a stranger would, and runs
# them beside a daemon: installed.sh TREE BUILD CC CXX QUORVELD QUORVELCTL TELVANE_SIM
set -euo pipefail
tree=$1 build=$2 cc=$3 cxx=$4 quorveld=$5 quorvelctl=$6 simulator=$7
scratch=$(mktemp -d)
trap 'kill $(jobs -p) 2>/dev/null || true; wait; rm -rf "$scratch"' EXIT

for component in libquorvel1 libquorvel-dev; do
  cmake --install "$build" --prefix "$scratch/prefix" --component "$component" >/dev/null
done
headers=$(find "$scratch/prefix" -name '*.h' -printf '%P\n')
[ "$headers" = include/quorvel.h ] || { echo "installed headers: $headers"; exit 1; }
export LD_LIBRARY_PATH PKG_CONFIG_PATH
LD_LIBRARY_PATH=$(dirname "$(find "$scratch/prefix" -name libquorvel.so.1)")
PKG_CONFIG_PATH=$LD_LIBRARY_PATH/pkgconfig

# Moving the tree afterwards must change nothing, so the files may not name where they were installed.
if grep -rl "$scratch" "$scratch/prefix"; then echo "these name their prefix"; exit 1; fi

warnings=(-Wall -Wextra -Wpedantic -Wconversion -Wshadow -Werror)
example=$tree/capi/examples/regulatory_images.c
programs=()
if command -v pkg-config >/dev/null; then
  read -ra flags < <(pkg-config --cflags --libs quorvel)
  "$cc" -std=c11 "${warnings[@]}" "$example" "${flags[@]}" -o "$scratch/c11"
  "$cxx" -std=c++11 "${warnings[@]}" -x c++ "$example" -x none "${flags[@]}" -o "$scratch/cxx11"
  programs+=("$scratch/c11" "$scratch/cxx11")
else
  echo "skipped: pkg-config is missing"
fi
mkdir "$scratch/project"
cat >"$scratch/project/CMakeLists.txt" <<END
cmake_minimum_required(VERSION 3.25)
project(example LANGUAGES C)
find_package(quorvel 1.0 REQUIRED)
add_executable(example $example)
target_link_libraries(example PRIVATE quorvel::quorvel)
END
cmake -G Ninja -S "$scratch/project" -B "$scratch/project" -DCMAKE_PREFIX_PATH="$scratch/prefix" \
  -DCMAKE_C_COMPILER="$cc" >/dev/null
cmake --build "$scratch/project" >/dev/null
programs+=("$scratch/project/example")

export QUORVEL_ROOT=$scratch/root
"$quorvelctl" root create "$QUORVEL_ROOT" >/dev/null 2>&1

# retry COMMAND...: until it succeeds, ten seconds at most.
retry() {
  for _ in {1..200}; do "$@" >/dev/null 2>&1 && return; sleep 0.05; done
  echo "never succeeded: $*"; return 1
}
"$simulator" & retry "$quorvelctl" sim show
"$quorveld" & retry "$quorvelctl" regulatory-images

# Each example prints the images and listens; then the number changes, and it ends.
for program in "${programs[@]}"; do
  "$program" >"$scratch/out" &
  listener=$!
  retry grep -q listening "$scratch/out"
  for _ in {1..50}; do
    "$quorvelctl" sim notify phone-number-changed >/dev/null
    sleep 0.1
    kill -0 "$listener" 2>/dev/null || break
  done
  wait "$listener"
  grep -q phone_number_changed "$scratch/out"
  grep -v '^#' "$scratch/out" >"$scratch/images"
  [ -s "$scratch/images" ]
  echo "$program: $(wc -l <"$scratch/images") images"
done

if command -v python3 >/dev/null; then
  python3 "$tree/capi/examples/regulatory_images.py" | diff - "$scratch/images"
  echo "python3: the same"
else
  echo "skipped: python3 is missing"
fi

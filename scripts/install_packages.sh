#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# Installs the Debian packages that are missing; does nothing, and needs no rights, when none is.
#   scripts/install_packages.sh GROUP...     groups: build tools test check arm64 bench
# Other scripts may source this file and call `install_missing_packages GROUP...`.

# packages_of GROUP: its packages, one a line, each with the reason it is needed.
packages_of() {
  case "$1" in
    build)
      echo 'g++                    # C++17 and C99 compiler'
      echo 'cmake                  # describes the build'
      echo 'ninja-build            # runs it'
      ;;
    tools)
      echo 'nlohmann-json3-dev     # reads and writes landmark tracks'
      echo 'libcli11-dev           # command line of n3ds'
      echo 'libegl-dev             # OpenGL without a display'
      echo 'libgles-dev            # OpenGL ES 3, draws the stickers'
      echo 'libgl1-mesa-dri        # its software renderer, for machines without a GPU'
      echo 'libpng-dev             # reads and writes PNG'
      echo 'libjpeg-dev            # reads and writes JPEG'
      echo 'ffmpeg                 # encodes MP4'
      ;;
    test)
      echo 'libgtest-dev           # tests'
      echo 'libgmock-dev           # matchers in tests'
      echo 'nlohmann-json3-dev     # the tests read landmark tracks'
      echo 'python3-numpy          # the scripts that make data and assets, which a test runs'
      echo 'python3-scipy          # their solvers, triangulation and filters'
      echo 'python3-pil            # their pictures'
      echo 'libblas3               # the reference BLAS, one of three that the results must not hang on'
      echo 'liblapack3             # the reference LAPACK'
      echo 'libatlas3-base         # the second BLAS, with its LAPACK'
      echo 'libopenblas0-pthread   # the third BLAS, with its LAPACK'
      ;;
    check)
      echo 'clang                  # the second compiler'
      echo 'clang-format           # formatting'
      echo 'clang-tidy             # static analysis'
      echo 'gcovr                  # coverage of lines and branches'
      echo 'shellcheck             # static analysis of the scripts'
      echo 'flake8                 # static analysis of the Python programs'
      ;;
    arm64)
      echo 'g++-aarch64-linux-gnu  # cross compiler'
      echo 'qemu-user-static       # runs its programs'
      echo 'googletest             # GoogleTest as source, to be built for the target'
      echo 'nlohmann-json3-dev     # the tests read landmark tracks'
      ;;
    bench)
      echo 'libbenchmark-dev       # Google Benchmark'
      echo 'libeigen3-dev          # peer of the matrix product'
      echo 'libceres-dev           # peer of the pose solver'
      echo 'libopencv-calib3d-dev  # peer of the tracking, solvePnP'
      echo 'libopencv-imgproc-dev  # peer of the mask warp and blend'
      echo 'nlohmann-json3-dev     # benchmarks read landmark tracks'
      ;;
    *)
      echo "install_packages.sh: no group '$1' (build tools test check arm64 bench)" >&2
      return 1
      ;;
  esac
}

install_missing_packages() {
  local group packages missing=() package sudo=()
  for group in "$@"; do
    packages=$(packages_of "$group") || return 1
    while read -r package _; do
      if [[ " ${missing[*]} " == *" $package "* ]]; then continue; fi
      if [ "$(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null)" != installed ]; then
        missing+=("$package")
      fi
    done <<<"$packages"
  done
  if [ "${#missing[@]}" -eq 0 ]; then return 0; fi

  if ! command -v apt-get >/dev/null; then
    echo "install_packages.sh: not a Debian system; please install: ${missing[*]}" >&2
    return 1
  fi
  if [ "$(id -u)" -ne 0 ]; then
    if ! command -v sudo >/dev/null; then
      echo "install_packages.sh: needs root or sudo to install: ${missing[*]}" >&2
      return 1
    fi
    sudo=(sudo)
  fi
  echo "Installing ${missing[*]}"
  # A lock held by another installation is waited for instead of failing at once.
  local apt=("${sudo[@]}" env DEBIAN_FRONTEND=noninteractive
    apt-get -qq -o DPkg::Lock::Timeout=600)
  "${apt[@]}" update &&
    "${apt[@]}" install -y --no-install-recommends "${missing[@]}" >/dev/null
}

if [ "${BASH_SOURCE[0]}" = "$0" ]; then
  set -euo pipefail
  if [ "$#" -eq 0 ]; then
    echo "usage: scripts/install_packages.sh GROUP... (build tools test check arm64 bench)" >&2
    exit 2
  fi
  install_missing_packages "$@"
fi

#!/usr/bin/env bash
# Installs the build into a staging prefix, then uses it as a user would: a C program built against
# the installed header with pkg-config, a CMake project that finds the package, and the installed
# kyn-assistant against the installed kyn-sim.
#   staged-install.sh BUILD_DIR SOURCE_DIR
set -euo pipefail
build=$1
source=$2
work=$(mktemp -d "${TMPDIR:-/tmp}/kyn-install.XXXXXX")
trap 'rm -rf "$work"' EXIT
stage="$work/stage"
fail() { echo "staged-install: $*" >&2; exit 1; }

cmake --install "$build" --prefix "$stage" >/dev/null
libdir=$(dirname "$(find "$stage" -name 'libkyn-assistant.so.*.*' | head -n1)")
[[ -n "$libdir" && -e "$libdir/libkyn-assistant.so" ]] || fail "no installed plug-in"
soname=$(objdump -p "$libdir"/libkyn-assistant.so | sed -n 's/^ *SONAME *//p')
[[ "$soname" =~ ^libkyn-assistant\.so\.[0-9]+$ ]] || fail "SONAME is '$soname'"

cat >"$work/version.c" <<'C'
#include <kyn_plugin.h>
#include <stdio.h>
int main(void) {
  char* language = kyn_plugin_language();
  printf("%s\n", kyn_plugin_version());
  kyn_plugin_free(language);
  return 0;
}
C
export PKG_CONFIG_PATH="$libdir/pkgconfig"
# shellcheck disable=SC2046
cc -o "$work/version" "$work/version.c" $(pkg-config --cflags --libs kyn-assistant)
version=$(LD_LIBRARY_PATH="$libdir" "$work/version")
[[ "$version" == "$(pkg-config --modversion kyn-assistant)" ]] || fail "the C program printed '$version'"

mkdir -p "$work/consumer"
cp "$work/version.c" "$work/consumer/version.c"
cat >"$work/consumer/CMakeLists.txt" <<'CMAKE'
cmake_minimum_required(VERSION 3.25)
project(consumer C)
find_package(kyn-assistant REQUIRED)
add_executable(version version.c)
target_link_libraries(version PRIVATE kyn-assistant::plugin)
CMAKE
cmake -S "$work/consumer" -B "$work/consumer/build" -G Ninja -DCMAKE_PREFIX_PATH="$stage" >/dev/null
cmake --build "$work/consumer/build" >/dev/null
[[ "$("$work/consumer/build/version")" == "$version" ]] || fail "the CMake consumer does not run"

# The installed Python module loads the installed plug-in by itself.
module=$(dirname "$(find "$stage" -path '*kyn_assistant/__init__.py' | head -n1)")
[[ "$(PYTHONPATH=$(dirname "$module") python3 -c 'import kyn_assistant; print(kyn_assistant.Plugin().version)')" == "$version" ]] ||
  fail "the installed Python module does not load the plug-in"

# The installed host loads the installed plug-in by itself and answers from the installed kyn-sim.
output=$("$source/scripts/demo" "$stage")
grep -q "Ada Marlowe — Work" <<<"$output" || fail "the installed host did not answer: $output"
echo "staged install: $stage works"

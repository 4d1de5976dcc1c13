#!/usr/bin/env bash
# Installs a build, moves the tree, and uses it from outside as strangers would: a program by CMake and by pkg-config,
# the command, a format plug-in with its conformance checks.
# Usage: installation.sh BUILD SOURCE COMPILER
set -euo pipefail
oBuild=$1 oSource=$2 oCompiler=$3
oWork=$(mktemp -d)
trap 'rm -rf "$oWork"' EXIT
unset KRVHOME
oHome=$oWork/moved

# quietly LOG COMMAND...: shows what the command said only when it failed.
quietly()
{
    local oLog=$oWork/$1.log
    shift
    "$@" >"$oLog" 2>&1 || { cat "$oLog"; echo "failed: $*" >&2; exit 1; }
}

# expect TEXT COMMAND...: the output holds the text.
expect()
{
    local oText=$1 oOutput
    shift
    oOutput=$("$@") || { echo "failed: $*" >&2; exit 1; }
    [[ $oOutput == *"$oText"* ]] || { printf 'no "%s" in the output of %s:\n%s\n' "$oText" "$*" "$oOutput" >&2; exit 1; }
}

quietly install cmake --install "$oBuild" --prefix "$oWork/first"
quietly licence cmp "$oSource/LICENSE" "$oWork/first/share/krv/LICENSE"
mv "$oWork/first" "$oHome"
if grep -rIlF -e "$oSource" -e "$oBuild" -e "$oWork" "$oHome"; then
    echo "these files name the place where they were made" >&2
    exit 1
fi
if find "$oHome/include" -path '*/detail/*' | grep .; then
    echo "private headers were installed" >&2
    exit 1
fi

quietly scene "$oHome/bin/krv-samplescene" "$oWork" --size 600
expect "600 x 600" "$oHome/bin/krv" info "$oWork/rgb.tif"

cp -r "$oSource/examples/readtiles" "$oWork/readtiles"
quietly configure cmake -S "$oWork/readtiles" -B "$oWork/program" -G Ninja -DCMAKE_CXX_COMPILER="$oCompiler" \
    -DCMAKE_PREFIX_PATH="$oHome"
quietly program cmake --build "$oWork/program"
expect "600 x 600 pixels in 4 tiles; 399424 pixels with margins" "$oWork/program/readtiles" "$oWork/rgb.tif"

expect "AREA_NAME = Sample scene" "$oWork/program/readtiles" "$oWork/rgb.tif"
expect "UTM zone 19S, 10 metre per pixel" "$oWork/program/readtiles" "$oWork/rgb.tif"
if "$oWork/program/readtiles" "$oWork/missing.tif" >"$oWork/missing.log" 2>&1 || ! grep -q missing.tif "$oWork/missing.log"; then
    echo "a missing file is not named: $(cat "$oWork/missing.log")" >&2
    exit 1
fi

cp -r "$oSource/examples/writetiles" "$oWork/writetiles"
quietly configure cmake -S "$oWork/writetiles" -B "$oWork/writer" -G Ninja -DCMAKE_CXX_COMPILER="$oCompiler" \
    -DCMAKE_PREFIX_PATH="$oHome"
quietly writer cmake --build "$oWork/writer"
expect "turned.tif has 4 tiles" "$oWork/writer/writetiles" "$oWork/rgb.tif" "$oWork/turned.tif"
expect "600 x 600" "$oHome/bin/krv" info "$oWork/turned.tif"
if "$oWork/writer/writetiles" "$oWork/rgb.tif" "$oWork/turned.tif" >"$oWork/taken.log" 2>&1; then
    echo "a file that is there is written over" >&2
    exit 1
fi

cp -r "$oSource/examples/filterscene" "$oWork/filterscene"
quietly configure cmake -S "$oWork/filterscene" -B "$oWork/filter" -G Ninja -DCMAKE_CXX_COMPILER="$oCompiler" \
    -DCMAKE_PREFIX_PATH="$oHome"
quietly filter cmake --build "$oWork/filter"
quietly filtered "$oWork/filter/filterscene" "$oWork/rgb.tif" "$oWork/smooth.tif"
expect "600 x 600" "$oHome/bin/krv" info "$oWork/smooth.tif"

export PKG_CONFIG_PATH=$oHome/lib/pkgconfig
# shellcheck disable=SC2046 # the flags are several words
quietly pkgconfig "$oCompiler" -std=c++20 "$oWork/readtiles/main.cpp" -o "$oWork/readtiles/plain" \
    $(pkg-config --cflags --libs krvdatasources) -Wl,-rpath,"$oHome/lib"
expect "4 tiles" "$oWork/readtiles/plain" "$oWork/rgb.tif"
# shellcheck disable=SC2046
quietly jobs "$oCompiler" -std=c++20 "$oSource/examples/channelstats/main.cpp" -o "$oWork/channelstats" \
    $(pkg-config --cflags --libs krvoperations) -Wl,-rpath,"$oHome/lib"
expect "channel 3 (8U): mean" "$oWork/channelstats" "$oWork/rgb.tif"

# The example format goes out of the home and comes back as a stranger's plug-in.
cp -r "$oHome/share/krv/formatplugin" "$oWork/plugin"
rm "$oHome/lib/qrfformats/demo.so" "$oHome/etc/qrfformats/demo.xml"
sed -i '/demo\.xml/d' "$oHome/etc/qrfformats/availableformats.xml"
quietly plugin-configure cmake -S "$oWork/plugin" -B "$oWork/plugin-build" -G Ninja \
    -DCMAKE_CXX_COMPILER="$oCompiler" -DCMAKE_PREFIX_PATH="$oHome"
quietly plugin cmake --build "$oWork/plugin-build"
quietly plugin-tests ctest --test-dir "$oWork/plugin-build" --no-tests=error --output-on-failure
for _ in first second; do
    quietly plugin-install cmake --install "$oWork/plugin-build" --prefix "$oHome"
done
[ "$(grep -c demo.xml "$oHome/etc/qrfformats/availableformats.xml")" -eq 1 ]
expect "60 x 40" "$oHome/bin/krv" info "$oWork/plugin-build/sample.demo"
echo "the installed and moved tree serves a program, the command and a plug-in from outside"

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
    oOutput=$("$@" 2>"$oWork/expect.log") || { cat "$oWork/expect.log" >&2; echo "failed: $*" >&2; exit 1; }
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

# Each example is a program of a stranger, and none is longer than a page.
cp -r "$oSource/examples" "$oWork/examples"
if wc -l "$oWork"/examples/*/main.cpp | awk '$2 != "total" && $1 > 60' | grep .; then
    echo "these examples are too long" >&2
    exit 1
fi
quietly configure cmake -S "$oWork/examples" -B "$oWork/programs" -G Ninja -DCMAKE_CXX_COMPILER="$oCompiler" \
    -DCMAKE_PREFIX_PATH="$oHome"
quietly programs cmake --build "$oWork/programs" -j 2
cd "$oWork"

# example NAME ARGUMENT...
example()
{
    local oName=$1
    shift
    "$oWork/programs/$oName/$oName" "$@"
}

# refused TEXT COMMAND...: fails, and says why.
refused()
{
    local oText=$1
    shift
    if "$@" >"$oWork/refused.log" 2>&1 || ! grep -qF "$oText" "$oWork/refused.log"; then
        echo "not refused with \"$oText\": $*: $(cat "$oWork/refused.log")" >&2
        exit 1
    fi
}

expect "600 x 600 pixels in 4 tiles; 399424 pixels with margins" example readtiles rgb.tif
expect "AREA_NAME = Sample scene" example readtiles rgb.tif
expect "UTM zone 19S, 10 metre per pixel" example readtiles rgb.tif
refused "missing.tif: No such file" example readtiles missing.tif
expect "hill.tif is written" example newfile hill.tif
for oText in "1000 x 1000" "no-data -9999" "500 x 500" "UTM zone 19S" "height in metres"; do
    expect "$oText" "$oHome/bin/krv" info hill.tif
done
expect " 785321 " "$oHome/bin/krv" stats hill.tif # the pixels within 500 of the middle
refused "hill.tif: The dataset already exists" example newfile hill.tif
refused "missing.tif: No such file" example filterscene missing.tif smooth.tif
quietly filtered example filterscene rgb.tif smooth.tif
expect "600 x 600" "$oHome/bin/krv" info smooth.tif
cp rgb.tif edited.tif
expect "edited channel, no-data 7.5, in WGS 84 / UTM zone 19S" example editmetadata edited.tif 7.5
expect "OPERATOR" "$oHome/bin/krv" info edited.tif
expect "grid.tif has 1000 x 1000 pixels" example togrid rgb.tif hill.tif grid.tif
expect "500000" "$oHome/bin/krv" info grid.tif
cp rgb.tif masked.tif
nValid=$(example validity masked.tif 0 | grep -o '^[0-9]*')
nBright=$(example validity masked.tif 60 | grep -o '^[0-9]*')
[ "$nValid" -eq 360000 ] && [ "$nBright" -gt 0 ] && [ "$nBright" -lt 360000 ]
expect "\"valid\": $nBright" "$oHome/bin/krv" stats --json masked.tif
expect "channel 3 (8U): mean" example channelstats rgb.tif

# The page of answers and the program of the README hold what they say; flags come as a makefile asks for them.
export PKG_CONFIG_PATH=$oHome/lib/pkgconfig
cp rgb.tif scene.tif
awk -v wanted=20 -f "$oSource/tests/structure/howto.awk" "$oSource/docs/howto.md" >answers.cpp
awk '/^```cpp/ { inside = 1; next } /^```/ { inside = 0 } inside' "$oSource/README.md" >readme.cpp
echo 'void Work(const krv::Raster&) {}' >>readme.cpp
for oProgram in answers readme; do
    # shellcheck disable=SC2046 # the flags are several words
    quietly pkgconfig "$oCompiler" -std=c++20 "$oProgram.cpp" -o "$oProgram" \
        $(pkg-config --cflags --libs krvdatasources) -Wl,-rpath,"$oHome/lib"
    quietly "$oProgram.run" "./$oProgram"
done
expect "20 answers hold" cat answers.run.log
awk -f "$oSource/tests/structure/pages.awk" "$oSource"/docs/classes/*.md "$oSource"/docs/{threads,readers-over-readers}.md >pages.cpp
# shellcheck disable=SC2046
quietly pages "$oCompiler" -std=c++20 -fsyntax-only pages.cpp $(pkg-config --cflags krvdatasources)
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

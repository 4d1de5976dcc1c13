# Reads sources, one after the other, with paths relative to the root of the tree, and prints every include that the
# structure does not allow: file:line: what is wrong. Fails when there is one.
# Usage: awk -v root=FOLDER -f layering.awk FILE...

BEGIN {
    # The order of the layers; includes go to a smaller number or stay in the folder.
    split("toolkit gobs datasources/api.h datasources/interfaces datasources/metadata datasources/iomanager " \
          "datasources/datasets datasources/reader datasources/writer datasources/overviews datasources/maskbuilder " \
          "datasources/utils operations", order, " ");
    for (n in order)
        rank[order[n]] = n + 0; # the subscripts of an array are texts
    rank["datasources/formatregistrar"] = rank["datasources/datasets"];
    rank["datasources/mosaic"] = rank["datasources/writer"];
    rank["krv"] = rank["operations"]; # what a program of pixels includes; it needs no library of jobs

    # The two sources that look up.
    upward["datasources/iomanager/datasetmanager.cpp", "datasources/formatregistrar"] = 1;
    upward["datasources/metadata/nodatavalue.cpp", "datasources/reader"] = 1;

    # What a plug-in sees beside its own folder.
    split("toolkit gobs datasources/api.h datasources/interfaces datasources/metadata plugins/support", names, " ");
    for (n in names)
        forPlugins[names[n]] = 1;
    # The plug-ins and the part of their base that open other files.
    split("plugins/krvdsk plugins/gdball plugins/mosaic plugins/support/sidecar", names, " ");
    for (n in names)
        opens[names[n], "datasources/iomanager"] = 1;
    opens["plugins/mosaic", "datasources/mosaic"] = 1;
    # The rooms of that base, by their order; what lies in the folder itself comes last.
    split("codec file geotiff image sidecar writing", names, " ");
    split("1 1 1 2 2 3", steps, " ");
    for (n in names)
        step[names[n]] = steps[n] + 0;
    lastStep = 4;

    # Libraries of others, and the only folders that may know them.
    home["^(xercesc|xalanc)/"] = "^(toolkit/xml|datasources/iomanager)/";
    home["^expat\\.h"] = "^toolkit/xml/";
    home["^boost/"] = "^datasources/metadata/";
    home["^(proj\\.h|proj/)"] = "^toolkit/ogc/cs/";
    home["^(tiff|tiffio|geotiff|geo_|geokeys|geovalues|xtiffio)"] = "^(plugins/tif|plugins/support/geotiff|tools/samplescene)/";
    home["^(libdeflate|zstd|lz4|lz4hc|zlib|isa-l/crc)\\.h"] = "^(plugins/support|plugins/tif|operations)/";
    home["^openjpeg"] = "^plugins/jp2/";
    home["^(CLI|nlohmann)/"] = "^tools/";
    home["^fmt/"] = "^(operations|tools)/";
    home["^png\\.h"] = "^operations/";
    home["^vips/"] = "^plugins/gdball/pictures/vips/";
    # Their traces in public headers, which everybody who includes them has to have installed.
    split("toolkit/xml/xmldocument.h toolkit/xml/xmlutil.h datasources/iomanager/xalanselect.h", names, " ");
    for (n in names)
        mayShow[names[n]] = 1;
}

function folder(path,    parts, count)
{
    count = split(path, parts, "/");
    if (parts[1] == "toolkit" || parts[1] == "gobs" || parts[1] == "operations" || parts[1] == "krv")
        return parts[1];
    return count < 2 ? parts[1] : parts[1] "/" parts[2];
}

function complain(text)
{
    printf "%s:%d: %s\n", FILENAME, FNR, text;
    bad = 1;
}

# Whether a folder above the file is one that may see the other by name.
function isOpening(to,    path)
{
    path = FILENAME;
    while (sub(/\/[^\/]*$/, "", path))
        if ((path, to) in opens)
            return 1;
    return 0;
}

# The room of the plug-ins' base that a path lies in; empty in the folder itself.
function room(path,    parts, count)
{
    count = split(path, parts, "/");
    return count > 3 ? parts[3] : "";
}

function stepOf(path)
{
    return room(path) in step ? step[room(path)] : lastStep;
}

function checkRooms(target)
{
    if (target ~ /^plugins\/support\// && FILENAME ~ /^plugins\/support\// && room(FILENAME) != room(target) &&
        stepOf(target) >= stepOf(FILENAME))
        complain("plugins/support/" room(FILENAME) " does not include " target ": its rooms point one way");
}

function checkOrder(from, to, target)
{
    if (from == to || (FILENAME, to) in upward)
        return;
    if (from ~ /^plugins\//) {
        if (!(to in forPlugins) && !isOpening(to))
            complain("a plug-in does not include " target);
        else if (from == "plugins/support" && to ~ /^plugins\//)
            complain("the base of the plug-ins does not include " target);
    }
    else if (from ~ /^tools\//) {
        if (!(to in rank))
            complain("a tool does not include " target);
    }
    else if (!(to in rank) || rank[to] >= rank[from])
        complain(from " does not include " target ": includes point downwards only");
}

function checkOwn(target)
{
    checkOrder(folder(FILENAME), folder(target), target);
    checkRooms(target);
    if ((getline unused < (root "/" target)) < 0)
        complain("no such file from the root: " target);
    close(root "/" target);
    if (match(target, /(^|\/)detail\//)) {
        owner = target ~ /^(toolkit|gobs|datasources|operations|krv)\// ? substr(target, 1, index(target, "/")) : substr(target, 1, RSTART);
        if (index(FILENAME, owner) != 1)
            complain(target " is private to " owner);
        else if (FILENAME ~ /\.h$/ && FILENAME !~ /\/detail\// && FILENAME ~ /^(toolkit|gobs|datasources|operations|krv)\//)
            complain("a public header does not include the private " target);
    }
}

# A source begins with its own header, which so compiles without help.
function checkFirst(target,    own)
{
    own = FILENAME;
    if (++includes > 1 || !sub(/\.cpp$/, ".h", own) || target == own)
        return;
    if ((getline unused < (root "/" own)) >= 0)
        complain("the first include is not " own);
    close(root "/" own);
}

function checkForeign(target,    library)
{
    for (library in home) {
        if (target !~ library)
            continue;
        if (FILENAME !~ home[library])
            complain("<" target "> is not for this folder");
        else if (FILENAME ~ /\.h$/ && FILENAME !~ /\/detail\// && FILENAME ~ /^(toolkit|gobs|datasources|operations|krv)\// &&
                 !(FILENAME in mayShow))
            complain("a public header does not show <" target ">");
    }
}

FNR == 1 {
    includes = 0;
    ++files;
}

/^#include "/ {
    split($0, quoted, "\"");
    checkFirst(quoted[2]);
    checkOwn(quoted[2]);
}

/^#include </ {
    split($0, pointed, /[<>]/);
    checkFirst("");
    checkForeign(pointed[2]);
}

/^#pragma once/ { once[FILENAME] = 1 }

FILENAME ~ /\.h$/ { headers[FILENAME] = 1 }

END {
    for (header in headers) {
        if (!(header in once)) {
            print header ": no #pragma once";
            bad = 1;
        }
    }
    if (files < 1) {
        print "no sources were given";
        bad = 1;
    }
    if (!bad)
        print files " files keep the layers";
    exit bad;
}

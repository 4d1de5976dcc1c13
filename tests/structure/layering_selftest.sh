#!/usr/bin/env bash
# The layering check finds what it is there for: a tree with one fault of each kind, each of them reported.
set -euo pipefail
oHere=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
oTree=$(mktemp -d)
trap 'rm -rf "$oTree"' EXIT
cd "$oTree"

# put FILE LINE...: a file of these lines; headers get their guard.
put()
{
    mkdir -p "$(dirname "$1")"
    local oFile=$1
    shift
    { [[ $oFile != *.h ]] || echo '#pragma once'; printf '%s\n' "$@"; } >"$oFile"
}

put toolkit/core/core.h '#include <string>'
put toolkit/core/detail/inner.h
put gobs/raster/raster.h '#include "toolkit/core/core.h"'
put datasources/interfaces/idataset.h '#include "gobs/raster/raster.h"'
put datasources/metadata/tags.h '#include "datasources/interfaces/idataset.h"'
put datasources/metadata/nodatavalue.cpp '#include "datasources/reader/reader.h"'
put datasources/formatregistrar/registrar.h
put datasources/iomanager/datasetmanager.cpp '#include "datasources/formatregistrar/registrar.h"'
put datasources/iomanager/manager.h
put datasources/datasets/memory.h '#include "datasources/iomanager/manager.h"'
put datasources/reader/reader.h '#include "datasources/metadata/tags.h"' '#include "datasources/datasets/memory.h"'
put datasources/writer/writer.h '#include "datasources/reader/reader.h"'
put datasources/mosaic/mosaic.h '#include "datasources/reader/reader.h"'
put datasources/overviews/overviews.h '#include "datasources/writer/writer.h"' '#include "datasources/mosaic/mosaic.h"'
put datasources/maskbuilder/masks.h '#include "datasources/overviews/overviews.h"'
put datasources/utils/links.h '#include "datasources/maskbuilder/masks.h"'
put operations/statistics/job.cpp '#include "operations/statistics/job.h"' '#include <fmt/format.h>'
put operations/statistics/job.h '#include "datasources/utils/links.h"'
put krv/krv.h '#include "datasources/utils/links.h"'
put plugins/support/base.h '#include "datasources/metadata/tags.h"' '#include "plugins/support/writing/writer.h"'
put plugins/support/file/file.h
put plugins/support/sidecar/sidecar.cpp '#include "datasources/iomanager/manager.h"' '#include "plugins/support/file/file.h"'
put plugins/support/sidecar/names.h
put plugins/support/writing/writer.h '#include "plugins/support/sidecar/names.h"'
put plugins/abc/abc.h '#include "plugins/support/base.h"'
put plugins/krvdsk/link.cpp '#include "datasources/iomanager/manager.h"'
put plugins/gdball/generic.cpp '#include "datasources/iomanager/manager.h"'
put plugins/mosaic/sources.cpp '#include "datasources/iomanager/manager.h"' '#include "datasources/mosaic/mosaic.h"'
put tools/krv/main.cpp '#include "operations/statistics/job.h"' '#include <fmt/format.h>'
"$oHere/layering.sh" "$oTree" || { echo "a clean tree is refused" >&2; exit 1; }

# fault FILE LINE: alone in the clean tree, it must be found in that file.
nFaults=0
fault()
{
    local oFile=$1 oBefore="" oFound
    [ ! -e "$oFile" ] || oBefore=$(cat "$oFile"; echo .)
    put "$@"
    if oFound=$("$oHere/layering.sh" "$oTree" 2>&1) || [[ $oFound != "$oFile:"* ]]; then
        echo "not found: $* (the check said: $oFound)" >&2
        exit 1
    fi
    if [ -n "$oBefore" ]; then printf '%s' "${oBefore%.}" >"$oFile"; else rm "$oFile"; fi
    nFaults=$((nFaults + 1))
}

fault toolkit/core/up.cpp '#include "gobs/raster/raster.h"'
fault gobs/raster/up.h '#include "datasources/interfaces/idataset.h"'
fault datasources/interfaces/up.h '#include "datasources/metadata/tags.h"'
fault datasources/metadata/other.cpp '#include "datasources/reader/reader.h"'
fault datasources/metadata/upward.h '#include "datasources/reader/reader.h"'
fault datasources/datasets/beside.cpp '#include "datasources/formatregistrar/registrar.h"'
fault datasources/datasets/up.cpp '#include "datasources/reader/reader.h"'
fault datasources/writer/beside.cpp '#include "datasources/mosaic/mosaic.h"'
fault datasources/reader/up.cpp '#include "datasources/overviews/overviews.h"'
fault datasources/writer/up.h '#include "datasources/overviews/overviews.h"'
fault datasources/overviews/up.h '#include "datasources/maskbuilder/masks.h"'
fault datasources/maskbuilder/up.cpp '#include "datasources/utils/links.h"'
fault datasources/utils/up.cpp '#include "operations/statistics/job.h"'
fault datasources/reader/plug.cpp '#include "plugins/abc/abc.h"'
fault datasources/reader/job.cpp '#include "operations/statistics/job.h"'
fault krv/jobs.h '#include "operations/statistics/job.h"'
fault datasources/utils/common.cpp '#include "krv/krv.h"'
fault operations/statistics/up.cpp '#include "tools/krv/main.h"'
fault operations/statistics/json.cpp '#include <nlohmann/json.hpp>'
fault operations/statistics/shown.h '#include <fmt/format.h>'
fault plugins/abc/job.cpp '#include "operations/statistics/job.h"'
fault plugins/abc/up.cpp '#include "datasources/reader/reader.h"'
fault plugins/abc/open.cpp '#include "datasources/iomanager/manager.h"'
fault plugins/abc/sidecar/open.cpp '#include "datasources/iomanager/manager.h"'
fault plugins/support/image/open.cpp '#include "datasources/iomanager/manager.h"'
fault plugins/support/sidecar/up.cpp '#include "plugins/support/writing/writer.h"'
fault plugins/support/image/beside.cpp '#include "plugins/support/sidecar/names.h"'
fault plugins/support/writing/base.cpp '#include "plugins/support/base.h"'
fault plugins/gdball/mosaic.cpp '#include "datasources/mosaic/mosaic.h"'
fault plugins/mosaic/up.cpp '#include "datasources/reader/reader.h"'
fault plugins/xyz/beside.cpp '#include "plugins/abc/abc.h"'
fault plugins/support/up.cpp '#include "plugins/abc/abc.h"'
fault tools/krv/direct.cpp '#include "plugins/abc/abc.h"'
fault gobs/raster/inner.cpp '#include "toolkit/core/detail/inner.h"'
fault toolkit/core/shown.h '#include "toolkit/core/detail/inner.h"'
fault toolkit/core/core.cpp '#include <string>' '#include "toolkit/core/core.h"'
fault toolkit/core/relative.cpp '#include "core.h"'
fault gobs/raster/text.cpp '#include <fmt/format.h>'
fault datasources/metadata/shown.h '#include <boost/regex.hpp>'

printf '#include <string>\n' >toolkit/core/twice.h
if "$oHere/layering.sh" "$oTree" >/dev/null; then
    echo "not found: a header without a guard" >&2
    exit 1
fi
echo "a clean tree passes; $((nFaults + 1)) faults were found, each alone"

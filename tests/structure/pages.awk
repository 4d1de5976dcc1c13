# Makes one source of the blocks of code in pages, each a function by itself, with what the pages take as given: readers,
# a raster, a transform and sizes. It is compiled, not run: the files that it names are those of a reader's own.
# Usage: awk -f pages.awk PAGE... >SOURCE
BEGIN {
    print "#include <krv/krv.h>\n#include \"datasources/datasets/constrasterdataset.h\""
    print "#include \"datasources/datasets/metacomplexdataset.h\"\n#include \"datasources/reader/derived/pctrasterreader.h\""
    print "#include \"datasources/reader/derived/rastercache.h\"\n#include \"datasources/writer/memorywriter.h\""
    print "#include \"datasources/reader/derived/totalpowerrasterreader.h\"\n#include \"datasources/writer/multitypewriter.h\""
    print "#include \"toolkit/cache/tilestore.h\"\n"
    print "extern krv::IRasterReader &oReader, &oTransform, &oSource;\nextern krv::Raster& oRaster;"
    print "extern const krv::GeocodingInfo &oInfo, &oTargetGeocoding, &oSourceGeocoding;"
    print "extern const unsigned int nWidth, nHeight;\n"
}
/^```cpp/ { printf "void Block%d() // %s\n{\n", ++count, FILENAME; inside = 1; next }
/^```/ && inside { print "}\n"; inside = 0; next }
inside { print }
END { exit count < 10 }

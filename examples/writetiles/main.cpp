// Writes the first channel of a file with all its bits turned round into a new file, tile by tile.
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/exceptions/exceptions.h"

#include <exception>
#include <iostream>

int main(int nArguments, char** pArguments)
try
{
    if (nArguments != 3)
    {
        std::cerr << "usage: writetiles FROM TO.tif\n";
        return 2;
    }
    krv::datasources::BasicReader oReader(pArguments[1], {1});
    oReader.SetTileSize(512, 512);
    // On a name that is free; krv::datasources::ReplacingWriter takes the place of a file that has it.
    krv::datasources::BasicWriter oWriter(pArguments[2], {1}, "TIF", "COMPRESS=DEFLATE");
    if (oWriter.FileExists())
    {
        std::cerr << "writetiles: " << pArguments[2] << " is there already\n";
        return 1;
    }
    oWriter.CreateNewFile(krv::gobs::RasterInfo(oReader.GetWidth(), oReader.GetHeight(), 1, oReader.GetDataType()));
    for (const std::unique_ptr<krv::gobs::Raster> oTile : krv::datasources::RasterRange(oReader))
    {
        for (std::uint64_t n = 0; n < oTile->GetBufferSize(); ++n)
            oTile->GetBuffer()[n] = static_cast<unsigned char>(~oTile->GetBuffer()[n]);
        oWriter.WriteRaster(oTile.get());
    }
    // The file is there from here on. A writer that goes without this drops everything, with a warning.
    oWriter.Synchronize();
    std::cout << pArguments[2] << " has " << oReader.GetTileCount() << " tiles of " << pArguments[1] << "\n";
}
catch (const std::exception& oError)
{
    std::cerr << "writetiles: " << oError.what() << "\n";
    return 1;
}

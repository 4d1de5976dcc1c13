// Writes a new file tile by tile: heights of a made-up hill, with its place on the ground, a no-data value and levels.
#include <krv/krv.h>

#include <algorithm>
#include <cmath>
#include <exception>
#include <iostream>

int main(int nArguments, char** pArguments)
try
{
    constexpr unsigned int SIZE = 1000, TILE = 256;
    constexpr float NO_DATA = -9999;
    if (nArguments != 2)
    {
        std::cerr << "usage: newfile TO.tif\n";
        return 2;
    }
    // A name that is taken is an error; krv::ReplacingWriter takes the place of the file that has it.
    const auto poWriter =
        krv::CreateWriter(pArguments[1], krv::RasterInfo(SIZE, SIZE, 1, krv::eDT_32R), "TIF", "COMPRESS=DEFLATE");

    // Pixels of 10 m from the upper left corner on; rows go south.
    poWriter->SetGeocodingInfo(krv::GeocodingInfo(500000, 10, 0, 7100000, 0, -10));
    poWriter->SetCRS(krv::CreateCRSFromEPSG(32719).get());
    krv::AuxiliaryData oRecord(1);
    oRecord.SetFileMetadataValue("AREA_NAME", "A hill");
    oRecord.SetChannelDescription("height in metres", 1);
    krv::SetNoData(oRecord, NO_DATA, 1);
    poWriter->SetAuxiliaryData(oRecord);

    for (unsigned int nY = 0; nY < SIZE; nY += TILE)
        for (unsigned int nX = 0; nX < SIZE; nX += TILE)
        {
            krv::Raster oTile({std::min(TILE, SIZE - nX), std::min(TILE, SIZE - nY), 1, krv::eDT_32R},
                              {static_cast<int>(nX), static_cast<int>(nY)});
            const krv::RasterView<float> oHeights(oTile);
            for (unsigned int nRow = 0; nRow < oTile.GetHeight(); ++nRow)
                for (unsigned int nColumn = 0; nColumn < oTile.GetWidth(); ++nColumn)
                {
                    const double nAside = std::hypot(nX + nColumn - 500.0, nY + nRow - 500.0);
                    oHeights.At(nColumn, nRow, 0) = nAside < 500 ? static_cast<float>(500 - nAside) : NO_DATA;
                }
            poWriter->WriteRaster(&oTile);
        }
    // Averages of what is valid, in one pass over the image.
    krv::BuildOverviews(*poWriter, krv::GetDefaultLevels(SIZE, SIZE), "AVERAGE");
    // The file is there from here on. A writer that goes without this drops everything, with a warning.
    poWriter->Synchronize();
    std::cout << pArguments[1] << " is written\n";
}
catch (const std::exception& oError)
{
    std::cerr << "newfile: " << oError.what() << "\n";
    return 1;
}

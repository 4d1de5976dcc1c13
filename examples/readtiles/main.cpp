// Reads three channels tile by tile, each tile with 8 pixels of its neighbours around it.
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <exception>
#include <iostream>

int main(int nArguments, char** pArguments)
try
{
    krv::datasources::BasicReader oReader(nArguments > 1 ? pArguments[1] : "scene.tif", {1, 2, 3});
    oReader.SetTileSize(512, 512);
    oReader.SetMargins(8, 8, eMirror);

    unsigned long long nSum = 0, nPixels = 0;
    for (const std::unique_ptr<krv::gobs::Raster> oTile : krv::datasources::RasterRange(oReader))
    {
        nPixels += oTile->GetFullWidth() * oTile->GetFullHeight();
        for (std::uint64_t n = 0; n < oTile->GetBufferSize(); ++n)
            nSum += oTile->GetBuffer()[n];
    }
    std::cout << oReader.GetWidth() << " x " << oReader.GetHeight() << " pixels in " << oReader.GetTileCount()
              << " tiles; " << nPixels << " pixels with margins, sum " << nSum << "\n";

    const krv::datasources::AuxiliaryData oTags = oReader.GetAuxiliaryData();
    for (const auto& [key, value] : oTags.GetFileMetadata())
        std::cout << key << " = " << value << "\n";
    const std::unique_ptr<krv::ogc::cs::ICRS> oSystem(oReader.GetCRS());
    const std::unique_ptr<krv::ogc::cs::GeocodingInfo> oGround(oReader.GetGeocodingInfo());
    if (oSystem && oGround)
        std::cout << oSystem->GetName() << ", " << oGround->GetColumnSpacing() << " " << oSystem->GetUnitName()
                  << " per pixel, from " << oGround->GetXOffset() << " " << oGround->GetYOffset() << "\n";
}
catch (const krv::FileNotFoundException& oError)
{
    std::cerr << "readtiles: there is no file " << oError.GetFileName() << "\n";
    return 1;
}
catch (const krv::FileException& oError)
{
    // The manager itself says no more than that no format takes the file: the message is empty then.
    std::cerr << "readtiles: " << oError.GetFileName() << " cannot be read. " << oError.GetMessage() << "\n";
    return 1;
}
catch (const std::exception& oError)
{
    std::cerr << "readtiles: " << oError.what() << "\n";
    return 1;
}

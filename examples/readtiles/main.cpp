// Reads three channels tile by tile, each tile with 8 pixels of its neighbours around it.
#include <krv/krv.h>

#include <exception>
#include <iostream>

int main(int nArguments, char** pArguments)
try
{
    // The margins are those of the image wherever they lie inside, whatever the tiles; beyond its borders mirrored.
    const auto poReader = krv::OpenHaloReader(nArguments > 1 ? pArguments[1] : "scene.tif", {1, 2, 3}, 8, krv::eMirror);
    poReader->SetTileSize(512, 512);

    double nSum = 0;
    std::uint64_t nPixels = 0;
    for (const std::unique_ptr<krv::Raster> poTile : krv::RasterRange(*poReader))
    {
        const krv::RasterView<const std::uint8_t> oValues(*poTile); // throws for a file of another type
        const auto nLastRow = static_cast<std::ptrdiff_t>(poTile->GetHeight() + poTile->GetYMargin());
        for (std::ptrdiff_t nRow = -8; nRow < nLastRow; ++nRow)
            for (const std::uint8_t nValue : oValues.GetFullRow(nRow)) // the channels of a pixel side by side
                nSum += nValue;
        nPixels += poTile->GetFullWidth() * poTile->GetFullHeight();
    }
    std::cout << poReader->GetWidth() << " x " << poReader->GetHeight() << " pixels in " << poReader->GetTileCount()
              << " tiles; " << nPixels << " pixels with margins, sum " << nSum << "\n";

    const krv::AuxiliaryData oTags = poReader->GetAuxiliaryData();
    for (const auto& [key, value] : oTags.GetFileMetadata())
        std::cout << key << " = " << value << "\n";
    const auto poSystem = krv::GetCRS(*poReader);
    const auto oGround = krv::GetGeocoding(*poReader);
    if (poSystem && oGround)
        std::cout << poSystem->GetName() << ", " << oGround->GetColumnSpacing() << " " << poSystem->GetUnitName()
                  << " per pixel, from " << oGround->GetXOffset() << " " << oGround->GetYOffset() << "\n";
}
catch (const std::exception& oError)
{
    std::cerr << "readtiles: " << oError.what() << "\n"; // names the file and the cause
    return 1;
}

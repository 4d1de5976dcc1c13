// Resamples a scene to the grid of another file in the same reference system, so that pixel lies on pixel.
#include <krv/krv.h>

#include <exception>
#include <iostream>
#include <memory>
#include <stdexcept>

int main(int nArguments, char** pArguments)
try
{
    if (nArguments != 4)
        throw std::invalid_argument("usage: togrid SCENE LIKE TO.tif");
    const auto poScene = krv::OpenReader(pArguments[1]);
    const auto poLike = krv::OpenReader(pArguments[2], {1});
    const auto poOne = krv::GetCRS(*poScene), poOther = krv::GetCRS(*poLike);
    const auto oFrom = krv::GetGeocoding(*poScene), oTo = krv::GetGeocoding(*poLike);
    if (!poOne || !poOther || !oFrom || !oTo)
        throw std::runtime_error("one of the files does not say where it lies");
    if (!poOne->IsEquivalent(*poOther))
        throw std::runtime_error("the files are in " + poOne->GetName() + " and " + poOther->GetName());

    // A reader like any other: the scene in the other grid. Pixels are made window by window as they are read, from
    // levels of the scene where the grid is coarser; what is not valid takes no part.
    const auto poMap = std::make_shared<krv::AffineMap>(*oTo, *oFrom);
    krv::TransformRequest oRequest{poLike->GetWidth(), poLike->GetHeight(), krv::Resampling::eCubic};
    oRequest.moGeocoding = *oTo;
    krv::TransformRasterReader oReader(poScene.get(), poMap, oRequest, false);

    const auto poWriter = krv::CreateWriter(
        pArguments[3],
        krv::RasterInfo(oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()), "TIF",
        "COMPRESS=DEFLATE");
    for (const std::string& line : krv::CopyAllButPixels(oReader, *poWriter))
        std::cerr << "togrid: " << line << "\n";
    oReader.SetTileSize(poWriter->GetTileWidth(), poWriter->GetTileHeight()); // each block of the file is encoded once
    for (const std::unique_ptr<krv::Raster> poTile : krv::RasterRange(oReader))
        poWriter->WriteRaster(poTile.get());
    poWriter->Synchronize();
    std::cout << pArguments[3] << " has " << oReader.GetWidth() << " x " << oReader.GetHeight() << " pixels\n";
}
catch (const std::exception& oError)
{
    std::cerr << "togrid: " << oError.what() << "\n";
    return 1;
}

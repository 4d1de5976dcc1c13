// Marks the pixels of an 8-bit file that are darker than a limit as not valid, by a mask of validity in the file. Then
// counts the valid pixels as everybody sees them: by no-data values, mask and alpha together.
#include <krv/krv.h>

#include "datasources/interfaces/ibitmapdataset.h"
#include "toolkit/core/numbertext.h"

#include <algorithm>
#include <iostream>

static void MarkDark(krv::IDataset& oDataset, int nLimit)
{
    auto& oBitmaps = dynamic_cast<krv::datasources::IBitmapDataset&>(oDataset); // throws for a format without bitmaps
    const unsigned int nOld = krv::datasources::FindValidityMask(oBitmaps);
    const unsigned int nMask = nOld != 0 ? nOld : oBitmaps.CreateBitmap();
    oBitmaps.SetBitmapDescription(nMask, "");   // a bitmap without a description says what is valid; others are zones
    krv::BasicWriter oMask(&oBitmaps, {nMask}); // a byte for each pixel: 0 is not valid
    const auto poReader = krv::OpenReader(oDataset, {1});
    for (const std::unique_ptr<krv::Raster> poTile : krv::RasterRange(*poReader))
    {
        const krv::RasterView<std::uint8_t> oPixels(*poTile);
        for (unsigned int nRow = 0; nRow < poTile->GetHeight(); ++nRow)
            for (std::uint8_t& nPixel : oPixels.GetRow(nRow))
                nPixel = nPixel >= nLimit ? 1 : 0;
        oMask.WriteRaster(poTile.get());
    }
    oDataset.Synchronize();
}

static std::uint64_t CountValid(krv::IDataset& oDataset)
{
    const auto poReader = krv::OpenReader(oDataset);
    krv::ReaderValidity oValidity(*poReader);
    std::uint64_t nValid = 0;
    for (unsigned int nY = 0, nRows; nY < poReader->GetHeight(); nY += nRows)
    {
        nRows = std::min(256U, poReader->GetHeight() - nY);
        krv::Raster oPixels({poReader->GetWidth(), nRows, poReader->GetChansCount(), poReader->GetDataType()},
                            {0, static_cast<int>(nY)});
        const std::unique_ptr<krv::Mask> poValid = oValidity.Read(oPixels); // null: all of them
        nValid += poValid ? poValid->CountSet() : std::uint64_t{oPixels.GetWidth()} * nRows;
    }
    return nValid;
}

int main(int nArguments, char** pArguments)
try
{
    const auto oLimit = krv::ParseNumber<int>(nArguments == 3 ? pArguments[2] : "");
    if (!oLimit)
        throw std::invalid_argument("usage: validity FILE LIMIT");
    const auto poDataset = krv::Open(pArguments[1], krv::eUpdate);
    MarkDark(*poDataset, *oLimit);
    std::cout << CountValid(*poDataset) << " pixels are valid\n";
}
catch (const std::exception& oError)
{
    std::cerr << "validity: " << oError.what() << "\n";
    return 1;
}

#include "tools/krv/copypixels.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hmalloc.h"
#include "toolkit/raster/copydata.h"
#include "tools/krv/progress.h"

#include <algorithm>
#include <memory>

namespace krv::tool
{

using krv::datasources::IRasterReader;
using krv::datasources::IRasterWriter;
using krv::gobs::Raster;
using krv::gobs::RasterContext;
using krv::gobs::RasterInfo;

namespace
{

constexpr std::uint64_t LARGEST_PIECE = std::uint64_t{64} << 20;

struct Free
{
    void operator()(unsigned char* pBlock) const { HFree(pBlock); }
};
using Buffer = std::unique_ptr<unsigned char, Free>;

Buffer Allocate(std::uint64_t nBytes)
{
    return Buffer(static_cast<unsigned char*>(HMalloc(nBytes)));
}

struct PieceSize
{
    unsigned int width;
    unsigned int height;
};

std::uint64_t PixelBytes(const IRasterReader& oReader)
{
    return krv::gobs::BufferBytes(1, 1, oReader.GetChansCount(), oReader.GetDataType());
}

// So many whole blocks that one block of a source fits in, as long as the piece stays in its bounds.
unsigned int Stretch(unsigned int nBlock, unsigned int nSourceBlock, unsigned int nImage, std::uint64_t nOneBytes)
{
    nBlock = std::clamp(nBlock, 1U, nImage);
    const std::uint64_t nMost = std::max<std::uint64_t>(LARGEST_PIECE / std::max<std::uint64_t>(nOneBytes, 1), 1);
    const std::uint64_t nWanted =
        std::min<std::uint64_t>((std::min(nSourceBlock, nImage) + nBlock - 1) / nBlock, nMost);
    return static_cast<unsigned int>(std::min<std::uint64_t>(std::max<std::uint64_t>(nWanted, 1) * nBlock, nImage));
}

PieceSize ChoosePiece(const std::vector<CopySource>& oSources, const IRasterWriter& oWriter)
{
    std::uint64_t nPixelBytes = PixelBytes(oWriter);
    unsigned int nWidth = 1, nHeight = 1;
    for (const CopySource& oSource : oSources)
    {
        nPixelBytes = std::max(nPixelBytes, PixelBytes(*oSource.reader));
        nWidth = std::max(nWidth, oSource.reader->GetTileWidth());
        nHeight = std::max(nHeight, oSource.reader->GetTileHeight());
    }
    const std::uint64_t nBlockBytes = nPixelBytes * oWriter.GetTileWidth() * oWriter.GetTileHeight();
    PieceSize oSize{Stretch(oWriter.GetTileWidth(), nWidth, oWriter.GetWidth(), nBlockBytes), 1};
    oSize.height = Stretch(oWriter.GetTileHeight(), nHeight, oWriter.GetHeight(),
                           nPixelBytes * oSize.width * oWriter.GetTileHeight());
    return oSize;
}

// Whether the source's pixels are just the ones to be written.
bool IsDirect(const CopySource& oSource, const IRasterWriter& oWriter)
{
    if (oSource.reader->GetDataType() != oWriter.GetDataType() || oSource.positions.size() != oWriter.GetChansCount())
        return false;
    for (std::size_t i = 0; i < oSource.positions.size(); ++i)
    {
        if (oSource.positions[i] != i)
            return false;
    }
    return true;
}

// Channels that are side by side in both places are copied in one go.
void Place(const CopySource& oSource, const unsigned char* pPixels, Raster& oTarget)
{
    const auto eFrom = krv::gobs::QRFDataType2RasterBufferType(oSource.reader->GetDataType());
    const auto eTo = krv::gobs::QRFDataType2RasterBufferType(oTarget.GetDataType());
    const std::uint64_t nPixels = std::uint64_t{oTarget.GetWidth()} * oTarget.GetHeight();
    const std::size_t nChannels = oSource.positions.size();
    for (std::size_t nAt = 0, nRun = 1; nAt < nChannels; nAt += nRun)
    {
        nRun = 1;
        while (nAt + nRun < nChannels && oSource.positions[nAt + nRun] == oSource.positions[nAt] + nRun)
            ++nRun;
        krv::raster::CopyData(pPixels + krv::raster::BufferDataSize(eFrom, nAt), eFrom, nChannels,
                              oTarget.GetBuffer() + krv::raster::BufferDataSize(eTo, oSource.positions[nAt]), eTo,
                              oTarget.GetChansCount(), nPixels, static_cast<unsigned int>(nRun));
    }
}

} // namespace

void CopyPixels(const std::vector<CopySource>& oSources, IRasterWriter& oWriter, const PixelWindow& oWindow,
                Progress& oProgress)
{
    const PieceSize oSize = ChoosePiece(oSources, oWriter);
    const std::uint64_t nPixels = std::uint64_t{oSize.width} * oSize.height;
    const bool bDirect = oSources.size() == 1 && IsDirect(oSources.front(), oWriter);
    const Buffer pTarget = Allocate(nPixels * PixelBytes(oWriter));
    std::uint64_t nScratch = 0;
    for (const CopySource& oSource : oSources)
        nScratch = bDirect ? 0 : std::max(nScratch, nPixels * PixelBytes(*oSource.reader));
    const Buffer pScratch = Allocate(nScratch);
    for (unsigned int nY = 0; nY < oWindow.height; nY += std::min(oSize.height, oWindow.height - nY))
    {
        for (unsigned int nX = 0; nX < oWindow.width; nX += std::min(oSize.width, oWindow.width - nX))
        {
            const unsigned int nWidth = std::min(oSize.width, oWindow.width - nX);
            const unsigned int nHeight = std::min(oSize.height, oWindow.height - nY);
            Raster oPiece(RasterInfo(nWidth, nHeight, oWriter.GetChansCount(), oWriter.GetDataType()),
                          RasterContext(static_cast<int>(nX), static_cast<int>(nY)), pTarget.get(), false);
            for (const CopySource& oSource : oSources)
            {
                Raster oPart(
                    RasterInfo(nWidth, nHeight, oSource.reader->GetChansCount(), oSource.reader->GetDataType()),
                    RasterContext(static_cast<int>(oWindow.x + nX), static_cast<int>(oWindow.y + nY)),
                    bDirect ? pTarget.get() : pScratch.get(), false);
                oSource.reader->ReadRaster(&oPart);
                if (!bDirect)
                    Place(oSource, oPart.GetBuffer(), oPiece);
            }
            oWriter.WriteRaster(&oPiece);
            oProgress.Advance(oPiece.GetBufferSize());
        }
    }
}

} // namespace krv::tool

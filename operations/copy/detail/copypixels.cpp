#include "operations/copy/detail/copypixels.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "operations/job/progress.h"
#include "toolkit/core/hmalloc.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/merger.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>
#include <optional>

namespace krv::operations::detail
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
    std::uint64_t nSourceBytes = 0; // of a pixel of all sources: their buffers are there at one time
    unsigned int nWidth = 1, nHeight = 1;
    for (const CopySource& oSource : oSources)
    {
        nSourceBytes += PixelBytes(*oSource.reader);
        nWidth = std::max(nWidth, oSource.reader->GetTileWidth());
        nHeight = std::max(nHeight, oSource.reader->GetTileHeight());
    }
    const std::uint64_t nPixelBytes = std::max(PixelBytes(oWriter), nSourceBytes);
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

void MakeMerger(const std::vector<CopySource>& oSources, const IRasterWriter& oWriter,
                std::optional<krv::raster::Merger>& oMerger)
{
    std::vector<krv::raster::MergeSource> oBuffers;
    std::vector<krv::raster::MergeChannel> oChannels(oWriter.GetChansCount());
    for (unsigned int nSource = 0; nSource < oSources.size(); ++nSource)
    {
        const CopySource& oSource = oSources[nSource];
        oBuffers.push_back(
            {krv::gobs::QRFDataType2RasterBufferType(oSource.reader->GetDataType()), oSource.reader->GetChansCount()});
        for (unsigned int nChannel = 0; nChannel < oSource.positions.size(); ++nChannel)
            oChannels.at(oSource.positions[nChannel]) = {nSource, nChannel};
    }
    oMerger.emplace(oBuffers, krv::gobs::QRFDataType2RasterBufferType(oWriter.GetDataType()), oChannels);
}

} // namespace

void CopyPixels(const std::vector<CopySource>& oSources, IRasterWriter& oWriter, const PixelWindow& oWindow,
                ProgressCounter& oCounter)
{
    if (oWriter.GetWidth() != oWindow.width || oWriter.GetHeight() != oWindow.height)
        throw krv::DataException(fmt::format("what was laid out with {} x {} pixels says to be of {} x {}",
                                             oWindow.width, oWindow.height, oWriter.GetWidth(), oWriter.GetHeight()));
    const PieceSize oSize = ChoosePiece(oSources, oWriter);
    const std::uint64_t nPixels = std::uint64_t{oSize.width} * oSize.height;
    const bool bDirect = oSources.size() == 1 && IsDirect(oSources.front(), oWriter);
    const Buffer pTarget = Allocate(nPixels * PixelBytes(oWriter));
    std::optional<krv::raster::Merger> oMerger;
    std::vector<Buffer> oBuffers;
    std::vector<const unsigned char*> oParts;
    if (!bDirect)
    {
        MakeMerger(oSources, oWriter, oMerger);
        for (const CopySource& oSource : oSources)
        {
            oBuffers.push_back(Allocate(nPixels * PixelBytes(*oSource.reader)));
            oParts.push_back(oBuffers.back().get());
        }
    }
    for (unsigned int nY = 0; nY < oWindow.height; nY += std::min(oSize.height, oWindow.height - nY))
    {
        for (unsigned int nX = 0; nX < oWindow.width; nX += std::min(oSize.width, oWindow.width - nX))
        {
            const unsigned int nWidth = std::min(oSize.width, oWindow.width - nX);
            const unsigned int nHeight = std::min(oSize.height, oWindow.height - nY);
            Raster oPiece(RasterInfo(nWidth, nHeight, oWriter.GetChansCount(), oWriter.GetDataType()),
                          RasterContext(static_cast<int>(nX), static_cast<int>(nY)), pTarget.get(), false);
            for (std::size_t nSource = 0; nSource < oSources.size(); ++nSource)
            {
                IRasterReader& oReader = *oSources[nSource].reader;
                Raster oPart(RasterInfo(nWidth, nHeight, oReader.GetChansCount(), oReader.GetDataType()),
                             RasterContext(static_cast<int>(oWindow.x + nX), static_cast<int>(oWindow.y + nY)),
                             bDirect ? pTarget.get() : oBuffers[nSource].get(), false);
                oReader.ReadRaster(&oPart);
            }
            if (oMerger)
                oMerger->Run(oParts, oPiece.GetBuffer(), std::uint64_t{nWidth} * nHeight);
            oWriter.WriteRaster(&oPiece);
            oCounter.Advance(oPiece.GetBufferSize());
        }
    }
}

} // namespace krv::operations::detail

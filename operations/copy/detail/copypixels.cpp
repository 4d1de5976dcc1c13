#include "operations/copy/detail/copypixels.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/writer/irasterwriter.h"
#include "datasources/writer/splitwriter.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "operations/job/progress.h"
#include "operations/source/fileworkers.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/merger.h"
#include "toolkit/threading/foreachitem.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>
#include <optional>

namespace krv::operations::detail
{

using krv::datasources::IRasterReader;
using krv::datasources::IRasterWriter;
using krv::datasources::SplitWriter;
using krv::gobs::Raster;
using krv::gobs::RasterContext;
using krv::gobs::RasterInfo;

namespace
{

constexpr std::uint64_t LARGEST_PIECE = std::uint64_t{64} << 20;
// The bytes of pieces that wait to be stored.
constexpr std::uint64_t MOST_WAITING_BYTES = std::uint64_t{256} << 20;

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

// What a thread reads with.
class Worker
{
public:
    Worker(const std::vector<CopySource>& oSources, std::vector<FilePointer> oFiles, const IRasterWriter& oWriter)
        : moSources(oSources), moFiles(std::move(oFiles)), mnChannels(oWriter.GetChansCount()),
          moType(oWriter.GetDataType())
    {
        for (std::size_t n = 0; n < oSources.size(); ++n)
            moReaders.push_back(oSources[n].open(*moFiles[n]));
        if (!IsDirect())
            MakeMerger();
    }

    PieceSize ChoosePiece(const IRasterWriter& oWriter) const
    {
        std::uint64_t nSourceBytes = 0; // of a pixel of all sources: their buffers are there at one time
        unsigned int nWidth = 1, nHeight = 1;
        for (const LevelReader& oReader : moReaders)
        {
            nSourceBytes += PixelBytes(oReader.Get());
            nWidth = std::max(nWidth, oReader.Get().GetTileWidth());
            nHeight = std::max(nHeight, oReader.Get().GetTileHeight());
        }
        const std::uint64_t nPixelBytes = std::max(PixelBytes(oWriter), nSourceBytes);
        const std::uint64_t nBlockBytes = nPixelBytes * oWriter.GetTileWidth() * oWriter.GetTileHeight();
        PieceSize oSize{Stretch(oWriter.GetTileWidth(), nWidth, oWriter.GetWidth(), nBlockBytes), 1};
        oSize.height = Stretch(oWriter.GetTileHeight(), nHeight, oWriter.GetHeight(),
                               nPixelBytes * oSize.width * oWriter.GetTileHeight());
        return oSize;
    }

    // oPart: of the sources; the piece lies at nX, nY of the copy.
    std::shared_ptr<const Raster> Read(const PixelWindow& oPart, unsigned int nX, unsigned int nY)
    {
        const RasterContext oFrom(static_cast<int>(oPart.x), static_cast<int>(oPart.y));
        const auto poPiece = std::make_shared<Raster>(RasterInfo(oPart.width, oPart.height, mnChannels, moType),
                                                      RasterContext(static_cast<int>(nX), static_cast<int>(nY)));
        std::vector<std::unique_ptr<Raster>> oParts;
        std::vector<const unsigned char*> oPixels;
        for (const LevelReader& oSource : moReaders)
        {
            IRasterReader& oReader = oSource.Get();
            const RasterInfo oInfo(oPart.width, oPart.height, oReader.GetChansCount(), oReader.GetDataType());
            oParts.push_back(moMerger ? std::make_unique<Raster>(oInfo, oFrom)
                                      : std::make_unique<Raster>(oInfo, oFrom, poPiece->GetBuffer(), false));
            oReader.ReadRaster(oParts.back().get());
            oPixels.push_back(oParts.back()->GetBuffer());
        }
        if (moMerger)
            moMerger->Run(oPixels, poPiece->GetBuffer(), std::uint64_t{oPart.width} * oPart.height);
        return poPiece;
    }

private:
    // Whether the source's pixels are just the ones to be written.
    bool IsDirect() const
    {
        unsigned int nNext = 0;
        return moReaders.size() == 1 && moReaders.front().Get().GetDataType() == moType &&
               moSources.front().positions.size() == mnChannels &&
               std::all_of(moSources.front().positions.begin(), moSources.front().positions.end(),
                           [&nNext](unsigned int nPosition) { return nPosition == nNext++; });
    }

    void MakeMerger()
    {
        std::vector<krv::raster::MergeSource> oBuffers;
        std::vector<krv::raster::MergeChannel> oChannels(mnChannels);
        for (unsigned int nSource = 0; nSource < moSources.size(); ++nSource)
        {
            const IRasterReader& oReader = moReaders[nSource].Get();
            oBuffers.push_back(
                {krv::gobs::QRFDataType2RasterBufferType(oReader.GetDataType()), oReader.GetChansCount()});
            for (unsigned int nChannel = 0; nChannel < moSources[nSource].positions.size(); ++nChannel)
                oChannels.at(moSources[nSource].positions[nChannel]) = {nSource, nChannel};
        }
        moMerger.emplace(oBuffers, krv::gobs::QRFDataType2RasterBufferType(moType), oChannels);
    }

    const std::vector<CopySource>& moSources;
    std::vector<FilePointer> moFiles;
    std::vector<LevelReader> moReaders;
    unsigned int mnChannels;
    krv::gobs::DataType moType;
    std::optional<krv::raster::Merger> moMerger; // none when the pixels are read in place
};

// Null when one of the files cannot be opened again.
std::unique_ptr<Worker> MakeWorker(const std::vector<CopySource>& oSources, const IRasterWriter& oWriter, bool bAgain)
{
    std::vector<FilePointer> oFiles;
    for (const CopySource& oSource : oSources)
    {
        std::unique_ptr<SourceFile> poAgain = bAgain ? oSource.file->OpenAgain() : nullptr;
        if (bAgain && poAgain == nullptr)
            return nullptr;
        oFiles.push_back(bAgain ? FilePointer(poAgain.release(), {true}) : FilePointer(oSource.file, {false}));
    }
    return std::make_unique<Worker>(oSources, std::move(oFiles), oWriter);
}

// A piece on its way to the file.
struct Piece
{
    std::shared_ptr<const SplitWriter::Encoded> encoded;
    std::uint64_t bytes;
};

} // namespace

void CopyPixels(const std::vector<CopySource>& oSources, const CopyTarget& oTarget, const PixelWindow& oWindow,
                ProgressCounter& oCounter, krv::threading::IExecutor* poExecutor)
{
    IRasterWriter& oWriter = oTarget.writer;
    if (oWriter.GetWidth() != oWindow.width || oWriter.GetHeight() != oWindow.height)
        throw krv::DataException(fmt::format("what was laid out with {} x {} pixels says to be of {} x {}",
                                             oWindow.width, oWindow.height, oWriter.GetWidth(), oWriter.GetHeight()));
    krv::threading::StateStore<Worker> oWorkers([&] { return MakeWorker(oSources, oWriter, true); });
    auto poFirst = MakeWorker(oSources, oWriter, false);
    const PieceSize oSize = poFirst->ChoosePiece(oWriter);
    oWorkers.Add(std::move(poFirst));
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    SplitWriter oSplit(oWriter, oTarget.level, oThreads.GetThreadCount());
    const std::uint64_t nAcross = (std::uint64_t{oWindow.width} + oSize.width - 1) / oSize.width;
    const std::uint64_t nDown = (std::uint64_t{oWindow.height} + oSize.height - 1) / oSize.height;
    const std::uint64_t nPieceBytes = PixelBytes(oWriter) * oSize.width * oSize.height;
    krv::threading::ForEachItem(
        oThreads, nAcross * nDown,
        [&](std::uint64_t nPiece)
        {
            const auto nX = static_cast<unsigned int>(nPiece % nAcross * oSize.width);
            const auto nY = static_cast<unsigned int>(nPiece / nAcross * oSize.height);
            const PixelWindow oPart{oWindow.x + nX, oWindow.y + nY, std::min(oSize.width, oWindow.width - nX),
                                    std::min(oSize.height, oWindow.height - nY)};
            std::shared_ptr<const Raster> poPixels;
            {
                const krv::threading::StateStore<Worker>::Use oWorker(oWorkers);
                poPixels = oWorker->Read(oPart, nX, nY);
            }
            const std::uint64_t nBytes = poPixels->GetBufferSize();
            return Piece{oSplit.Encode(std::move(poPixels)), nBytes};
        },
        [&](const Piece& oPiece)
        {
            oSplit.Store(*oPiece.encoded);
            oCounter.Advance(oPiece.bytes);
        },
        krv::threading::TaskOrder::eAsAdded, MOST_WAITING_BYTES / std::max<std::uint64_t>(nPieceBytes, 1));
}

} // namespace krv::operations::detail

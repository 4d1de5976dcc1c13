// The tiles of a native file as bytes: the facets IEncodedBlocks and IBlockEncoding of its dataset.
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/levelbook.h"
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/support/writing/narrowsamples.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::krvdsk
{

using krv::datasources::BlockNumber;
using krv::datasources::EncodedForm;
using krv::datasources::IBlockEncoder;

namespace
{

// Strips of fewer pixels are not taken over as tiles, unless there is but one.
constexpr std::uint64_t LEAST_STRIP = 32768;
// How many bits are kept of values that have fewer than their type. Others do not take such blocks: they store so many.
constexpr const char* KEPT_BITS = "KEPTBITS";

// Whether all channels are stored in one way, in one plane or each in its own.
bool HasOneForm(const Catalogue& oCatalogue)
{
    if (!oCatalogue.moLinkPath.empty() || oCatalogue.moPlanes.empty())
        return false;
    const Plane& oFirst = *oCatalogue.moPlanes.front();
    return std::all_of(oCatalogue.moPlanes.begin(), oCatalogue.moPlanes.end(),
                       [&](const std::shared_ptr<Plane>& poPlane)
                       {
                           return poPlane->moType == oFirst.moType && poPlane->meCoding == oFirst.meCoding &&
                                  poPlane->mnPredictor == oFirst.mnPredictor &&
                                  poPlane->mnKeptBits == oFirst.mnKeptBits && poPlane->meStorage == oFirst.meStorage &&
                                  poPlane->GetChannels() == poPlane->GetStoredChannels() &&
                                  (oCatalogue.moPlanes.size() == 1 || poPlane->GetChannels() == 1);
                       });
}

bool IsExact(const ImageSize& oSize, const ImageSize& oBlock)
{
    return oSize.mnWidth % oBlock.mnWidth == 0 && oSize.mnHeight % oBlock.mnHeight == 0;
}

bool IsStrip(const EncodedForm& oForm)
{
    return !oForm.mbWholeBlocks && oForm.mnBlockWidth >= oForm.mnWidth;
}

std::optional<Coding> FindCoding(const std::string& name)
{
    for (const Coding eCoding : {Coding::eNone, Coding::eDeflate, Coding::eZstd, Coding::eLz4, Coding::eLzw})
        if (name == GetCodingName(eCoding))
            return eCoding;
    return std::nullopt;
}

// The bits that values keep, 0 for all of them; none when the codec goes by what is not known here.
std::optional<std::uint8_t> FindKeptBits(const EncodedForm& oForm)
{
    if (oForm.moParameters.empty())
        return 0;
    const auto oFound = oForm.moParameters.find(KEPT_BITS);
    const auto oBits =
        oFound == oForm.moParameters.end() ? std::nullopt : krv::ParseNumber<std::uint8_t>(oFound->second);
    const bool bKnown = oForm.moParameters.size() == 1 && oBits && support::CanNarrow(oForm.moType, *oBits);
    return bKnown ? oBits : std::nullopt;
}

// Whether channels of the file's types can be stored so, whatever the grid of tiles.
bool IsPossible(const Catalogue& oCatalogue, const EncodedForm& oForm)
{
    const bool bTypes =
        std::all_of(oCatalogue.moPlanes.begin(), oCatalogue.moPlanes.end(),
                    [&oForm](const std::shared_ptr<Plane>& poPlane) { return poPlane->moType == oForm.moType; });
    return bTypes && oCatalogue.moLinkPath.empty() && oForm.mnChannels != 0 &&
           oForm.mnChannels == oCatalogue.CountChannels() && oForm.mnSampleBits == oForm.moType.GetValueBits() &&
           FindCoding(oForm.moCodec) && !oForm.mbLossy && !oForm.mbBigEndian && FindKeptBits(oForm) &&
           oForm.moTables.empty() && oForm.mnPredictor <= 3 &&
           Plane::CanPredict(static_cast<std::uint8_t>(oForm.mnPredictor), oForm.moType) &&
           (oForm.mnPredictor == 1 || oForm.moCodec != GetCodingName(Coding::eNone)) &&
           oForm.mnBlockWidth - 1 < Catalogue::LARGEST_BLOCK_SIDE &&
           oForm.mnBlockHeight - 1 < Catalogue::LARGEST_BLOCK_SIDE;
}

// Whether tiles of the file's size, cut off at the border of a level, are such blocks.
bool IsOfGrid(const Catalogue& oCatalogue, const EncodedForm& oForm)
{
    const auto Is = [&oForm](unsigned int nOwn, unsigned int nBlock, unsigned int nSize)
    {
        return nBlock == nOwn || (!oForm.mbWholeBlocks && nBlock >= nSize && nOwn >= nSize);
    };
    return Is(oCatalogue.mnBlockWidth, oForm.mnBlockWidth, oForm.mnWidth) &&
           Is(oCatalogue.mnBlockHeight, oForm.mnBlockHeight, oForm.mnHeight);
}

bool IsSameButForSize(EncodedForm oOwn, const EncodedForm& oForm)
{
    oOwn.mnWidth = oForm.mnWidth;
    oOwn.mnHeight = oForm.mnHeight;
    oOwn.mnBlockWidth = oForm.mnBlockWidth;
    oOwn.mnBlockHeight = oForm.mnBlockHeight;
    oOwn.mbWholeBlocks = oForm.mbWholeBlocks;
    return oOwn == oForm;
}

// Has what it needs of the dataset itself.
class TileEncoder : public IBlockEncoder
{
public:
    TileEncoder(const Plane& oPlane, const EncodedForm& oForm, const ImageSize& oBlock, unsigned int nPlanes)
        : moPlane(oPlane), mnPlanes(nPlanes), moLayout(oForm.mnWidth, oForm.mnHeight, oBlock.mnWidth, oBlock.mnHeight,
                                                       {{oPlane.moType, oPlane.GetChannels(), oPlane.moType}}),
          moCodec(moPlane, oBlock)
    {
        moPlane.moTables.clear();
    }

    void Encode(const BlockNumber& oBlock, const unsigned char* pPixels, std::size_t nPitch,
                std::vector<unsigned char>& oBytes) override
    {
        if (oBlock.mnPlane >= mnPlanes || oBlock.mnColumn >= moLayout.GetBlocksAcross() ||
            oBlock.mnRow >= moLayout.GetBlocksDown())
            throw DataException("There is no tile " + std::to_string(oBlock.mnColumn) + ", " +
                                std::to_string(oBlock.mnRow) + " of plane " + std::to_string(oBlock.mnPlane));
        const support::PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
        const auto oCoded = moCodec.Encode(pPixels, nPitch, oRect.mnWidth, oRect.mnHeight);
        oBytes.assign(oCoded.begin(), oCoded.end());
    }

private:
    Plane moPlane;
    unsigned int mnPlanes;
    support::ImageLayout moLayout;
    TileCodec moCodec;
};

} // namespace

// Answers for a linked file that shows all of another one as it is.
krv::datasources::IEncodedBlocks* KrvdskDataset::FindLinkedBlocks(unsigned int nLevel) const
{
    const Catalogue& oCatalogue = GetCatalogue();
    if (oCatalogue.moLinked.empty() || !oCatalogue.moPlanes.empty() || oCatalogue.moLevels.contains(nLevel))
        return nullptr;
    for (std::size_t nAt = 0; nAt < oCatalogue.moLinked.size(); ++nAt)
        if (oCatalogue.moLinked[nAt].mnNumber != nAt + 1)
            return nullptr;
    const auto* const poRaster = mpoLink->Find<krv::datasources::IRasterDataset>();
    return poRaster != nullptr && poRaster->GetChanCount() == oCatalogue.moLinked.size()
               ? mpoLink->Find<krv::datasources::IEncodedBlocks>()
               : nullptr;
}

ImageSize KrvdskDataset::GetLevelSize(unsigned int nLevel, const Place& oPlace) const
{
    GetImage(oPlace);
    const Catalogue& oCatalogue = GetCatalogue();
    if (nLevel != 1 && !oCatalogue.moLevels.contains(nLevel))
        Refuse("level " + std::to_string(nLevel) + " does not exist", oPlace);
    return nLevel == 1 ? oCatalogue.moSize : oCatalogue.moLevels.at(nLevel);
}

// Tiles that none of reaches beyond the image are told as whole ones, which more formats have. A single column of them
// is what others call strips.
EncodedForm KrvdskDataset::GetEncodedForm(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    GetImage(oPlace);
    const Catalogue& oCatalogue = GetCatalogue();
    if (auto* const poTheirs = FindLinkedBlocks(nLevel))
        return poTheirs->GetEncodedForm(nLevel);
    ImageSize oSize;
    if (oCatalogue.moLinked.empty() || nLevel == 1)
        oSize = GetLevelSize(nLevel, oPlace);
    else
    {
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(GetOverviewManager());
        oSize = {poLevels->GetLevelWidth(nLevel), poLevels->GetLevelHeight(nLevel)};
    }
    EncodedForm oForm;
    oForm.mbReadable = HasOneForm(oCatalogue);
    oForm.moCodec = GetCodingName(oCatalogue.meCoding);
    oForm.mbSeparate = oCatalogue.mbSeparate;
    oForm.mnChannels = oCatalogue.CountChannels();
    oForm.mnWidth = oSize.mnWidth;
    oForm.mnHeight = oSize.mnHeight;
    bool bWhole = false;
    if (!oCatalogue.moPlanes.empty())
    {
        const Plane& oFirst = *oCatalogue.moPlanes.front();
        oForm.moCodec = GetCodingName(oFirst.meCoding);
        oForm.mnPredictor = oFirst.mnPredictor;
        oForm.moType = oFirst.moType;
        oForm.mnSampleBits = oFirst.moType.GetValueBits();
        if (oFirst.mnKeptBits != 0)
            oForm.moParameters[KEPT_BITS] = std::to_string(oFirst.mnKeptBits);
        bWhole = oFirst.meStorage == Storage::eWholeTiles;
    }
    if (oForm.mbReadable)
        oForm.mbSeparate = oCatalogue.moPlanes.size() > 1;
    const ImageSize oBlock{oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight};
    oForm.mbWholeBlocks = bWhole || (oBlock.mnWidth < oSize.mnWidth && IsExact(oSize, oBlock));
    oForm.mnBlockWidth = oForm.mbWholeBlocks ? oBlock.mnWidth : std::min(oBlock.mnWidth, oSize.mnWidth);
    oForm.mnBlockHeight = oForm.mbWholeBlocks ? oBlock.mnHeight : std::min(oBlock.mnHeight, oSize.mnHeight);
    return oForm;
}

KrvdskDataset::CodedTile KrvdskDataset::FindTile(unsigned int nLevel, const BlockNumber& oBlock,
                                                 const Place& oPlace) const
{
    const ImageSize oSize = GetLevelSize(nLevel, oPlace);
    const Catalogue& oCatalogue = GetCatalogue();
    if (!HasOneForm(oCatalogue))
        Refuse("its channels are not stored in one way; they are had as pixels", oPlace);
    const std::uint64_t nX = std::uint64_t{oBlock.mnColumn} * oCatalogue.mnBlockWidth;
    const std::uint64_t nY = std::uint64_t{oBlock.mnRow} * oCatalogue.mnBlockHeight;
    if (oBlock.mnPlane >= oCatalogue.moPlanes.size() || nX >= oSize.mnWidth || nY >= oSize.mnHeight)
        Refuse("there is no tile " + std::to_string(oBlock.mnColumn) + ", " + std::to_string(oBlock.mnRow) +
                   " of plane " + std::to_string(oBlock.mnPlane),
               oPlace);
    const Plane& oPlane = *oCatalogue.moPlanes[oBlock.mnPlane];
    const std::uint64_t nAcross = (oSize.mnWidth - 1) / oCatalogue.mnBlockWidth + 1;
    const auto nWidth = static_cast<unsigned int>(std::min<std::uint64_t>(oCatalogue.mnBlockWidth, oSize.mnWidth - nX));
    const auto nRows =
        static_cast<unsigned int>(std::min<std::uint64_t>(oCatalogue.mnBlockHeight, oSize.mnHeight - nY));
    const TileCodec oCodec(oPlane, {oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight});
    return {oPlane.moTables.at(nLevel), oBlock.mnRow * nAcross + oBlock.mnColumn, oCodec.IsPlain(),
            oCodec.GetLargest(nWidth, nRows)};
}

bool KrvdskDataset::ReadEncoded(unsigned int nLevel, const BlockNumber& oBlock, std::vector<unsigned char>& oBytes)
{
    if (auto* const poTheirs = FindLinkedBlocks(nLevel))
        return poTheirs->ReadEncoded(nLevel, oBlock, oBytes);
    const CodedTile oAt = FindTile(nLevel, oBlock, Place::Current());
    if (mpoWriter)
        mpoWriter->StoreHeld();
    oBytes.clear();
    const Entry oEntry = FindEntry(oAt, oBlock);
    if (!oEntry.IsStored())
        return false;
    oBytes.resize(oEntry.mnBytes);
    if (mpoStore->ReadSummed(oEntry.mnOffset, oBytes.data(), oBytes.size()) != oEntry.mnChecksum)
        mpoStore->Fail(DescribeTile(oAt, oBlock) + ": is damaged: its checksum is wrong");
    return true;
}

std::string KrvdskDataset::DescribeTile(const CodedTile& oAt, const BlockNumber& oBlock)
{
    return oAt.mpoTable->Describe() + ", tile " + std::to_string(oBlock.mnColumn) + ", " + std::to_string(oBlock.mnRow);
}

Entry KrvdskDataset::FindEntry(const CodedTile& oAt, const BlockNumber& oBlock) const
{
    const TileTable::Tile* const pTile = oAt.mpoTable->Find(*mpoStore, oAt.mnTile);
    if (pTile == nullptr)
        return {};
    mpoStore->CheckPlace(pTile->moEntry, DescribeTile(oAt, oBlock));
    const std::size_t nBytes = pTile->moEntry.mnBytes;
    if (nBytes > oAt.mnMost || (oAt.mbPlain && nBytes != oAt.mnMost))
        mpoStore->Fail(DescribeTile(oAt, oBlock) + ": is damaged: it has " + std::to_string(nBytes) + " bytes");
    return pTile->moEntry;
}

// Tiles that end with the image and such that do not are the same as long as none reaches beyond it.
bool KrvdskDataset::TakesStorage(const EncodedForm& oForm, unsigned int nLevel) const
{
    const Catalogue& oCatalogue = GetCatalogue();
    const Plane& oFirst = *oCatalogue.moPlanes.front();
    const ImageSize oBlock{oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight};
    if (IsExact({oForm.mnWidth, oForm.mnHeight}, oBlock) ||
        oForm.mbWholeBlocks == (oFirst.meStorage == Storage::eWholeTiles))
        return true;
    for (const std::shared_ptr<Plane>& poPlane : oCatalogue.moPlanes)
    {
        for (const auto& [nOther, poTable] : poPlane->moTables)
            if (nOther != nLevel && !poTable->IsEmpty() && !IsExact(GetLevelSize(nOther, Place::Current()), oBlock))
                return false;
        Plane oNew = *poPlane;
        oNew.meStorage = oForm.mbWholeBlocks ? Storage::eWholeTiles : Storage::eTiles;
        if (!oCatalogue.FindObstacle(oNew).empty())
            return false;
    }
    return true;
}

void KrvdskDataset::LayOutLevel(unsigned int nLevel, const ImageSize& oSize)
{
    Catalogue& oCatalogue = mpoWriter->GetCatalogue();
    if (nLevel != 1)
        oCatalogue.moLevels[nLevel] = oSize;
    for (const std::shared_ptr<Plane>& poPlane : nLevel == 1 ? oCatalogue.moPlanes : oCatalogue.GetLevelPlanes())
        poPlane->moTables[nLevel] = oCatalogue.MakeTable(oSize);
    oCatalogue.Describe();
    mpoWriter->Touch();
    ForgetOpened();
}

// Null when tiles of that form cannot be.
std::unique_ptr<Catalogue> KrvdskDataset::MakeCatalogue(const EncodedForm& oForm, const Place& oPlace) const
{
    if (IsStrip(oForm) && oForm.mnBlockHeight < oForm.mnHeight &&
        std::uint64_t{oForm.mnBlockWidth} * oForm.mnBlockHeight < LEAST_STRIP)
        return nullptr;
    auto poNew = std::make_unique<Catalogue>(GetCatalogue());
    poNew->mnBlockWidth = oForm.mnBlockWidth;
    poNew->mnBlockHeight = oForm.mnBlockHeight;
    poNew->meCoding = *FindCoding(oForm.moCodec);
    if (poNew->meCoding != GetCatalogue().meCoding)
        poNew->mnCodingLevel = 0;
    const bool bUsual = poNew->meCoding == Coding::eNone || oForm.mnPredictor == Plane::GetUsualPredictor(oForm.moType);
    poNew->mnPredictor = bUsual ? 0 : static_cast<std::uint8_t>(oForm.mnPredictor);
    poNew->mbSeparate = oForm.mbSeparate;
    poNew->mnKeptBits = FindKeptBits(oForm).value();
    poNew->moPlanes.clear();
    const bool bWhole = oForm.mbWholeBlocks && !IsExact(poNew->moSize, {poNew->mnBlockWidth, poNew->mnBlockHeight});
    try
    {
        for (unsigned int nPlane = 0; nPlane < (oForm.mbSeparate ? oForm.mnChannels : 1); ++nPlane)
        {
            poNew->moPlanes.push_back(
                poNew->MakePlane(oForm.moType, oForm.mbSeparate ? 1 : oForm.mnChannels, GetFileName(), oPlace));
            poNew->moPlanes.back()->meStorage = bWhole ? Storage::eWholeTiles : Storage::eTiles;
        }
    }
    catch (const DataException&)
    {
        return nullptr;
    }
    poNew->mnKeptBits = 0;
    return poNew->FindObstacle(*poNew->moPlanes.front()).empty() ? std::move(poNew) : nullptr;
}

bool KrvdskDataset::SetEncodedForm(unsigned int nLevel, const EncodedForm& oForm)
{
    const Place oPlace = Place::Current();
    StoreWriter& oWriter = GetWriter("blocks cannot be laid out", oPlace);
    oWriter.StoreHeld();
    Catalogue& oCatalogue = oWriter.GetCatalogue();
    GetLevelSize(nLevel, oPlace);
    for (const std::shared_ptr<Plane>& poPlane : nLevel == 1 ? oCatalogue.moPlanes : oCatalogue.GetLevelPlanes())
        if (!poPlane->moTables.at(nLevel)->IsEmpty())
            Refuse("blocks are stored already", oPlace);
    if (!krv::datasources::IsLevelSize(GetWidth(), oForm.mnWidth, nLevel) ||
        !krv::datasources::IsLevelSize(GetHeight(), oForm.mnHeight, nLevel))
        return false;
    if (nLevel != 1 && !HasOneForm(oCatalogue) && IsSameButForSize(GetEncodedForm(nLevel), oForm))
    {
        LayOutLevel(nLevel, {oForm.mnWidth, oForm.mnHeight});
        return true;
    }
    if (!IsPossible(oCatalogue, oForm))
        return false;
    if (nLevel == 1 && oCatalogue.moLevels.empty() && ListSegments(Segment::BITMAP).empty())
    {
        const std::unique_ptr<Catalogue> poNew = MakeCatalogue(oForm, oPlace);
        if (!poNew)
            return false;
        for (const std::shared_ptr<Plane>& poPlane : oCatalogue.moPlanes)
            poPlane->mbGone = true;
        oCatalogue = std::move(*poNew);
        oCatalogue.Describe();
        oWriter.Touch();
        ShowImage();
        return true;
    }
    const Plane& oFirst = *oCatalogue.moPlanes.front();
    const bool bSame = HasOneForm(oCatalogue) && oForm.moCodec == GetCodingName(oFirst.meCoding) &&
                       oForm.mnPredictor == oFirst.mnPredictor && FindKeptBits(oForm) == oFirst.mnKeptBits &&
                       (oForm.mnChannels == 1 || oForm.mbSeparate == (oCatalogue.moPlanes.size() > 1));
    if (!bSame || !IsOfGrid(oCatalogue, oForm) || !TakesStorage(oForm, nLevel))
        return false;
    if (!IsExact({oForm.mnWidth, oForm.mnHeight}, {oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight}))
        for (const std::shared_ptr<Plane>& poPlane : oCatalogue.moPlanes)
            poPlane->meStorage = oForm.mbWholeBlocks ? Storage::eWholeTiles : Storage::eTiles;
    LayOutLevel(nLevel, {oForm.mnWidth, oForm.mnHeight});
    if (nLevel == 1)
        ShowImage();
    return true;
}

void KrvdskDataset::StoreEncoded(unsigned int nLevel, const BlockNumber& oBlock, const unsigned char* pBytes,
                                 std::size_t nBytes)
{
    const Place oPlace = Place::Current();
    const CodedTile oAt = FindTile(nLevel, oBlock, oPlace);
    if (pBytes == nullptr || nBytes == 0 || nBytes > oAt.mnMost || (oAt.mbPlain && nBytes != oAt.mnMost))
        Refuse("a tile of " + std::to_string(nBytes) + " bytes cannot be stored", oPlace);
    StoreTiles(
        nLevel, [&](StoreWriter& oWriter) { oWriter.WriteTile(*oAt.mpoTable, oAt.mnTile, pBytes, nBytes); }, oPlace);
}

void KrvdskDataset::StoreTiles(unsigned int nLevel, const std::function<void(StoreWriter& oWriter)>& oStore,
                               const Place& oPlace)
{
    StoreWriter& oWriter = GetWriter("blocks cannot be written", oPlace);
    support::BlockImage& oImage = nLevel == 1 ? *GetImage(oPlace) : *OpenLevel(nLevel);
    if (nLevel == 1)
        ForgetOldPixels();
    oWriter.StoreHeld(); // what is held back of a tile must not come after it
    oStore(oWriter);
    oImage.DropBlocks();
}

bool KrvdskDataset::TakeBlocks(unsigned int nLevel, krv::datasources::IDataset& oSource,
                               const std::vector<BlockNumber>& oBlocks)
{
    const Place oPlace = Place::Current();
    auto* const poSource = dynamic_cast<KrvdskDataset*>(&oSource);
    if (poSource == nullptr || poSource == this || poSource->FindLinkedBlocks(nLevel) != nullptr)
        return false;
    if (poSource->mpoWriter)
        poSource->mpoWriter->StoreHeld();
    std::vector<StoreWriter::TakenTile> oTiles;
    for (const BlockNumber& oBlock : oBlocks)
    {
        const CodedTile oTo = FindTile(nLevel, oBlock, oPlace), oFrom = poSource->FindTile(nLevel, oBlock, oPlace);
        if (const Entry oEntry = poSource->FindEntry(oFrom, oBlock); oEntry.IsStored())
            oTiles.push_back({oTo.mpoTable.get(), oTo.mnTile, oEntry, DescribeTile(oFrom, oBlock)});
    }
    if (!oTiles.empty())
        StoreTiles(
            nLevel, [&](StoreWriter& oWriter) { oWriter.TakeTiles(*poSource->mpoStore, oTiles); }, oPlace);
    return true;
}

IBlockEncoder* KrvdskDataset::MakeBlockEncoder(unsigned int nLevel)
{
    GetWriter("blocks cannot be encoded", Place::Current());
    const EncodedForm oForm = GetEncodedForm(nLevel);
    const Catalogue& oCatalogue = GetCatalogue();
    if (!HasOneForm(oCatalogue))
        return nullptr;
    return new TileEncoder(*oCatalogue.moPlanes.front(), oForm, {oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight},
                           static_cast<unsigned int>(oCatalogue.moPlanes.size()));
}

} // namespace krv::plugins::krvdsk

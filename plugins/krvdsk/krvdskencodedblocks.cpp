// The tiles of a native file as bytes: the facets IEncodedBlocks and IBlockEncoding of its dataset.
#include "datasources/metadata/levelbook.h"
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/support/codec/checksum.h"
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
                                  poPlane->meStorage == oFirst.meStorage &&
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

// Whether channels of the file's types can be stored so, whatever the grid of tiles.
bool IsPossible(const Catalogue& oCatalogue, const EncodedForm& oForm)
{
    const bool bTypes =
        std::all_of(oCatalogue.moPlanes.begin(), oCatalogue.moPlanes.end(),
                    [&oForm](const std::shared_ptr<Plane>& poPlane) { return poPlane->moType == oForm.moType; });
    return bTypes && oCatalogue.moLinkPath.empty() && oForm.mnChannels != 0 &&
           oForm.mnChannels == oCatalogue.CountChannels() && oForm.mnSampleBits == oForm.moType.GetValueBits() &&
           FindCoding(oForm.moCodec) && !oForm.mbLossy && !oForm.mbBigEndian && oForm.moParameters.empty() &&
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
    const ImageSize oSize = GetLevelSize(nLevel, Place::Current());
    const Catalogue& oCatalogue = GetCatalogue();
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
    const CodedTile oAt = FindTile(nLevel, oBlock, Place::Current());
    if (mpoWriter)
        mpoWriter->StoreHeld();
    oBytes.clear();
    const TileTable::Tile* const pTile = oAt.mpoTable->Find(*mpoStore, oAt.mnTile);
    if (pTile == nullptr)
        return false;
    const Entry& oEntry = pTile->moEntry;
    const std::string what =
        oAt.mpoTable->Describe() + ", tile " + std::to_string(oBlock.mnColumn) + ", " + std::to_string(oBlock.mnRow);
    mpoStore->CheckPlace(oEntry, what);
    if (oEntry.mnBytes > oAt.mnMost || (oAt.mbPlain && oEntry.mnBytes != oAt.mnMost))
        mpoStore->Fail(what + ": is damaged: it has " + std::to_string(oEntry.mnBytes) + " bytes");
    oBytes.resize(oEntry.mnBytes);
    mpoStore->GetFile().Read(oEntry.mnOffset, oBytes.data(), oBytes.size());
    if (codec::Checksum(0, oBytes.data(), oBytes.size()) != oEntry.mnChecksum)
        mpoStore->Fail(what + ": is damaged: its checksum is wrong");
    return true;
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
    return poNew->FindObstacle(*poNew->moPlanes.front()).empty() ? std::move(poNew) : nullptr;
}

bool KrvdskDataset::SetEncodedForm(unsigned int nLevel, const EncodedForm& oForm)
{
    const Place oPlace = Place::Current();
    StoreWriter& oWriter = GetWriter("blocks cannot be laid out", oPlace);
    oWriter.StoreHeld();
    Catalogue& oCatalogue = oWriter.GetCatalogue();
    GetLevelSize(nLevel, oPlace);
    for (const std::shared_ptr<Plane>& poPlane : oCatalogue.moPlanes)
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
                       oForm.mnPredictor == oFirst.mnPredictor &&
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
    StoreWriter& oWriter = GetWriter("blocks cannot be written", oPlace);
    const CodedTile oAt = FindTile(nLevel, oBlock, oPlace);
    if (pBytes == nullptr || nBytes == 0 || nBytes > oAt.mnMost || (oAt.mbPlain && nBytes != oAt.mnMost))
        Refuse("a tile of " + std::to_string(nBytes) + " bytes cannot be stored", oPlace);
    support::BlockImage& oImage = nLevel == 1 ? *GetImage(oPlace) : *OpenLevel(nLevel);
    if (nLevel == 1)
        ForgetOldPixels();
    oWriter.StoreHeld(); // what is held back of the tile must not come after it
    oWriter.WriteTile(*oAt.mpoTable, oAt.mnTile, pBytes, nBytes);
    oImage.DropBlocks();
}

IBlockEncoder* KrvdskDataset::MakeBlockEncoder(unsigned int nLevel)
{
    GetWriter("blocks cannot be encoded", Place::Current());
    const EncodedForm oForm = GetEncodedForm(nLevel);
    const Catalogue& oCatalogue = GetCatalogue();
    if (!oForm.mbReadable)
        return nullptr;
    return new TileEncoder(*oCatalogue.moPlanes.front(), oForm, {oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight},
                           static_cast<unsigned int>(oCatalogue.moPlanes.size()));
}

} // namespace krv::plugins::krvdsk

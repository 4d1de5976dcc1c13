#include "plugins/krvdsk/store/catalogue.h"

#include "plugins/support/writing/narrowsamples.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <climits>
#include <set>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

constexpr const char* CODING_NAMES[] = {"NONE", "DEFLATE", "ZSTD", "LZ4", "LZW"};

constexpr const char* IMAGE = "Imag";
constexpr const char* PLANE = "Plan";
constexpr const char* LEVELS = "Levl";
constexpr const char* SEGMENT = "Segm";
constexpr const char* PLACE = "Geoc";
constexpr const char* REFERENCE = "Crs ";
constexpr const char* RECORD = "Meta";
constexpr const char* LINK = "Link";

void AddMap(BytesWriter& oWriter, const krv::datasources::MetadataMap& oMap)
{
    oWriter.AddNumber(oMap.size(), 4);
    for (const auto& [key, value] : oMap)
    {
        oWriter.AddText(key);
        oWriter.AddText(value);
    }
}

krv::datasources::MetadataMap ReadMap(BytesReader& oReader)
{
    krv::datasources::MetadataMap oMap;
    for (std::uint32_t nLeft = oReader.ReadCount(); nLeft > 0; --nLeft)
    {
        std::string key = oReader.ReadText();
        oMap[std::move(key)] = oReader.ReadText();
    }
    return oMap;
}

unsigned int GetTypeCode(const krv::gobs::DataType& oType)
{
    krv::gobs::NativeDataTypeCode eType = krv::gobs::eDT_BIT;
    oType.FindNativeCode(eType);
    return static_cast<unsigned int>(eType);
}

void AddPlane(BytesWriter& oWriter, const Plane& oPlane)
{
    for (const unsigned int nByte :
         {static_cast<unsigned int>(oPlane.meStorage), GetTypeCode(oPlane.moType),
          static_cast<unsigned int>(oPlane.meCoding), unsigned{oPlane.mnPredictor}, unsigned{oPlane.mnCodingLevel}})
        oWriter.AddNumber(nByte, 1);
    oWriter.AddNumber(oPlane.moThere.size(), 4);
    for (const bool bThere : oPlane.moThere)
        oWriter.AddNumber(bThere ? 1 : 0, 1);
    oWriter.AddNumber(oPlane.moTables.size(), 4);
    for (const auto& [nLevel, poTable] : oPlane.moTables)
    {
        oWriter.AddNumber(nLevel, 4);
        oWriter.AddEntry(poTable->GetTop());
    }
}

void AddMadeOf(BytesWriter& oWriter, const Plane& oPlane)
{
    for (const auto& [nLevel, poTable] : oPlane.moTables)
    {
        const auto oFound = oPlane.moMadeOf.find(nLevel);
        const Link::State oState = oFound == oPlane.moMadeOf.end() ? Link::State() : oFound->second;
        oWriter.AddNumber(oState.mnBytes, 8);
        oWriter.AddNumber(oState.mnModified, 8);
    }
}

void ReadMadeOf(BytesReader& oReader, Plane& oPlane)
{
    for (const auto& [nLevel, poTable] : oPlane.moTables)
    {
        Link::State oState;
        oState.mnBytes = oReader.ReadNumber(8);
        oState.mnModified = oReader.ReadNumber(8);
        if (oState != Link::State())
            oPlane.moMadeOf[nLevel] = oState;
    }
}

void AddLevels(BytesWriter& oWriter, const std::map<unsigned int, ImageSize>& oLevels)
{
    oWriter.AddNumber(oLevels.size(), 4);
    for (const auto& [nLevel, oSize] : oLevels)
        for (const unsigned int nNumber : {nLevel, oSize.mnWidth, oSize.mnHeight})
            oWriter.AddNumber(nNumber, 4);
}

std::map<unsigned int, ImageSize> ReadLevels(BytesReader& oReader, const ImageSize& oFull)
{
    std::map<unsigned int, ImageSize> oLevels;
    for (std::uint32_t nLeft = oReader.ReadCount(); nLeft > 0; --nLeft)
    {
        const unsigned int nLevel = oReader.ReadCount(), nWidth = oReader.ReadCount(), nHeight = oReader.ReadCount();
        if (nLevel < 2 || (!oLevels.empty() && nLevel <= oLevels.rbegin()->first) || nWidth - 1 >= oFull.mnWidth ||
            nHeight - 1 >= oFull.mnHeight)
            oReader.Fail("level " + std::to_string(nLevel) + " is out of order");
        oLevels[nLevel] = {nWidth, nHeight};
    }
    return oLevels;
}

} // namespace

const char* GetCodingName(Coding eCoding)
{
    return CODING_NAMES[static_cast<std::size_t>(eCoding)];
}

unsigned int Plane::GetChannels() const
{
    return static_cast<unsigned int>(std::count(moThere.begin(), moThere.end(), true));
}

krv::gobs::DataType Plane::GetNativeType() const
{
    return mnKeptBits == 0 ? moType : krv::gobs::DataType(mnKeptBits, moType.IsSigned(), moType.IsReal(), 0, 0, false);
}

std::uint8_t Plane::GetUsualPredictor(const krv::gobs::DataType& oType)
{
    if (oType.IsComplex() || oType.GetBits() < 8)
        return 1;
    return oType.IsReal() ? 3 : 2;
}

bool Plane::CanPredict(std::uint8_t nPredictor, const krv::gobs::DataType& oType)
{
    if (nPredictor == 1)
        return true;
    const bool bWhole = !oType.IsComplex() && oType.GetBits() >= 8;
    return bWhole && (nPredictor == 2 || (nPredictor == 3 && oType.IsReal()));
}

void Blob::Set(std::vector<unsigned char> oBytes)
{
    if (oBytes.size() > StoreFile::LARGEST_RECORD)
        throw DataException("A record of " + std::to_string(oBytes.size()) + " bytes is larger than a native file " +
                            "takes, which is " + std::to_string(StoreFile::LARGEST_RECORD) + " bytes");
    moBytes = std::move(oBytes);
    mbChanged = true;
}

std::vector<unsigned char> Blob::Get(const StoreFile& oStore, const std::string& what) const
{
    if (mbChanged || !moEntry.IsStored())
        return moBytes;
    return oStore.Read(moEntry, what);
}

ImageSize Catalogue::GetUsualSize(unsigned int nLevel) const
{
    return {(moSize.mnWidth - 1) / nLevel + 1, (moSize.mnHeight - 1) / nLevel + 1};
}

std::uint64_t Catalogue::CountTiles(const ImageSize& oSize) const
{
    return (std::uint64_t{oSize.mnWidth - 1} / mnBlockWidth + 1) * ((oSize.mnHeight - 1) / mnBlockHeight + 1);
}

unsigned int Catalogue::CountChannels() const
{
    auto nChannels = static_cast<unsigned int>(moLinked.size());
    for (const std::shared_ptr<Plane>& poPlane : moPlanes)
        nChannels += poPlane->GetChannels();
    return nChannels;
}

std::vector<std::shared_ptr<Plane>> Catalogue::GetLevelPlanes() const
{
    std::vector<std::shared_ptr<Plane>> oPlanes = moLinkedPlanes;
    oPlanes.insert(oPlanes.end(), moPlanes.begin(), moPlanes.end());
    return oPlanes;
}

std::string Catalogue::FindObstacle(const Plane& oPlane) const
{
    const bool bWhole = oPlane.meStorage == Storage::eWholeTiles;
    const std::uint64_t nRowBits =
        (bWhole ? mnBlockWidth : std::min(mnBlockWidth, moSize.mnWidth)) * oPlane.GetPixelBits();
    const std::uint64_t nBytes =
        (nRowBits + 7) / 8 * (bWhole ? mnBlockHeight : std::min(mnBlockHeight, moSize.mnHeight));
    if (nBytes > LARGEST_TILE)
        return "a tile would be of " + std::to_string(nBytes) + " bytes, more than " + std::to_string(LARGEST_TILE);
    if (CountTiles(moSize) > MOST_TILES)
        return "there would be " + std::to_string(CountTiles(moSize)) + " tiles";
    return {};
}

std::shared_ptr<TileTable> Catalogue::MakeTable(const ImageSize& oSize) const
{
    return std::make_shared<TileTable>(CountTiles(oSize), Entry(), std::string());
}

std::shared_ptr<Plane> Catalogue::MakePlane(const krv::gobs::DataType& oType, unsigned int nChannels,
                                            const std::string& name, const Place& oPlace) const
{
    auto poPlane = std::make_shared<Plane>();
    poPlane->moType = oType;
    poPlane->meCoding = meCoding;
    poPlane->mnCodingLevel = mnCodingLevel;
    if (meCoding != Coding::eNone)
        poPlane->mnPredictor = mnPredictor == 0 ? Plane::GetUsualPredictor(oType) : mnPredictor;
    if (!Plane::CanPredict(poPlane->mnPredictor, oType))
        throw DataException(name + ": predictor " + std::to_string(mnPredictor) + " does not go with the type " +
                                oType.Describe(),
                            oPlace);
    poPlane->mnKeptBits = mnKeptBits == oType.GetValueBits() ? 0 : mnKeptBits;
    if (poPlane->mnKeptBits != 0 && !support::CanNarrow(oType, mnKeptBits))
        throw DataException(name + ": the option NBITS=" + std::to_string(mnKeptBits) +
                                " does not go with values of type " + oType.Describe(),
                            oPlace);
    poPlane->moThere.assign(nChannels, true);
    const std::string obstacle = FindObstacle(*poPlane);
    if (!obstacle.empty())
        throw DataException(name + ": " + obstacle + "; choose other blocks (options BLOCKXSIZE, BLOCKYSIZE)", oPlace);
    poPlane->moTables[1] = MakeTable(moSize);
    for (const auto& [nLevel, oSize] : moLevels)
        poPlane->moTables[nLevel] = MakeTable(oSize);
    return poPlane;
}

std::shared_ptr<Plane> Catalogue::MakeLinkedPlane(const krv::gobs::DataType& oType, const std::string& name,
                                                  const Place& oPlace) const
{
    std::shared_ptr<Plane> poPlane = MakePlane(oType, 1, name, oPlace);
    poPlane->moTables.erase(1);
    return poPlane;
}

std::shared_ptr<Plane> Catalogue::MakeBitmapPlane() const
{
    auto poPlane = std::make_shared<Plane>();
    poPlane->moType = krv::gobs::eDT_BIT;
    poPlane->meCoding = meCoding;
    poPlane->mnCodingLevel = mnCodingLevel;
    poPlane->moThere.assign(1, true);
    poPlane->moTables[1] = MakeTable(moSize);
    for (const auto& [nLevel, oSize] : moBitmapLevels)
        poPlane->moTables[nLevel] = MakeTable(oSize);
    return poPlane;
}

std::string Catalogue::DescribePlane(unsigned int nFirst, unsigned int nChannels)
{
    if (nChannels == 1)
        return "channel " + std::to_string(nFirst);
    return "channels " + std::to_string(nFirst) + " to " + std::to_string(nFirst + nChannels - 1);
}

void Catalogue::Describe() const
{
    const auto Name = [](const Plane& oPlane, const std::string& what)
    {
        for (const auto& [nLevel, poTable] : oPlane.moTables)
            poTable->SetDescription(nLevel == 1 ? what : what + ", level " + std::to_string(nLevel));
    };
    unsigned int nFirst = 1;
    for (const std::shared_ptr<Plane>& poPlane : GetLevelPlanes())
    {
        Name(*poPlane, DescribePlane(nFirst, poPlane->GetChannels()));
        nFirst += poPlane->GetChannels();
    }
    for (const auto& [nNumber, oSegment] : moSegments)
        if (oSegment.mpoPlane)
            Name(*oSegment.mpoPlane, oSegment.Describe(nNumber));
}

std::vector<unsigned char> Catalogue::Write() const
{
    BytesWriter oAll;
    const auto AddItem = [&oAll](const char* pName, const auto& oFill)
    {
        BytesWriter oItem;
        oFill(oItem);
        oAll.AddItem(pName, oItem.GetBytes());
    };
    AddItem(IMAGE,
            [this](BytesWriter& oItem)
            {
                for (const unsigned int nNumber :
                     {moSize.mnWidth, moSize.mnHeight, mnBlockWidth, mnBlockHeight, mnNextSegment})
                    oItem.AddNumber(nNumber, 4);
                for (const unsigned int nByte : {static_cast<unsigned int>(meCoding), unsigned{mnCodingLevel},
                                                 unsigned{mnPredictor}, unsigned{mbSeparate}})
                    oItem.AddNumber(nByte, 1);
            });
    AddItem(LEVELS,
            [this](BytesWriter& oItem)
            {
                AddLevels(oItem, moLevels);
                AddLevels(oItem, moBitmapLevels);
            });
    if (!moLinkPath.empty())
        AddItem(LINK,
                [this](BytesWriter& oItem)
                {
                    oItem.AddText(moLinkPath);
                    oItem.AddNumber(moLinked.size(), 4);
                    for (const Link::Channel& oChannel : moLinked)
                    {
                        oItem.AddNumber(oChannel.mnNumber, 4);
                        oItem.AddNumber(GetTypeCode(oChannel.moType), 1);
                    }
                    for (const std::shared_ptr<Plane>& poPlane : moLinkedPlanes)
                        AddPlane(oItem, *poPlane);
                    for (const std::shared_ptr<Plane>& poPlane : moLinkedPlanes)
                        AddMadeOf(oItem, *poPlane);
                });
    for (const std::shared_ptr<Plane>& poPlane : moPlanes)
        AddItem(PLANE,
                [&poPlane](BytesWriter& oItem)
                {
                    AddPlane(oItem, *poPlane);
                    oItem.AddNumber(poPlane->mnKeptBits, 1);
                });
    for (const auto& oPair : moSegments)
        AddItem(SEGMENT,
                [&oPair](BytesWriter& oItem)
                {
                    const auto& [nNumber, oSegment] = oPair;
                    oItem.AddNumber(nNumber, 4);
                    oItem.AddNumber(oSegment.mnChannel, 4);
                    oItem.AddText(oSegment.moKind);
                    oItem.AddText(oSegment.moDescription);
                    AddMap(oItem, oSegment.moMetadata);
                    if (oSegment.mpoPlane)
                        AddPlane(oItem, *oSegment.mpoPlane);
                    else
                        oItem.AddEntry(oSegment.moBytes.moEntry);
                });
    if (mbPlaced)
        AddItem(PLACE,
                [this](BytesWriter& oItem)
                {
                    for (const double nTerm : moGeocoding.GetTerms())
                        oItem.AddReal(nTerm);
                });
    if (!moCRS.empty())
        AddItem(REFERENCE, [this](BytesWriter& oItem) { oItem.AddText(moCRS); });
    if (moRecord.moEntry.IsStored())
        AddItem(RECORD, [this](BytesWriter& oItem) { oItem.AddEntry(moRecord.moEntry); });
    return std::move(oAll.GetBytes());
}

void Catalogue::ReadImage(BytesReader oItem)
{
    for (unsigned int* pNumber : {&moSize.mnWidth, &moSize.mnHeight, &mnBlockWidth, &mnBlockHeight, &mnNextSegment})
        *pNumber = oItem.ReadCount();
    const auto nCoding = static_cast<std::uint8_t>(oItem.ReadNumber(1));
    mnCodingLevel = static_cast<std::uint8_t>(oItem.ReadNumber(1));
    mnPredictor = static_cast<std::uint8_t>(oItem.ReadNumber(1));
    mbSeparate = oItem.ReadNumber(1) != 0;
    if (moSize.mnWidth - 1 >= INT_MAX || moSize.mnHeight - 1 >= INT_MAX || mnBlockWidth - 1 >= LARGEST_BLOCK_SIDE ||
        mnBlockHeight - 1 >= LARGEST_BLOCK_SIDE || nCoding >= std::size(CODING_NAMES) || mnPredictor > 3)
        oItem.Fail("an image of " + std::to_string(moSize.mnWidth) + " x " + std::to_string(moSize.mnHeight) +
                   " pixels in tiles of " + std::to_string(mnBlockWidth) + " x " + std::to_string(mnBlockHeight) +
                   " and coding " + std::to_string(nCoding) + " cannot be");
    meCoding = static_cast<Coding>(nCoding);
}

std::shared_ptr<Plane> Catalogue::ReadPlane(BytesReader& oItem, Use eUse) const
{
    const bool bBitmap = eUse == Use::eBitmap;
    auto poPlane = std::make_shared<Plane>();
    const std::uint64_t nStorage = oItem.ReadNumber(1), nType = oItem.ReadNumber(1), nCoding = oItem.ReadNumber(1);
    poPlane->mnPredictor = static_cast<std::uint8_t>(oItem.ReadNumber(1));
    poPlane->mnCodingLevel = static_cast<std::uint8_t>(oItem.ReadNumber(1));
    if (nStorage > static_cast<std::uint64_t>(bBitmap ? Storage::eTiles : Storage::eWholeTiles) ||
        nType > krv::gobs::eDT_BIT || (nType == krv::gobs::eDT_BIT) != bBitmap || nCoding >= std::size(CODING_NAMES))
        oItem.Fail("channels of storage " + std::to_string(nStorage) + ", type " + std::to_string(nType) +
                   " and coding " + std::to_string(nCoding) + " cannot be");
    poPlane->meStorage = static_cast<Storage>(nStorage);
    poPlane->moType = static_cast<krv::gobs::NativeDataTypeCode>(nType);
    poPlane->meCoding = static_cast<Coding>(nCoding);
    if (!Plane::CanPredict(poPlane->mnPredictor, poPlane->moType))
        oItem.Fail("predictor " + std::to_string(poPlane->mnPredictor) + " does not go with the type " +
                   poPlane->moType.Describe());
    for (const unsigned char nThere : oItem.ReadBytes(oItem.ReadCount()))
        poPlane->moThere.push_back(nThere != 0);
    if (poPlane->GetChannels() == 0 || (eUse != Use::eChannels && poPlane->moThere.size() != 1))
        oItem.Fail("a plane has no channels, or too many");
    const std::string obstacle = FindObstacle(*poPlane);
    if (!obstacle.empty())
        oItem.Fail(obstacle);
    std::map<unsigned int, ImageSize> oImages = bBitmap ? moBitmapLevels : moLevels;
    if (eUse != Use::eLinked)
        oImages[1] = moSize;
    if (oItem.ReadCount() != oImages.size())
        oItem.Fail("the levels of a plane are not those of the file");
    for (const auto& [nLevel, oSize] : oImages)
    {
        if (oItem.ReadCount() != nLevel)
            oItem.Fail("the levels of a plane are not those of the file");
        poPlane->moTables[nLevel] = std::make_shared<TileTable>(CountTiles(oSize), oItem.ReadEntry(), std::string());
    }
    return poPlane;
}

void Catalogue::ReadLink(BytesReader oItem)
{
    moLinkPath = oItem.ReadText();
    for (std::uint32_t nLeft = oItem.ReadCount(); nLeft > 0; --nLeft)
    {
        const unsigned int nNumber = oItem.ReadCount();
        const std::uint64_t nType = oItem.ReadNumber(1);
        if (nNumber == 0 || nType >= krv::gobs::eDT_BIT || moLinked.size() >= MOST_CHANNELS)
            oItem.Fail("channel " + std::to_string(nNumber) + " of type " + std::to_string(nType) +
                       " cannot be linked");
        moLinked.push_back({nNumber, static_cast<krv::gobs::NativeDataTypeCode>(nType)});
    }
    for (const Link::Channel& oChannel : moLinked)
    {
        moLinkedPlanes.push_back(ReadPlane(oItem, Use::eLinked));
        if (moLinkedPlanes.back()->moType != oChannel.moType)
            oItem.Fail("the levels of a linked channel are of another type than it is");
    }
    if (oItem.GetLeft() != 0)
        for (const std::shared_ptr<Plane>& poPlane : moLinkedPlanes)
            ReadMadeOf(oItem, *poPlane);
    if (moLinkPath.empty() || moLinkPath.find('\0') != moLinkPath.npos)
        oItem.Fail("a link leads nowhere");
}

void Catalogue::ReadSegment(BytesReader oItem)
{
    const unsigned int nNumber = oItem.ReadCount();
    Segment oSegment;
    oSegment.mnChannel = oItem.ReadCount();
    oSegment.moKind = oItem.ReadText();
    oSegment.moDescription = oItem.ReadText();
    oSegment.moMetadata = ReadMap(oItem);
    if (oSegment.moKind == Segment::BITMAP)
        oSegment.mpoPlane = ReadPlane(oItem, Use::eBitmap);
    else
        oSegment.moBytes.moEntry = oItem.ReadEntry();
    if (nNumber == 0 || nNumber >= mnNextSegment || oSegment.moKind.empty() ||
        !moSegments.emplace(nNumber, std::move(oSegment)).second)
        oItem.Fail("segment " + std::to_string(nNumber) + " is out of order");
}

Catalogue Catalogue::Read(const StoreFile& oStore, const std::vector<unsigned char>& oBytes)
{
    Catalogue oCatalogue;
    BytesReader oAll(oBytes, oStore.GetName(), "the directory");
    std::uint64_t nChannels = 0;
    while (oAll.GetLeft() != 0)
    {
        std::string name;
        BytesReader oItem = oAll.ReadItem(name);
        if ((name == IMAGE) != (oCatalogue.moSize.mnWidth == 0))
            oAll.Fail("it does not begin with the size of the image");
        if (name == IMAGE)
            oCatalogue.ReadImage(oItem);
        else if (name == LEVELS)
        {
            oCatalogue.moLevels = ReadLevels(oItem, oCatalogue.moSize);
            oCatalogue.moBitmapLevels = ReadLevels(oItem, oCatalogue.moSize);
        }
        else if (name == PLANE)
        {
            oCatalogue.moPlanes.push_back(oCatalogue.ReadPlane(oItem, Use::eChannels));
            Plane& oPlane = *oCatalogue.moPlanes.back();
            if (oItem.GetLeft() != 0)
                oPlane.mnKeptBits = static_cast<std::uint8_t>(oItem.ReadNumber(1));
            if (oPlane.mnKeptBits != 0 && !support::CanNarrow(oPlane.moType, oPlane.mnKeptBits))
                oItem.Fail(std::to_string(oPlane.mnKeptBits) + " bits of a value of type " + oPlane.moType.Describe() +
                           " cannot be");
            nChannels += oCatalogue.moPlanes.back()->GetChannels();
        }
        else if (name == LINK && oCatalogue.moLinkPath.empty())
        {
            oCatalogue.ReadLink(oItem);
            nChannels += oCatalogue.moLinked.size();
        }
        else if (name == SEGMENT)
            oCatalogue.ReadSegment(oItem);
        else if (name == PLACE)
        {
            std::array<double, 6> oTerms{};
            for (double& nTerm : oTerms)
                nTerm = oItem.ReadReal();
            oCatalogue.moGeocoding = {oTerms[0], oTerms[1], oTerms[2], oTerms[3], oTerms[4], oTerms[5]};
            oCatalogue.mbPlaced = oCatalogue.moGeocoding.IsInvertible();
        }
        else if (name == REFERENCE)
            oCatalogue.moCRS = oItem.ReadText();
        else if (name == RECORD)
            oCatalogue.moRecord.moEntry = oItem.ReadEntry();
        else if (name[0] >= 'A' && name[0] <= 'Z')
            oAll.Fail("it holds an item \"" + name + "\", which this program does not know");
    }
    if (oCatalogue.moSize.mnWidth == 0 || nChannels > MOST_CHANNELS)
        oAll.Fail("it names no image, or too many channels");
    oCatalogue.Describe();
    return oCatalogue;
}

TagRecord TagRecord::Read(const StoreFile& oStore, const std::vector<unsigned char>& oBytes, unsigned int nChannels)
{
    TagRecord oRecord(nChannels);
    if (oBytes.empty())
        return oRecord;
    BytesReader oReader(oBytes, oStore.GetName(), "the record of metadata");
    oRecord.moTags.SetFileMetadata(ReadMap(oReader));
    if (oReader.ReadCount() != nChannels)
        oReader.Fail("it is not that of " + std::to_string(nChannels) + " channels");
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
    {
        oRecord.moTags.SetChannelDescription(oReader.ReadText(), nChannel);
        oRecord.moTags.SetChanMetadata(ReadMap(oReader), nChannel);
        for (std::uint32_t nLeft = oReader.ReadCount(); nLeft > 0; --nLeft)
            oRecord.moHistories[nChannel - 1].push_back(oReader.ReadText());
    }
    return oRecord;
}

std::vector<unsigned char> TagRecord::Write() const
{
    BytesWriter oWriter;
    AddMap(oWriter, moTags.GetFileMetadata());
    oWriter.AddNumber(moTags.GetChannelCount(), 4);
    for (unsigned int nChannel = 1; nChannel <= moTags.GetChannelCount(); ++nChannel)
    {
        oWriter.AddText(moTags.GetChannelDescription(nChannel));
        AddMap(oWriter, moTags.GetChanMetadata(nChannel));
        oWriter.AddNumber(moHistories[nChannel - 1].size(), 4);
        for (const std::string& entry : moHistories[nChannel - 1])
            oWriter.AddText(entry);
    }
    return std::move(oWriter.GetBytes());
}

} // namespace krv::plugins::krvdsk

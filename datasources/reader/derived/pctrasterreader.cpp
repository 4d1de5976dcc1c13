#include "datasources/reader/derived/pctrasterreader.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/derived/convertedoverviewreaderaccessor.h"
#include "datasources/reader/derived/detail/convertedrecord.h"
#include "datasources/reader/derived/findpct.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/colourmapper.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::datasources
{

namespace
{

constexpr const char* ROLES[] = {"Red", "Green", "Blue", "Alpha"};
constexpr unsigned int COLOURS = 3;

// The record of the colours from that of the values.
AuxiliaryData ColourRecord(const AuxiliaryData& oSource, const krv::gobs::PCT& oTable, unsigned int nChannels)
{
    AuxiliaryData oRecord = detail::MakeConvertedRecord(oSource, nChannels);
    for (unsigned int n = 1; n <= nChannels; ++n)
        oRecord.SetChanMetadataValue("ColorInterp", ROLES[n - 1], n);
    oRecord.SetFileMetadataValue("DefaultRed", "1");
    oRecord.SetFileMetadataValue("DefaultGreen", "2");
    oRecord.SetFileMetadataValue("DefaultBlue", "3");
    const auto oValue = ParseNoData(oSource.GetChannelCount() != 0 ? GetNoDataText(oSource, 1) : std::string());
    if (!oValue)
        return oRecord;
    const krv::gobs::RGBTuple<unsigned char> oColour = oTable.GetValue(oValue->GetReal());
    const unsigned int aParts[] = {oColour.red, oColour.green, oColour.blue};
    for (unsigned int n = 0; n < COLOURS; ++n)
        oRecord.SetChanMetadataValue("NO_DATA_VALUE", std::to_string(aParts[n]), n + 1);
    return oRecord;
}

void ClearInvalid(const krv::gobs::Mask& oMask, unsigned char* pPixels)
{
    const std::uint64_t nPixels = oMask.GetFullWidth() * oMask.GetFullHeight();
    for (std::uint64_t n = 0; n < nPixels; ++n)
    {
        if ((oMask.GetBits()[n / 8] & 128u >> n % 8) == 0)
            pPixels[4 * n + COLOURS] = 0;
    }
}

} // namespace

struct PCTRasterReader::State
{
    State(IRasterReader& oSource, const krv::gobs::PCT& oTable, bool bAlpha)
        : moTable(oTable), mbAlpha(bAlpha), moMapper(oTable, oSource.GetDataType(), bAlpha), moValidity(oSource)
    {
        for (unsigned int n = 0; n < GetChannels(); ++n)
            moInfos.Add(std::make_unique<ChannelInfo>(moType));
    }

    unsigned int GetChannels() const { return mbAlpha ? COLOURS + 1 : COLOURS; }

    krv::gobs::PCT moTable;
    bool mbAlpha;
    krv::gobs::DataType moType = krv::gobs::eDT_8U;
    detail::ChannelInfos moInfos;
    krv::gobs::ColourMapper moMapper;
    ReaderValidity moValidity;
};

PCTRasterReader::PCTRasterReader(IRasterReader* poSource, const krv::gobs::PCT& oTable, bool bTakeOwnership,
                                 eColourAlpha eAlpha)
{
    OwnedOrBorrowed<IRasterReader> oSource(poSource, {false});
    UseSource(std::move(oSource), oTable, eAlpha, Place::Current());
    OwnSource(bTakeOwnership);
}

PCTRasterReader::PCTRasterReader(IDataset* poDataset, unsigned int nChannel, bool bTakeOwnership, eColourAlpha eAlpha)
{
    const Place oPlace = Place::Current();
    auto poReader = std::make_unique<BasicReader>(poDataset, std::vector<unsigned int>{nChannel}, false);
    const std::unique_ptr<krv::gobs::PCT> poTable = FindPCT(*poDataset, nChannel);
    if (poTable == nullptr)
        throw krv::DataException(
            poDataset->GetName() + ": channel " + std::to_string(nChannel) + " has no colour table", oPlace);
    BasicReader& oReader = *poReader;
    UseSource({poReader.release(), {true}}, *poTable, eAlpha, oPlace);
    oReader.OwnDataset(bTakeOwnership);
}

PCTRasterReader::PCTRasterReader(const std::string& fileName, unsigned int nChannel, eColourAlpha eAlpha)
{
    const Place oPlace = Place::Current();
    auto poReader = std::make_unique<BasicReader>(fileName, std::vector<unsigned int>{nChannel});
    const std::unique_ptr<krv::gobs::PCT> poTable = FindPCT(*poReader->GetDataset(), nChannel);
    if (poTable == nullptr)
        throw krv::DataException(fileName + ": channel " + std::to_string(nChannel) + " has no colour table", oPlace);
    UseSource({poReader.release(), {true}}, *poTable, eAlpha, oPlace);
}

PCTRasterReader::~PCTRasterReader() = default;

void PCTRasterReader::UseSource(OwnedOrBorrowed<IRasterReader> oSource, const krv::gobs::PCT& oTable,
                                eColourAlpha eAlpha, const Place& oPlace)
{
    if (oSource == nullptr)
        throw krv::DataException("The source reader is NULL", oPlace);
    if (oSource->GetChansCount() != 1)
        throw krv::DataException("The source reader has " + std::to_string(oSource->GetChansCount()) +
                                     " channels where 1 is expected",
                                 oPlace);
    if (oTable.GetEntries().empty())
        throw krv::DataException("The colour table has no entries", oPlace);
    const bool bAlpha = eAlpha == eWithAlpha || (eAlpha == eAlphaOfTable && oTable.HasAlpha());
    mpoState = std::make_unique<State>(*oSource, oTable, bAlpha);
    SetSource(std::move(oSource));
}

const krv::gobs::PCT& PCTRasterReader::GetTable() const
{
    return mpoState->moTable;
}

void PCTRasterReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    krv::gobs::CheckRasterCompatible(poRaster, this);
    Colour(*poRaster, mpoState->mbAlpha);
}

bool PCTRasterReader::HasValidity()
{
    return mpoState->moValidity.IsNeeded();
}

std::unique_ptr<krv::gobs::Mask> PCTRasterReader::ReadValid(krv::gobs::Raster& oRaster)
{
    krv::gobs::CheckRasterCompatible(&oRaster, this);
    return Colour(oRaster, true);
}

// Values are read with the margins that the colours shall have.
std::unique_ptr<krv::gobs::Mask> PCTRasterReader::Colour(krv::gobs::Raster& oRaster, bool bValidity)
{
    krv::gobs::Raster oValues({oRaster.GetWidth(), oRaster.GetHeight(), 1, GetSource().GetDataType()},
                              oRaster.GetContext());
    std::unique_ptr<krv::gobs::Mask> poMask;
    if (bValidity)
        poMask = mpoState->moValidity.Read(oValues);
    else
        GetSource().ReadRaster(&oValues);
    const std::uint64_t nPixels = oRaster.GetFullWidth() * oRaster.GetFullHeight();
    mpoState->moMapper.Run(oValues.GetBuffer(), nPixels, oRaster.GetBuffer());
    if (poMask != nullptr && mpoState->mbAlpha)
        ClearInvalid(*poMask, oRaster.GetBuffer());
    return poMask;
}

const std::vector<IChannelInfo*>& PCTRasterReader::GetChannelsInfo() const
{
    return mpoState->moInfos.Get();
}

AuxiliaryData PCTRasterReader::GetAuxiliaryData() const
{
    return ColourRecord(GetSource().GetAuxiliaryData(), mpoState->moTable, GetChansCount());
}

// A level of means of indices is none; one whose method nobody knows is taken for what its author meant.
IOverviewReaderAccessor* PCTRasterReader::GetOverviewReaderAccessor()
{
    std::unique_ptr<IOverviewReaderAccessor> poLevels(GetSource().GetOverviewReaderAccessor());
    if (poLevels == nullptr)
        return nullptr;
    const krv::gobs::PCT oTable = mpoState->moTable;
    const unsigned int nChannels = GetChansCount();
    ConvertedLevels oRules;
    oRules.mnChannels = nChannels;
    oRules.moWrap = [oTable, nChannels](std::unique_ptr<IRasterReader> poLevel)
    {
        auto poReader = std::make_unique<PCTRasterReader>(poLevel.get(), oTable, true,
                                                          nChannels > COLOURS ? eWithAlpha : eWithoutAlpha);
        static_cast<void>(poLevel.release());
        return poReader;
    };
    oRules.moServes = [oBook = GetSource().GetAuxiliaryData()](unsigned int nLevel)
    {
        const std::string method = GetLevelMethod(oBook, nLevel);
        return method.empty() || method == "NEAREST" || method == "MODE" || method == "NONE" || method == "MIN" ||
               method == "MAX";
    };
    oRules.moConvert = [oTable, nChannels](const AuxiliaryData& oRecord)
    {
        return ColourRecord(oRecord, oTable, nChannels);
    };
    return new ConvertedOverviewReaderAccessor(std::move(poLevels), std::move(oRules));
}

unsigned int PCTRasterReader::GetChansCount() const
{
    return mpoState->GetChannels();
}

const krv::gobs::DataType& PCTRasterReader::GetDataType() const
{
    return mpoState->moType;
}

const std::vector<unsigned int>& PCTRasterReader::GetChannels() const
{
    static const std::vector<unsigned int> NONE;
    return NONE;
}

} // namespace krv::datasources

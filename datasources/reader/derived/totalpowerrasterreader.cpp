#include "datasources/reader/derived/totalpowerrasterreader.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/defaultreader.h"
#include "datasources/reader/derived/convertedoverviewreaderaccessor.h"
#include "datasources/reader/derived/detail/convertedrecord.h"
#include "datasources/reader/derived/detail/powerterms.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <limits>
#include <utility>

namespace krv::datasources
{

namespace
{

using krv::gobs::PowerTerm;

// The square of the root of a mean of squares is a mean.
std::string MethodOfSquares(const std::string& method)
{
    return method == "RMS" ? "AVERAGE" : method;
}

AuxiliaryData PowerRecord(const AuxiliaryData& oSource, bool bValidity, bool bSquares)
{
    AuxiliaryData oRecord = detail::MakeConvertedRecord(oSource, 1, bSquares ? MethodOfSquares : nullptr);
    MetadataMap oMap = oRecord.GetChanMetadata(1);
    oMap["Matrix_Type"] = "Intensity";
    if (bValidity)
        oMap["NO_DATA_VALUE"] = "nan";
    oRecord.SetChanMetadata(oMap, 1);
    oRecord.SetChannelDescription("Total power", 1);
    return oRecord;
}

template <class Value>
void ClearInvalid(const krv::gobs::Mask& oMask, unsigned char* pPixels)
{
    auto* const pValues = reinterpret_cast<Value*>(pPixels);
    const std::uint64_t nPixels = oMask.GetFullWidth() * oMask.GetFullHeight();
    for (std::uint64_t n = 0; n < nPixels; ++n)
    {
        if ((oMask.GetBits()[n / 8] & 128u >> n % 8) == 0)
            pValues[n] = std::numeric_limits<Value>::quiet_NaN();
    }
}

// Means of what is squared are no means of power.
bool HoldsPower(const std::string& method)
{
    return method == "NEAREST" || method == "RMS";
}

} // namespace

struct TotalPowerRasterReader::State
{
    State(IRasterReader& oSource, const std::vector<PowerTerm>& oTerms)
        : moTerms(oTerms), moSum(oSource.GetDataType(), oTerms), moValidity(oSource, krv::gobs::eAnyChannel)
    {
        moInfos.Add(std::make_unique<ChannelInfo>(moSum.GetResultType()));
    }

    bool HasSquares() const
    {
        return std::any_of(moTerms.begin(), moTerms.end(),
                           [](const PowerTerm& oTerm) { return oTerm.meKind == PowerTerm::eSquare; });
    }

    std::vector<PowerTerm> moTerms;
    krv::gobs::PowerSum moSum;
    ReaderValidity moValidity;
    detail::ChannelInfos moInfos;
};

TotalPowerRasterReader::TotalPowerRasterReader(IRasterReader* poSource, bool bTakeOwnership,
                                               const PowerRequest& oRequest)
{
    const Place oPlace = Place::Current();
    if (poSource == nullptr)
        throw krv::DataException("The source reader is NULL", oPlace);
    UseSource({poSource, {false}}, detail::MakePowerTerms(detail::DescribeChannels(*poSource), oRequest, oPlace));
    OwnSource(bTakeOwnership);
}

TotalPowerRasterReader::TotalPowerRasterReader(IDataset* poDataset, bool bTakeOwnership, const PowerRequest& oRequest)
{
    const Place oPlace = Place::Current();
    if (poDataset == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    UseDataset({poDataset, {false}}, oRequest, oPlace);
    mpoDataset.get_deleter().mbOwned = bTakeOwnership;
}

TotalPowerRasterReader::TotalPowerRasterReader(const std::string& fileName, const PowerRequest& oRequest)
{
    const Place oPlace = Place::Current();
    std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->Open(fileName, eReadOnly));
    detail::RequireFacet<IRasterDataset>(poDataset.get(), "Format does not support rasters: file=" + fileName, oPlace);
    UseDataset({poDataset.release(), {true}}, oRequest, oPlace);
}

TotalPowerRasterReader::TotalPowerRasterReader(OwnedOrBorrowed<IRasterReader> oSource,
                                               const std::vector<PowerTerm>& oTerms)
{
    UseSource(std::move(oSource), oTerms);
}

TotalPowerRasterReader::~TotalPowerRasterReader()
{
    mpoState.reset();
    DropSource(); // before its dataset
}

// Only the channels that count are read.
void TotalPowerRasterReader::UseDataset(OwnedOrBorrowed<IDataset> oDataset, const PowerRequest& oRequest,
                                        const Place& oPlace)
{
    IDataset* const poDataset = oDataset.get();
    mpoDataset = std::move(oDataset);
    const std::vector<PowerTerm> oAll =
        detail::MakePowerTerms(detail::DescribeChannels(*poDataset, oPlace), oRequest, oPlace);
    std::vector<unsigned int> oChannels;
    std::vector<PowerTerm> oTerms;
    for (unsigned int n = 0; n < oAll.size(); ++n)
    {
        if (oAll[n].meKind == PowerTerm::eNone)
            continue;
        oChannels.push_back(n + 1);
        oTerms.push_back(oAll[n]);
    }
    UseSource({CreateDefaultReader(poDataset, oChannels), {true}}, oTerms);
}

void TotalPowerRasterReader::UseSource(OwnedOrBorrowed<IRasterReader> oSource, const std::vector<PowerTerm>& oTerms)
{
    mpoState = std::make_unique<State>(*oSource, oTerms);
    SetSource(std::move(oSource));
}

void TotalPowerRasterReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    krv::gobs::CheckRasterCompatible(poRaster, this);
    static_cast<void>(ReadValid(*poRaster));
}

bool TotalPowerRasterReader::HasValidity()
{
    return mpoState->moValidity.IsNeeded();
}

std::unique_ptr<krv::gobs::Mask> TotalPowerRasterReader::ReadValid(krv::gobs::Raster& oRaster)
{
    krv::gobs::CheckRasterCompatible(&oRaster, this);
    const IRasterReader& oSource = GetSource();
    krv::gobs::Raster oPixels({oRaster.GetWidth(), oRaster.GetHeight(), oSource.GetChansCount(), oSource.GetDataType()},
                              oRaster.GetContext());
    std::unique_ptr<krv::gobs::Mask> poMask = mpoState->moValidity.Read(oPixels);
    mpoState->moSum.Run(oPixels.GetBuffer(), oRaster.GetFullWidth() * oRaster.GetFullHeight(), oRaster.GetBuffer());
    if (poMask != nullptr && GetDataType() == krv::gobs::eDT_32R)
        ClearInvalid<float>(*poMask, oRaster.GetBuffer());
    else if (poMask != nullptr)
        ClearInvalid<double>(*poMask, oRaster.GetBuffer());
    return poMask;
}

const std::vector<IChannelInfo*>& TotalPowerRasterReader::GetChannelsInfo() const
{
    return mpoState->moInfos.Get();
}

AuxiliaryData TotalPowerRasterReader::GetAuxiliaryData() const
{
    return PowerRecord(GetSource().GetAuxiliaryData(), mpoState->moValidity.IsNeeded(), mpoState->HasSquares());
}

IOverviewReaderAccessor* TotalPowerRasterReader::GetOverviewReaderAccessor()
{
    std::unique_ptr<IOverviewReaderAccessor> poLevels(GetSource().GetOverviewReaderAccessor());
    if (poLevels == nullptr)
        return nullptr;
    const std::vector<PowerTerm>& oTerms = mpoState->moTerms;
    const bool bSquares = mpoState->HasSquares();
    ConvertedLevels oRules;
    oRules.mnChannels = 1;
    oRules.moWrap = [oTerms](std::unique_ptr<IRasterReader> poLevel)
    {
        return std::unique_ptr<IRasterReader>(new TotalPowerRasterReader({poLevel.release(), {true}}, oTerms));
    };
    oRules.moServes = [bSquares, oBook = GetSource().GetAuxiliaryData()](unsigned int nLevel)
    {
        return !bSquares || HoldsPower(GetLevelMethod(oBook, nLevel));
    };
    oRules.moConvert = [bSquares, bValidity = mpoState->moValidity.IsNeeded()](const AuxiliaryData& oRecord)
    {
        return PowerRecord(oRecord, bValidity, bSquares);
    };
    return new ConvertedOverviewReaderAccessor(std::move(poLevels), std::move(oRules));
}

const krv::gobs::DataType& TotalPowerRasterReader::GetDataType() const
{
    return mpoState->moSum.GetResultType();
}

const std::vector<unsigned int>& TotalPowerRasterReader::GetChannels() const
{
    static const std::vector<unsigned int> NONE;
    return NONE;
}

} // namespace krv::datasources

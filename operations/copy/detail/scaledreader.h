#pragma once

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/reader/derived/derivedreader.h"
#include "datasources/reader/validitysource.h"
#include "gobs/raster/datatype.h"
#include "operations/copy/conversion.h"
#include "operations/source/sourcefile.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::operations::detail
{

// The values of a file by a straight line for each channel, in a type of its own. A value that is not valid becomes
// NaN, or of integers the type's least value, which no valid value becomes then; the record says so. The file outlives
// the reader.
class ScaledReader : public krv::datasources::DerivedReader
{
public:
    // By the request's scale, or by what the file records; as 32R unless the request has a type. Throws
    // RequestException for complex channels and a scale without extent.
    ScaledReader(const SourceFile& oFile, const CopyRequest& oRequest);
    ~ScaledReader() override;

    using krv::datasources::DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    bool HasValidity() override { return mbValidity; }
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;
    const std::vector<krv::datasources::IChannelInfo*>& GetChannelsInfo() const override { return moInfos; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }
    krv::datasources::AuxiliaryData GetAuxiliaryData() const override { return moRecord; }
    krv::datasources::IOverviewReaderAccessor* GetOverviewReaderAccessor() override { return nullptr; }

private:
    struct Channel
    {
        ValueScale line;
        OptionalNoData noData;
    };

    // poValid: the pixels of which some channel is valid; null: all. oEmpty: those of which a channel is not; or null.
    template <class From, class To>
    void Fill(const krv::gobs::Raster& oFrom, const krv::gobs::Mask* poValid,
              const std::vector<std::unique_ptr<krv::gobs::Mask>>& oEmpty, krv::gobs::Raster& oTo) const;
    void MakeRecord(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, bool bUnscale);

    krv::gobs::DataType moType;
    double mnLow = 0; // what valid values are cut off at
    double mnHigh = 0;
    std::vector<Channel> moChannels;
    bool mbValidity = false;
    std::unique_ptr<krv::datasources::ValiditySource> mpoValidity;
    std::vector<std::unique_ptr<krv::datasources::IChannelInfo>> moOwnedInfos;
    std::vector<krv::datasources::IChannelInfo*> moInfos;
    krv::datasources::AuxiliaryData moRecord;
};

} // namespace krv::operations::detail

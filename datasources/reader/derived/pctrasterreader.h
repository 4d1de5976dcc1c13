#pragma once

#include "datasources/reader/derived/derivedreader.h"

#include <memory>
#include <string>

namespace krv::gobs
{
class PCT;
}

namespace krv::datasources
{

// Whether colours come with a fourth channel, their alpha.
enum eColourAlpha
{
    eAlphaOfTable = 0, // when a colour of the table is not opaque
    eWithoutAlpha = 1,
    eWithAlpha = 2
};

// Shows one channel of real values in the colours of a pseudocolour table: 8-bit red, green, blue and, on request or
// when the table has it, alpha. Margins are made of the values, before they get their colours, and so are levels: those
// of the source, unless they hold means of indices, which are no colours.
//
// No-data: that of channel k, as the record and GetNoDataValue tell, is part k of the colour of the source's no-data
// value; for "nan" of the table's background colour. A pixel with data may be of the same colour. The truth is in
// IValidityReader, which answers as the source would, and in the alpha channel, which is 0 where a pixel is not valid.
// The record keeps the file's tags without what colours make untrue, and the description of the channel, in channel 1.
// It shows no dataset: the values of its pixels are not those of one.
// Example: PCTRasterReader oColours("classes.tif"); its tiles have three channels of 8U, or four.
class KRV_DATASOURCES_API PCTRasterReader : public DerivedReader
{
public:
    // The source outlives this reader unless bTakeOwnership says that it goes with it; on failure it stays the
    // caller's. Throws DataException for a null source, one of another count of channels than 1 or of complex values,
    // and a table without entries.
    PCTRasterReader(IRasterReader* poSource, const krv::gobs::PCT& oTable, bool bTakeOwnership,
                    eColourAlpha eAlpha = eAlphaOfTable);
    // A channel of a dataset in its own table (FindPCT). Ownership as above. Throws DataException without a table.
    PCTRasterReader(IDataset* poDataset, unsigned int nChannel, bool bTakeOwnership,
                    eColourAlpha eAlpha = eAlphaOfTable);
    // The same of a file.
    explicit PCTRasterReader(const std::string& fileName, unsigned int nChannel = 1,
                             eColourAlpha eAlpha = eAlphaOfTable);
    PCTRasterReader(const PCTRasterReader&) = delete;
    PCTRasterReader& operator=(const PCTRasterReader&) = delete;
    ~PCTRasterReader() override;

    // The copy that this reader keeps.
    const krv::gobs::PCT& GetTable() const;

    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetChansCount() const override;

    // 8U.
    const krv::gobs::DataType& GetDataType() const override;
    IDataset* GetDataset() const override { return nullptr; }
    const std::vector<unsigned int>& GetChannels() const override;

    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

private:
    struct State;

    void UseSource(OwnedOrBorrowed<IRasterReader> oSource, const krv::gobs::PCT& oTable, eColourAlpha eAlpha,
                   const krv::Place& oPlace);
    std::unique_ptr<krv::gobs::Mask> Colour(krv::gobs::Raster& oRaster, bool bValidity);

    std::unique_ptr<State> mpoState;
};

} // namespace krv::datasources

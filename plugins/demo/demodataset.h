#pragma once

#include "plugins/support/facetsbeside.h"
#include "plugins/support/image/imagelayout.h"
#include "plugins/support/recorddataset.h"
#include "plugins/support/writing/headedfile.h"

namespace krv::plugins::demo
{

// A header, then pixels: channel after channel, rows top to bottom, values little-endian without padding; behind them
// those of levels; masks and sensor models lie beside. Files are read and created, not updated. The header is text:
//     DEMO1
//     640 480             width and height
//     8U 8U 32R           a data type for each channel
//     scene=alps          and the record (support::RecordText)
class DemoDataset : public support::RecordDataset, public support::FacetsBeside
{
public:
    static const support::HeadedFile::FirstLines FIRST_LINES;

    // A file to be read. Throws krv::FileFormatException when its header is not whole or it is shorter than that says.
    DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    // A new one, which Create makes.
    DemoDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<support::HeadedFile> poNew);

    using support::Dataset::Create;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;

protected:
    void StoreRecord(const support::RecordText& oRecord) const override;
    std::uint64_t MakeRoom(unsigned int nLevel) override;
    std::shared_ptr<support::IBlockSource> MakeLevelSource(unsigned int nLevel, std::uint64_t nPlace) override;

private:
    void ReadHeader();
    std::string MakeHeader(const support::RecordText& oRecord) const;
    // Those of the image, level 1, or of a level.
    support::ImageLayout MakeLayout(unsigned int nLevel) const;

    std::shared_ptr<support::HeadedFile> mpoFile;
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    std::vector<krv::gobs::DataType> moTypes;
};

} // namespace krv::plugins::demo

#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/demo/demofile.h"
#include "plugins/support/dataset.h"

namespace krv::plugins::demo
{

// A header (DemoHeader) and pixels: channel after channel, rows top to bottom, values little-endian without padding.
// A new file is there after Synchronize or Close; a dataset that is destroyed before leaves nothing behind.
class DemoDataset : public support::Dataset
{
public:
    enum class Mode
    {
        eOpen,
        eCreate // the image is laid out by Create
    };

    // Throws krv::FileFormatException when the header is not whole or the file is shorter than it says.
    DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat, Mode eMode);
    ~DemoDataset() override;

    using support::Dataset::Create;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    bool Exists() const override;
    krv::datasources::FileAccessState Delete() override;
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    void Synchronize() override;
    void Close() override;
    krv::datasources::AccessCapabilities GetRasterCapabilities() override;

private:
    bool IsWritable() const { return mpoFile != nullptr && mpoFile->IsWritable(); }
    void UseFile(std::shared_ptr<DemoFile> poFile);

    std::shared_ptr<DemoFile> mpoFile; // null before Create
    Mode meMode;
};

} // namespace krv::plugins::demo

#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "plugins/support/image/blockcache.h"
#include "plugins/support/image/blockimage.h"
#include "plugins/support/image/iblocksource.h"

#include <exception>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// A dataset of one file with one image, ready but for the image itself: a format derives from it, calls SetImage, and
// overrides what it has more of. Writing, creating and changing are refused with a DataException that names the file
// and the operation, there are no overviews, no history, no reference system and no metadata.
class Dataset : public krv::datasources::IDataset,
                public krv::datasources::IRasterDataset,
                public krv::datasources::INewFileDataset
{
public:
    // poFormat: the builder's, kept as a pointer. Operations that need the image throw DataException until SetImage.
    Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    ~Dataset() override;
    Dataset(const Dataset&) = delete;
    Dataset& operator=(const Dataset&) = delete;

    krv::datasources::IFileFormat* GetFileFormat() const override { return mpoFormat; }
    // Closes the dataset and removes the file.
    krv::datasources::FileAccessState Delete() override;
    bool Exists() const override;
    std::string GetName() override { return moName; }
    // An empty record with as many channels as the image has.
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    bool IsLinked() const override;
    void Synchronize() override;
    bool IsOpen() const override { return mbOpen; }
    // An override calls this one. I/O objects keep the image alive.
    void Close() override;

    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    void Create(const krv::gobs::RasterInfo& oInfo) override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    krv::datasources::IHistoryIO* GetHistoryIO(unsigned int nChannel) override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    // Readable only.
    krv::datasources::AccessCapabilities GetRasterCapabilities() override;

    void KeepExisting() override { mbReplaces = false; }

protected:
    // Whether a new file replaces one of its name.
    bool Replaces() const { return mbReplaces; }
    // For the destructor of a dataset that still has changes: warns that they are lost, unless an exception is on its
    // way, which says more.
    void WarnOfLoss() const noexcept;
    // Makes the source the dataset's image and bounds the cache: three rows of its blocks, at least 64 MiB, at most
    // 256.
    void SetImage(std::unique_ptr<IBlockSource> poSource);
    bool HasImage() const { return mpoImage != nullptr; }
    const std::string& GetFileName() const { return moName; }
    // Throws DataException when closed or without an image.
    const std::shared_ptr<BlockImage>& GetImage(const Place& oPlace = Place::Current()) const;
    const ImageLayout& GetLayout(const Place& oPlace = Place::Current()) const;
    const std::shared_ptr<BlockCache>& GetCache() const { return mpoCache; }
    void CheckOpen(const Place& oPlace = Place::Current()) const;
    // Throws the DataException of an operation that the format lacks. what: such as "channels cannot be deleted".
    [[noreturn]] void Refuse(const std::string& what, const Place& oPlace = Place::Current()) const;

private:
    std::string moName;
    krv::datasources::IFileFormat* mpoFormat;
    std::shared_ptr<BlockCache> mpoCache;
    std::shared_ptr<BlockImage> mpoImage;
    bool mbOpen = true;
    bool mbReplaces = true;
    int mnExceptions = std::uncaught_exceptions();
};

} // namespace krv::plugins::support

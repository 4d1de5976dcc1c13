#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/interfaces/iwatchedstoring.h"
#include "plugins/support/image/blockcache.h"
#include "plugins/support/image/blockimage.h"
#include "plugins/support/image/iblocksource.h"
#include "plugins/support/sidecar/sidecars.h"
#include "plugins/support/writing/filewriter.h"

#include <exception>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// A dataset of one file with one image, ready but for the image itself: a format derives from it, calls SetImage, and
// overrides what it has more of. Writing, creating and changing are refused with a DataException that names the file
// and the operation, there are no overviews, no history, no reference system and no metadata. With a FileWriter
// Synchronize and Close make what was written the file's and report failure; a dataset that is destroyed without leaves
// an existing file as of the last Synchronize, warns of what is lost, and removes a new file that was never
// synchronised.
// Example, a format that only reads: the constructor reads the header, makes an IBlockSource and calls SetImage; that
// is all.
class Dataset : public krv::datasources::IDataset,
                public krv::datasources::IRasterDataset,
                public krv::datasources::INewFileDataset,
                public krv::datasources::IWatchedStoring,
                public krv::datasources::ISidecarDataset,
                public krv::datasources::ISidecarWriting
{
public:
    // poFormat: the builder's, kept as a pointer. Operations that need the image throw DataException until SetImage.
    Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    // For a new file, or one that is changed.
    Dataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<FileWriter> poWriter);
    ~Dataset() override;
    Dataset(const Dataset&) = delete;
    Dataset& operator=(const Dataset&) = delete;

    krv::datasources::IFileFormat* GetFileFormat() const override { return mpoFormat; }
    // Closes the dataset and removes the file, with the levels, masks and tags beside it.
    krv::datasources::FileAccessState Delete() override;
    // A new file exists from Create on, though it has its name only after Synchronize.
    // A file that was opened exists as long as the system finds it under its name.
    bool Exists() const override;
    std::string GetName() override { return moName; }
    // An empty record with as many channels as the image has.
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;

    // Null unless overridden.
    krv::ogc::cs::ICRS* ReadCRS() const override;

    // Refused unless overridden; so are the other changes below.
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;

    // False unless overridden.
    bool IsLinked() const override;

    // Stores what the writer and the files beside hold. Throws what storing throws; nothing of it is lost then.
    void Synchronize() override;
    bool IsOpen() const override { return mbOpen; }
    // An override calls this one. I/O objects keep the image alive.
    void Close() override;

    // A new BlockRasterIO over the image, owned by the caller.
    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    void Create(const krv::gobs::RasterInfo& oInfo) override;

    // Throws DataException before SetImage and after Close, as the next three do.
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;

    // Of the plane of the channel: its type, and the native one where the layout says it.
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;

    // Null unless overridden; so is the next.
    krv::datasources::IHistoryIO* GetHistoryIO(unsigned int nChannel) override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;

    // Readable; writable and updatable with a writer.
    krv::datasources::AccessCapabilities GetRasterCapabilities() override;

    void KeepExisting() override;
    bool KeepsPixels() const override;
    void WatchStoring(Watch oWatch) override;

    // Nothing before there is an image.
    // What a format asks of them is said by GetNeeds.
    std::vector<krv::datasources::Sidecar> ListSidecars() override;
    void BeginSidecars() override;
    void WriteTagsBeside(const krv::datasources::AuxiliaryData& oData) override;
    void WriteCRSBeside(const krv::ogc::cs::ICRS& oCRS) override;
    void WriteGeocodingBeside(const krv::ogc::cs::GeocodingInfo& oInfo) override;
    void RemoveCRSBeside() override;
    void RemoveGeocodingBeside() override;

    // For what stands on the dataset.
    // As it was given to the constructor, or as the writer has it.
    const std::string& GetFileName() const { return moName; }
    // Throws the DataException of a change to a file that is only read or has no image yet. pWhat: as for Refuse.
    void CheckWriting(const char* pWhat, const Place& oPlace) const;
    // The same for what lies beside the file.
    void CheckWritingBeside(const char* pWhat, const Place& oPlace) const;
    bool WritesBeside() const { return IsWritten() || mbSidecarsWritten; }
    // Whether the file is new or changed.
    bool IsWritten() const { return mpoWriter != nullptr; }
    // The files beside the file: a format asks them for what its own does not say, and changes of them are stored with
    // the file's. Throws as GetImage.
    Sidecars& GetSidecars() const;

protected:
    // For the destructor of a dataset whose members the writer asks: warns when changes are lost, unless an exception
    // is on its way, which says more, and discards them.
    void Abandon() const noexcept;
    // Whether it lies under its own name.
    bool IsNamed() const { return !mpoWriter || mpoWriter->IsNamed(); }
    // Throws DataException unless the image of a new file is to be laid out, and can be. bEmpty: without channels too.
    void CheckCreate(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
                     const Place& oPlace, bool bEmpty = false) const;
    // Makes the source the dataset's image.
    void SetImage(std::shared_ptr<IBlockSource> poSource);
    bool HasImage() const { return mpoImage != nullptr; }
    // Throws DataException when closed or without an image.
    const std::shared_ptr<BlockImage>& GetImage(const Place& oPlace = Place::Current()) const;
    const ImageLayout& GetLayout(const Place& oPlace = Place::Current()) const;
    // For further images of the dataset: levels, bitmaps.
    // Never null.
    const std::shared_ptr<BlockCache>& GetCache() const { return mpoCache; }
    void CheckOpen(const Place& oPlace = Place::Current()) const;
    // For the format to call before pixels of the image change: what lies beside says nothing of their values any more.
    // The record of a file that has no name yet is that of the pixels to come.
    void ForgetPixelsBeside();
    // For the format to call before it removes what its own file says: ".aux.xml", which would be asked then, says it
    // no more either.
    void ForgetTagsBeside(const krv::datasources::AuxiliaryData& oNew);
    void ForgetCRSBeside();
    void ForgetGeocodingBeside();
    // What is asked of the files beside; nothing unless overridden.
    virtual Sidecars::Needs GetNeeds() const { return {}; }
    // Throws the DataException of an operation that the format lacks. what: such as "channels cannot be deleted".
    [[noreturn]] void Refuse(const std::string& what, const Place& oPlace = Place::Current()) const;

private:
    void Store(bool bLast);
    // Throws the DataException that the file itself says something, unless it does not.
    void CheckLacking(bool bLacking, const char* pWhat, const Place& oPlace) const;

    std::string moName;
    krv::datasources::IFileFormat* mpoFormat;      // the builder's
    std::shared_ptr<BlockCache> mpoCache;          // for all images of the dataset
    std::shared_ptr<BlockImage> mpoImage;          // null before SetImage
    mutable std::unique_ptr<Sidecars> mpoSidecars; // made when it is asked for
    std::shared_ptr<FileWriter> mpoWriter;         // null when the file is only read
    bool mbSidecarsWritten = false;                // what lies beside may change, though the file itself may not
    bool mbOpen = true;
    int mnExceptions = std::uncaught_exceptions();
};

} // namespace krv::plugins::support

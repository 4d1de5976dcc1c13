#pragma once

#include "datasources/reader/rasteraccess.h"
#include "datasources/writer/irasterwriter.h"
#include "toolkit/exceptions/place.h"

#include <initializer_list>
#include <string>
#include <vector>

namespace krv::datasources
{

class IBitmapDataset;
class IChannelFilter;
class IDataset;
class IRasterDataset;
class IRasterIO;

// Writes the selected channels or bitmaps of one dataset and reads them back. A writer on a new file knows neither size
// nor type before CreateNewFile: it has no tiles, and whatever needs the image opens it on first use. Nothing is
// buffered here. A failed opening leaves the writer as it was. What was written is in the file after Synchronize, and
// not before: a writer that goes without drops it, with a warning, and a new file is not there then.
// Example: a new file of one channel, tile by tile:
//   BasicWriter oWriter("new.tif", {1}, "TIF", "COMPRESS=ZSTD");
//   oWriter.CreateNewFile(RasterInfo(nWidth, nHeight, 1, eDT_32R));
//   for (std::unique_ptr<Raster> poTile : RasterRange(oWriter)) { Fill(*poTile); oWriter.WriteRaster(poTile.get()); }
//   oWriter.Synchronize();
class KRV_DATASOURCES_API BasicWriter : public RasterAccess, public IRasterWriter
{
public:
    // All channels of an existing file. Throws FileNotFoundException when there is none.
    explicit BasicWriter(const std::string& fileName);
    // Channels of an existing file, from 1; an empty list is all of them.
    BasicWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels);
    // The same for a list in place, the empty one too.
    BasicWriter(const std::string& fileName, std::initializer_list<unsigned int> oChannels)
        : BasicWriter(fileName, std::vector<unsigned int>(oChannels))
    {
    }
    // Channels of an existing file, or of a new one in a format, whose image CreateNewFile lays out. A new file takes
    // its name only when nobody took it meanwhile: CreateNewFile and Synchronize throw IOException then. For a file
    // that replaces another as a whole see ReplacingWriter.
    BasicWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels, const std::string& format,
                const std::string& options);
    // The channels of an existing file that a filter accepts; a filter that accepts none selects all, intended.
    BasicWriter(const std::string& fileName, const IChannelFilter& oFilter);
    // Bitmaps of a dataset that stays the caller's.
    BasicWriter(IBitmapDataset* poDataset, const std::vector<unsigned int>& oBitmaps);
    // Channels of a dataset that stays the caller's; an empty list is all of them.
    BasicWriter(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels);
    // Channels through another I/O than the dataset's own: an overview level. The writer takes the I/O over, also when
    // the constructor throws; the dataset stays the caller's. Such a writer has no channel descriptions.
    BasicWriter(IRasterDataset* poDataset, IRasterIO* poRasterIO, const std::vector<unsigned int>& oChannels);
    ~BasicWriter() override;

    // A tile with its pixels as they are stored, to be changed and written back. What was never written is as the
    // format fills it, mostly 0.
    krv::gobs::Raster* GetRaster(unsigned int nIndex) override;
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    krv::gobs::Raster* ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight) override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;

    void WriteRaster(const krv::gobs::Raster* poRaster) override;

    // What IRasterWriter says of each operation counts for these.
    bool FileExists() override;
    void CreateNewFile(const krv::gobs::RasterInfo& oInfo) override;
    void SetAuxiliaryData(const AuxiliaryData& oData) override;
    void SetCRS(const krv::ogc::cs::ICRS* poCRS) override;
    void SetGeocodingInfo(const krv::ogc::cs::GeocodingInfo& oInfo) override;
    IOverviewWriterAccessor* GetOverviewWriterAccessor() override;
    void Synchronize() override;

protected:
    // For derived writers, which set up their own state.
    BasicWriter();

    // Back to no channels open, no margins and eMirror.
    void Init();
    // Opens the selected channels, or bitmaps; commits only when everything succeeded.
    void OpenDataset(bool bBitmaps);
    // The same; a failure deletes an owned dataset and passes.
    void OpenDatasetOrCleanup(bool bBitmaps);
    void CleanupDataset();
    void FillMargins(krv::gobs::Raster* poRaster);
    // Opens a file for update; the caller owns the result, which is null when the file holds no image.
    static IRasterDataset* RDSIf(const std::string& fileName);

    // How the public constructors take a dataset; derived writers call them in constructors of their own.
    // Takes a dataset over, and the channels of its file. Throws DataException for null and for one without rasters.
    IDataset& UseNamed(IDataset* poDataset, const std::string& fileName, const std::vector<unsigned int>& oChannels,
                       const krv::Place& oPlace);
    // All channels of a file whose image must be there already, or those that a filter accepts.
    void UseFile(const std::string& fileName, const krv::Place& oPlace);
    void UseFile(const std::string& fileName, const IChannelFilter& oFilter, const krv::Place& oPlace);
    // An existing file or a new one in a format.
    void UseFileOrNew(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                      const std::string& format, const std::string& options, const krv::Place& oPlace);
    void UseRasterDataset(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bOwn,
                          const krv::Place& oPlace);

    // Opens the selected channels unless they are open.
    void LazyOpen();

    // What a derived writer may do otherwise: how channels of an image are opened, and how that of a new file is laid
    // out.
    virtual detail::OpenedChannels MakeChannels(IRasterDataset& oDataset, const std::vector<unsigned int>& oChannels,
                                                const krv::Place& oPlace);
    // oDataset is a new one, and oInfo says its size, its channels and their type.
    virtual void LayOut(IRasterDataset& oDataset, const krv::gobs::RasterInfo& oInfo, const krv::Place& oPlace);

private:
    void OpenForWriting();
    IRasterDataset& OpenFile(const std::string& fileName, const char* pMissing, const krv::Place& oPlace);
};

} // namespace krv::datasources

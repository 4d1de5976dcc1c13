#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/accessmode.h"

#include <string>

namespace krv::ogc::cs
{
class ICRS;
}

namespace krv::datasources
{

class AuxiliaryData;
class IFileFormat;

// The root of every dataset: one open file, or something that stands for one. Facets (IRasterDataset, IGeocodedDataset,
// IBitmapDataset, IPCTDataset, IMathModelDataset, IEphemerisDataset) are reached by dynamic_cast; a failed cast means
// that the file has no such facet. Facet pointers live as long as the dataset. One thread at a time.
// The order of the virtual operations is public and fixed: compiled plug-ins depend on it.
// Example: auto* poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset); null where the format has no bitmaps.
// Several datasets of one file may be read in several threads, each by its own.
class KRV_DATASOURCES_API IDataset
{
public:
    // Closes what is still open.
    // What was not synchronised is lost with it, and a warning says so; errors cannot be reported from here.
    virtual ~IDataset();

    // The plug-in's description, owned by its builder; null for synthetic datasets.
    virtual IFileFormat* GetFileFormat() const = 0;
    // Removes the dataset's file or files.
    // The dataset is closed afterwards, whatever the result.
    virtual FileAccessState Delete() = 0;
    // Whether there is a file under the name, or, of a new one that has not got its name yet, whether its image is laid
    // out. Synthetic datasets: whether they hold an image.
    virtual bool Exists() const = 0;
    // The file name, or a descriptive name for synthetic datasets.
    virtual std::string GetName() = 0;
    // A record of its own, with as many channels as the image; empty where the format keeps none.
    virtual AuxiliaryData ReadAuxiliaryData() = 0;
    // Replaces the whole record; the bookkeeping of levels stays the file's. Throws DataException for a dataset that is
    // not open for updating and where the format has no place for what the record holds; the old one stays then.
    virtual void WriteAuxiliaryData(const AuxiliaryData& oData) = 0;
    // A new object owned by the caller, or null when the file names no reference system.
    virtual krv::ogc::cs::ICRS* ReadCRS() const = 0;
    // Replaces the reference system; the argument is not kept. Throws DataException for a dataset that is not open for
    // updating and for a system that the format cannot express.
    virtual void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const = 0;
    // Whether the pixels lie in other files.
    virtual bool IsLinked() const = 0;
    // Flushes pending changes to the file.
    // Throws krv::IOException when that fails; the file on the disk is then as of the last success, or the operation
    // may be tried again. Costs as long as the disk takes.
    virtual void Synchronize() = 0;
    // True from the start until Close.
    virtual bool IsOpen() const = 0;
    // Only the destructor may follow.
    // Flushes as Synchronize does and throws what that throws. I/O objects over the dataset are of no more use.
    virtual void Close() = 0;
};

} // namespace krv::datasources

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
class KRV_DATASOURCES_API IDataset
{
public:
    // Closes what is still open.
    virtual ~IDataset();

    // The plug-in's description, owned by its builder; null for synthetic datasets.
    virtual IFileFormat* GetFileFormat() const = 0;
    // Removes the dataset's file or files.
    virtual FileAccessState Delete() = 0;
    virtual bool Exists() const = 0;
    // The file name, or a descriptive name for synthetic datasets.
    virtual std::string GetName() = 0;
    virtual AuxiliaryData ReadAuxiliaryData() = 0;
    virtual void WriteAuxiliaryData(const AuxiliaryData& oData) = 0;
    // A new object owned by the caller, or null when the file names no reference system.
    virtual krv::ogc::cs::ICRS* ReadCRS() const = 0;
    virtual void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const = 0;
    // Whether the pixels lie in other files.
    virtual bool IsLinked() const = 0;
    // Flushes pending changes to the file.
    virtual void Synchronize() = 0;
    virtual bool IsOpen() const = 0;
    // Only the destructor may follow.
    virtual void Close() = 0;
};

} // namespace krv::datasources

#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::ogc::cs
{
class GeocodingInfo;
class ICRS;
} // namespace krv::ogc::cs

namespace krv::datasources
{

class AuxiliaryData;

// A file beside a dataset's own that says more of the image.
// Each file is listed once, by what it says first of all: ".aux.xml" as metadata, whatever else is in it.
struct Sidecar
{
    std::string moFile;    // the path, as it was found
    std::string moSays;    // what of: "geocoding", "reference system", "metadata", "mask", "sensor model", "levels"
    bool mbUsed = false;   // whether the dataset answers by it
    std::string moTrouble; // why it is not used, though it would be; or that it is older than the file
};

// A dataset that looks for files beside its own. The order of the virtual operations is public and fixed.
// Such as ".aux.xml", ".ovr", ".msk", world files and ".prj".
class KRV_DATASOURCES_API ISidecarDataset
{
public:
    virtual ~ISidecarDataset();

    // Looks for all of them, those that nobody asked for included. One that the file itself makes superfluous is there
    // without a trouble and is not used.
    virtual std::vector<Sidecar> ListSidecars() = 0;
};

// A dataset whose file is only read, and that can keep beside it what its format has no place for, or what the file
// does not say. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API ISidecarWriting
{
public:
    virtual ~ISidecarWriting();

    // From now on the operations below, and masks and sensor models where they lie beside the file, change what lies
    // beside; Synchronize and Close store it. All of these throw DataException for what the file itself says otherwise.
    virtual void BeginSidecars() = 0;
    // The whole record, as the dataset is to answer it.
    virtual void WriteTagsBeside(const AuxiliaryData& oData) = 0;
    // The reference system of the image. oCRS is copied.
    virtual void WriteCRSBeside(const krv::ogc::cs::ICRS& oCRS) = 0;
    // Where the image lies on the map.
    virtual void WriteGeocodingBeside(const krv::ogc::cs::GeocodingInfo& oInfo) = 0;
    // Nothing is said of it beside afterwards, but for a ".prj", or a world file, which stay as they are.
    virtual void RemoveCRSBeside() = 0;
    virtual void RemoveGeocodingBeside() = 0;
};

} // namespace krv::datasources

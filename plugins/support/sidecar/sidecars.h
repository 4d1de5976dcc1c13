#pragma once

#include "datasources/interfaces/isidecardataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/sidecar/auxxml.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::datasources
{
class IDataset;
class IRasterIO;
} // namespace krv::datasources

namespace krv::plugins::support
{

// The files beside an image that say what its own file does not. Each is looked for by its exact names when somebody
// asks for what it says, and read once. One that cannot be used is warned of and is as if it were not there. A file
// that is itself a sidecar, by its ending, has none. One thread at a time.
class Sidecars
{
public:
    // Of an image of so many channels. bNew: the file is made anew; what lies beside its name is not its own.
    Sidecars(const std::string& fileName, unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, bool bNew);
    ~Sidecars();
    Sidecars(const Sidecars&) = delete;
    Sidecars& operator=(const Sidecars&) = delete;

    // By the transform of ".aux.xml", or else the world file.
    std::optional<krv::ogc::cs::GeocodingInfo> ReadGeocoding();
    // By ".aux.xml", or else ".prj". Null when there is none.
    std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS();
    // Adds what a record lacks: tags, descriptions, and no-data values where neither the channel nor the file has one.
    void AddTags(krv::datasources::AuxiliaryData& oRecord);
    // Whether ".msk" says which pixels are valid, and its pixels as those of a bitmap: 1 is valid. They are the
    // caller's and go before this object.
    bool HasMask();
    krv::datasources::IRasterIO* OpenMask(bool bWrite);
    // A mask of no valid pixel, which is there for others after StoreMask, and one that is no more.
    void MakeMask();
    void DropMask();
    void StoreMask();

    // What ".aux.xml" says; what is set counts at once, and StoreAuxXml replaces the file as a whole, or removes one
    // that says nothing.
    const AuxXml& GetAuxXml() { return LoadAuxXml(); }
    void SetAuxXml(AuxXml oAuxXml);
    void StoreAuxXml();

    // All that lie beside the file, each with what came of it, those included that nobody asked for. oNeeds: whether
    // the file's own says nothing of the geocoding, of the system and of validity.
    struct Needs
    {
        bool mbTags = false; // the format adds tags and sensor models
        bool mbGeocoding = false;
        bool mbCRS = false;
        bool mbMask = false;
    };
    std::vector<krv::datasources::Sidecar> List(const Needs& oNeeds);

private:
    const AuxXml& LoadAuxXml();
    bool IsOlder(const std::string& sidecar) const;
    void Complain(const std::string& sidecar, const std::string& trouble);
    std::string FindWorldFile() const;

    std::string moFileName;
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnChannels;
    bool mbNone; // the file itself is one, or new
    std::optional<AuxXml> moAuxXml;
    std::string moAuxXmlName; // as found; empty when there is none
    bool mbAuxXmlChanged = false;
    std::optional<std::string> moMaskName; // as found, once it was looked for
    bool mbMaskWritten = false;
    std::unique_ptr<krv::datasources::IDataset> mpoMask;
    std::map<std::string, std::string> moTroubles; // by sidecar
};

} // namespace krv::plugins::support

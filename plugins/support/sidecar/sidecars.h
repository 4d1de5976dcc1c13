#pragma once

#include "datasources/interfaces/isidecardataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/sidecar/auxxml.h"
#include "toolkit/mathmodel/rpccoefficients.h"
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

// What is added to the numbers of masks, and of models, where the format counts its own from 1 on.
inline constexpr unsigned int FIRST_BESIDE = 65535;

// Others would take a zone beside the file for validity.
inline constexpr char NO_ZONES[] =
    "a zone cannot be kept beside the file: a bitmap without a description, the validity mask, can, or one that is "
    "tagged as that of a channel";

// The files beside an image that say what its own file does not. Each is looked for by its exact names when somebody
// asks for what it says, and read once. One that cannot be used is warned of and is as if it were not there. A file
// that is itself a sidecar, by its ending, has none. One thread at a time.
// Belongs to a Dataset; formats reach it by GetSidecars.
class Sidecars
{
public:
    // Of an image of so many channels. bNew: the file is made anew; what lies beside its name is not its own.
    Sidecars(const std::string& fileName, unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, bool bNew);
    ~Sidecars();
    Sidecars(const Sidecars&) = delete;
    Sidecars& operator=(const Sidecars&) = delete;

    // By the transform of ".aux.xml", or else the world file.
    // For the outer corner of the first pixel, whatever the file counts from. Nothing when there is none.
    std::optional<krv::ogc::cs::GeocodingInfo> ReadGeocoding();
    // By ".aux.xml", or else ".prj". Null when there is none.
    // A new object; a text that defines no system is warned of and counts as none.
    std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS();
    // Adds what a record lacks: tags, descriptions, and no-data values where neither the channel nor the file has one.
    // What the record has already wins.
    void AddTags(krv::datasources::AuxiliaryData& oRecord);
    // The masks of ".msk" by their numbers: 1 for one of the image; where each channel has its own, those of the
    // channels; none when it says of no pixel that it is not valid.
    std::vector<unsigned int> ListMasks();

    // By its number; false, not an exception, for any other.
    bool HasMask(unsigned int nMask);
    // Empty for the image's own; one of a channel is a zone but for the tag that says of which channel it is.
    std::string DescribeMask(unsigned int nMask);
    krv::datasources::MetadataMap GetMaskTags(unsigned int nMask);
    // Its pixels as those of a bitmap: 1 is valid. They are the caller's and go before this object.
    // bWrite: its pixels are to be changed, and stored by Store. Throws DataException for a mask that is not there.
    krv::datasources::IRasterIO* OpenMask(unsigned int nMask, bool bWrite);
    // A mask of no valid pixel, which is there for others after Store; returns its number. It is a zone, which cannot
    // be stored, until it is declared the image's, or that of a channel before somebody opens it. Channels without a
    // mask of their own are then valid everywhere. Throws DataException where masks lie that were stored before.
    unsigned int MakeMask();
    bool IsZone(unsigned int nMask) const { return moZone == nMask; }
    // nChannel: 0 for the image's. Throws DataException when there is no place for it beside the others.
    void DeclareMask(unsigned int nChannel);
    // The one that is not declared.
    void DropZone();
    // All of them.
    // The file beside goes with Store.
    void DropMasks();

    // Sensor models, by the numbers of FindModelSidecars; one that is set is written by Store.
    std::vector<unsigned int> ListModels() const;
    krv::mathmodel::RpcCoefficients ReadModel(unsigned int nModel) const;

    // Returns its number. One that is there is replaced.
    unsigned int SetModel(const krv::mathmodel::RpcCoefficients& oModel);

    // What ".aux.xml" says; what is set counts at once, and Store replaces the file as a whole, or removes one that
    // says nothing. Setting throws DataException where there is a file that cannot be used, which would be lost.
    const AuxXml& GetAuxXml() { return LoadAuxXml(); }
    void SetAuxXml(AuxXml oAuxXml);
    // Before pixels change: what ".aux.xml" says of their values goes, and it is still of this file afterwards; levels
    // are marked as outdated at once. Costs nothing the second time.
    void ForgetPixels();

    // Throws DataException for what Store cannot keep.
    void CheckStore() const;

    // Whether Store has anything to do.
    bool HoldsChanges() const;

    // Throws what writing throws; what is stored by then stays stored.
    void Store();

    // All that lie beside the file, each with what came of it, those included that nobody asked for. oNeeds: whether
    // the file's own says nothing of the geocoding, of the system, of validity, and has no levels.
    struct Needs
    {
        bool mbTags = false; // the format adds tags and sensor models
        bool mbGeocoding = false;
        bool mbCRS = false;
        bool mbMask = false;
        bool mbLevels = false;
    };
    std::vector<krv::datasources::Sidecar> List(const Needs& oNeeds);

private:
    const AuxXml& LoadAuxXml();
    void StoreAuxXml();
    void ForgetLevelsBeside();
    void LoadMasks();
    void MakeMaskFile();
    void CompleteMaskFile();
    // Of one that is there.
    unsigned int FindMaskChannel(unsigned int nMask) const;
    bool IsByChannel() const { return !moMasks.empty() && moMasks.front().mnChannel != 0; }
    // Why the file that is open is no mask of the image; empty when it is one, whose masks are then known.
    std::string FindMasks();
    bool IsOlder(const std::string& sidecar) const;
    void Complain(const std::string& sidecar, const std::string& trouble);
    std::string FindWorldFile() const;

    std::string moFileName;
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnChannels;
    bool mbNone; // the file itself is one, or new
    std::optional<AuxXml> moAuxXml;
    std::string moAuxXmlName;                            // as found; empty when there is none
    bool mbAuxXmlChanged = false;                        // Store writes it
    std::optional<std::string> moMaskName;               // as found, once it was looked for
    std::unique_ptr<krv::datasources::IDataset> mpoMask; // the file of masks; null: none, or not looked for
    struct Mask
    {
        unsigned int mnNumber;  // as bitmaps of the dataset have it
        unsigned int mnChannel; // 0 for the image's, and for a zone
    };
    std::vector<Mask> moMasks;
    std::optional<unsigned int> moZone; // the number of the one that is not declared
    bool mbMaskMade = false;            // here, and not stored yet
    bool mbMaskWritten = false;
    bool mbMaskChanged = false;
    std::optional<krv::mathmodel::RpcCoefficients> moModel; // to be written
    bool mbForgotten = false;                               // statistics beside are gone already
    bool mbLevelsForgotten = false;
    std::map<std::string, std::string> moTroubles; // by sidecar
};

} // namespace krv::plugins::support

#pragma once

#include "datasources/datasets/filelessdataset.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "gobs/raster/datatype.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

// Two real channels, from 1, that are one complex channel: I and Q, or amplitude and phase.
// Channel n of the dataset is pair n of the list. A channel may be in several pairs.
struct ComplexPair
{
    unsigned int mnFirst;  // of the first source: I or amplitude
    unsigned int mnSecond; // of the second, or of the only one: Q or phase
};

enum eComplexForm
{
    eRealImaginary = 0,  // I and Q, the real and the imaginary part
    eAmplitudePhase = 1, // in radians
};

// Pairs of real channels of one dataset, or of two of the same size, as complex channels. Both channels of a pair are
// of one type. I and Q: 8U, 8S and 16S make C16S, 16U makes C16U, 32S C32S, 32R C32R, 32U and 64R C64R; 64U and 64S
// make C64R too, with a warning, since that does not hold all of their values. Amplitude and phase: 8 and 16 bits and
// 32R make C32R, all others C64R.
//
// Writing splits values back by the rules of conversion where the sources can be updated. The record has the tags of
// the first channel, those of the second under their keys with "_Q" behind them; what was recorded of the values of
// either is left out. Reference system and geocoding are the first source's.
//
// A pixel is no-data when both of its channels say so. The key "NO_DATA_VALUE" then has the first one's value and the
// pixel is that value with an imaginary part of 0; reals of which a value is not 0, and amplitudes, become "nan" in
// both parts instead, since no true value is that. When only one channel has such a value there is none. Validity masks
// of two sources are joined: valid is what both have so.
//
// Levels are those that both channels have in one size. Levels of amplitudes and phases are made and offered only by
// the method NEAREST: the mean of phases is none.
// Example: I and Q in two files: MetaComplexDataset oScene("i.tif", "q.tif", {{1, 1}});
class KRV_DATASOURCES_API MetaComplexDataset : public FilelessDataset, public IBitmapDataset
{
public:
    // What the keys of the second channel's tags end in.
    static constexpr const char* SECOND_SUFFIX = "_Q";

    // The sources outlive the dataset, or go with it, also when this throws. Throws DataException, naming what does not
    // fit: no source, no pairs, channels that do not exist, are complex or of two types, sources of two sizes or
    // places.
    MetaComplexDataset(IDataset* poSource, const std::vector<ComplexPair>& oPairs, bool bTakeOwnership,
                       eComplexForm eForm = eRealImaginary);
    MetaComplexDataset(IDataset* poFirst, IDataset* poSecond, const std::vector<ComplexPair>& oPairs,
                       bool bTakeOwnership, eComplexForm eForm = eRealImaginary);
    // Channels of files, for reading or update. One name twice is one file.
    MetaComplexDataset(const std::string& firstFile, const std::string& secondFile,
                       const std::vector<ComplexPair>& oPairs, AccessMode eMode = eReadOnly,
                       eComplexForm eForm = eRealImaginary);
    ~MetaComplexDataset() override;

    // Whether the complex types hold every value of the channels'; of amplitudes and phases none does.
    bool IsExact() const;

    bool Exists() const override;
    AuxiliaryData ReadAuxiliaryData() override;
    // Tags go back to the channels that they are of. A no-data value that is not the one that was read goes to both.
    void WriteAuxiliaryData(const AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;

    // To the first source, which says whether it can be changed.
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    bool IsLinked() const override { return true; }
    void Synchronize() override;
    // Closes sources that go with it.
    void Close() override;

    IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;
    IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    IOverviewManager* GetOverviewManager() override;

    // What both sources allow.
    AccessCapabilities GetRasterCapabilities() override;

    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

    // The bitmaps of the first source, which are changed there. One more when only the second has a validity mask.
    std::vector<unsigned int> GetBitmapList() const override;
    IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override;
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata) override;
    // Null where two masks are joined.
    IOverviewManager* GetBitmapOverviewManager() override;

private:
    struct State;
    class Manager;

    explicit MetaComplexDataset(std::unique_ptr<State> poState);
    void Prepare(const std::vector<ComplexPair>& oPairs, eComplexForm eForm, const Place& oPlace);
    AuxiliaryData JoinRecords(const AuxiliaryData& oFirst, const AuxiliaryData& oSecond) const;
    unsigned int FindSecondMask() const;
    unsigned int FindOwnMask() const;

    std::string moDescription; // the name, for messages
    std::unique_ptr<State> mpoState;
};

} // namespace krv::datasources

#pragma once

#include "gobs/api.h"
#include "gobs/mask/imaskbuilder.h"
#include "gobs/raster/datatype.h"

#include <memory>
#include <vector>

namespace krv::gobs
{

// How the tests of several channels combine into one: is the pixel background?
// Only listed channels take part. The numbers are public: programs store them.
enum BkgdRule : int
{
    eAnyChannel = 0, // at least one listed channel equals its value
    eAllChannels = 1 // every listed channel equals its value
};

// Marks background in pixels of one type: sets the bit of every background pixel, clears that of every other.
// Made once for a type, used for any number of pixels; any thread.
class KRV_GOBS_API IMaskDecisionImpl
{
public:
    virtual ~IMaskDecisionImpl();

    // pPixels: nPixels pixels of nChannels interleaved values; pBits: ceil(nPixels / 8) bytes, most significant bit
    // first, spare bits are cleared.
    virtual void Mark(const unsigned char* pPixels, unsigned long long nPixels, unsigned int nChannels,
                      unsigned char* pBits) const = 0;
};

// A rule that says which pixels are background, whatever their type.
// Any thread. The order of the virtual operations is fixed, here and above.
class KRV_GOBS_API IMaskDecision
{
public:
    virtual ~IMaskDecision();

    // A new, independent object that the caller owns.
    virtual IMaskDecision* Clone() const = 0;
    // A new implementation for rasters of a type and channel count, owned by the caller.
    virtual IMaskDecisionImpl* GetImpl(const DataType& oType, unsigned long long nChannels) const = 0;
};

// Background by value: oValues[i] is the value of the 1-based channel oChannels[i]. Empty lists mark nothing; channels
// that a raster lacks take no part. The lists have equal lengths, else DataException.
// Example: pixels that are 0 in channel 1: MaskDecision(eAnyChannel, {0}, {1}).
class KRV_GOBS_API MaskDecision : public IMaskDecision
{
public:
    MaskDecision(BkgdRule eRule, const std::vector<double>& oValues, const std::vector<unsigned int>& oChannels);
    ~MaskDecision() override;

    // A copy of rule, values and channels.
    IMaskDecision* Clone() const override;
    IMaskDecisionImpl* GetImpl(const DataType& oType, unsigned long long nChannels) const override;

    BkgdRule GetRule() const { return meRule; }
    const std::vector<double>& GetValues() const { return moValues; }
    const std::vector<unsigned int>& GetChannels() const { return moChannels; }

private:
    BkgdRule meRule;                      // of several channels
    std::vector<double> moValues;         // one for each channel of the list
    std::vector<unsigned int> moChannels; // from 1
};

// Builds masks from a decision, of which it keeps a copy. A set bit is background.
// Any thread may build masks of rasters of its own.
class KRV_GOBS_API MaskDecisionBuilder : public IMaskBuilder
{
public:
    // Throws DataException for a null decision.
    explicit MaskDecisionBuilder(const IMaskDecision* poDecision);
    ~MaskDecisionBuilder() override;

    Mask* BuildMask(const Raster& oRaster) const override;
    const IMaskDecision& GetDecision() const { return *mpoDecision; }

private:
    std::shared_ptr<const IMaskDecision> mpoDecision;
};

// The implementation for one pixel type, owned by the caller. Comparison is made in the pixel's own type: a value that
// the type cannot hold never matches; a NaN value matches NaN pixels; -0 equals 0.
// For implementations of IMaskDecision; programs ask a decision.
KRV_GOBS_API IMaskDecisionImpl* GetMaskDecisionImpl(DataType oType, unsigned long long nChannels, BkgdRule eRule,
                                                    std::vector<double> oValues, std::vector<unsigned int> oChannels);

} // namespace krv::gobs

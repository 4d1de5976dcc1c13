#pragma once

#include "gobs/api.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/raster/datatype.h"

#include <cstddef>
#include <memory>
#include <optional>
#include <vector>

namespace krv::gobs
{

// The no-data values of the channels of an image, in their order.
// Nothing for a channel without such a value; its samples are then valid, NaN aside where that is asked for.
using NoDataNumbers = std::vector<std::optional<SampleValue>>;

// Finds samples that are not valid by themselves in a row that begins with the first channel.
// Any thread. Samples are in the type that the test was made for.
class KRV_GOBS_API ISampleTest
{
public:
    virtual ~ISampleTest();
    // Whether any of the samples is not valid. nSamples: pixels times channels.
    virtual bool FindsAny(const unsigned char* pSamples, std::size_t nSamples) const = 0;
    // Writes a byte per sample, 1 when it is valid and else 0.
    virtual void Mark(const unsigned char* pSamples, std::size_t nSamples, unsigned char* pValid) const = 0;
};

// Gives values that are not valid a value, and keeps valid ones apart from the
// no-data value.
// Any thread. What is not valid becomes the channel's no-data value, else 0; see MakeSampleTest for NaN.
class KRV_GOBS_API IValueFinisher
{
public:
    virtual ~IValueFinisher();
    // Values from the first channel on; pValid: a byte per value, or null when all are valid.
    // nValues: pixels times channels. In place.
    virtual void Finish(unsigned char* pValues, const unsigned char* pValid, std::size_t nValues) const = 0;
    // Whether it has something to do where all are valid.
    virtual bool ChangesValid() const = 0;
};

// Over rows of pixels with as many channels as there are numbers. With bNaNIsNoData NaN samples of real types are not
// valid either, and what is not valid in a channel without a number becomes NaN.
// The test is for types that are not complex; null when no sample can be invalid.
// oNumbers: one for each channel, copied. The caller owns the result.
KRV_GOBS_API std::unique_ptr<ISampleTest> MakeSampleTest(const DataType& oType, const NoDataNumbers& oNumbers,
                                                         bool bNaNIsNoData);
KRV_GOBS_API std::unique_ptr<IValueFinisher> MakeValueFinisher(const DataType& oType, const NoDataNumbers& oNumbers,
                                                               bool bNaNIsNoData);

} // namespace krv::gobs

#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::mathmodel
{
class IMathModel;
}

namespace krv::datasources
{

// The orbits of a dataset, in numbered segments. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IEphemerisDataset
{
public:
    virtual ~IEphemerisDataset();

    // Non-zero when the dataset holds ephemeris data.
    virtual int HasEphemeris() const = 0;
    virtual std::vector<unsigned int> GetEphemerisList() const = 0;
    virtual void DeleteEphemeris(unsigned int nSegment) = 0;
    // A new model from an ephemeris segment and a further segment (0: none), owned by the caller. Throws krv::Exception
    // when they make none.
    virtual krv::mathmodel::IMathModel* BuildMathModel(unsigned int nEphemeris, unsigned int nSegment) = 0;
};

} // namespace krv::datasources

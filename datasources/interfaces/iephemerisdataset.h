#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::mathmodel
{
class IMathModel;
}

namespace krv::datasources
{

// The orbits of a dataset, in numbered segments. The order of the virtual operations is public and fixed.
// Formats that only keep orbits need not make models of them: LoadMathModel tries, and tells.
class KRV_DATASOURCES_API IEphemerisDataset
{
public:
    virtual ~IEphemerisDataset();

    // Non-zero when the dataset holds ephemeris data.
    virtual int HasEphemeris() const = 0;
    // The numbers of the segments, ascending; empty when there are none.
    virtual std::vector<unsigned int> GetEphemerisList() const = 0;
    // Throws DataException for a number that is not in the list and for a dataset that is not open for updating.
    virtual void DeleteEphemeris(unsigned int nSegment) = 0;
    // A new model from an ephemeris segment and a further segment (0: none), owned by the caller. Throws krv::Exception
    // when they make none.
    virtual krv::mathmodel::IMathModel* BuildMathModel(unsigned int nEphemeris, unsigned int nSegment) = 0;
    // Stores records as they are and returns their segment. kind: what wrote them and how they are laid out, in words
    // that whoever reads them knows. Throws DataException where the format has no place for them.
    virtual unsigned int CreateEphemeris(const std::string& kind, const std::vector<unsigned char>& oRecords) = 0;
};

// Records of a segment as they were stored.
struct EphemerisRecords
{
    std::string kind;                 // as CreateEphemeris got it
    std::vector<unsigned char> bytes; // in the layout that the kind stands for
};

// A dataset that hands its orbits out as records, whether or not it makes models of them. The order of the virtual
// operations is public and fixed.
class KRV_DATASOURCES_API IEphemerisRecords
{
public:
    virtual ~IEphemerisRecords();

    // Throws DataException for a segment that is none of ephemeris.
    virtual EphemerisRecords ReadEphemeris(unsigned int nSegment) const = 0;
};

} // namespace krv::datasources

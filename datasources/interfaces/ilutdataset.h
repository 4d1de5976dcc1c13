#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// A lookup table: what becomes of values of a channel when it is shown or used. Between entries results are
// interpolated linearly, before the first and behind the last they stay the same.
// Values ascend in a table. Example: {{0, 0}, {4095, 255}} shows 12 bits in 8.
struct LookupEntry
{
    double value = 0.0;
    double result = 0.0;

    friend bool operator==(const LookupEntry&, const LookupEntry&) = default;
};
using LookupTable = std::vector<LookupEntry>;

// The lookup tables of a dataset, each with a number from 1, as reference tags of the layer "LUT" name them. The order
// of the virtual operations is public and fixed.
// Tables are kept and handed out; readers do not apply them.
class KRV_DATASOURCES_API ILUTDataset
{
public:
    virtual ~ILUTDataset();

    // Ascending.
    virtual std::vector<unsigned int> GetLUTList() const = 0;
    // Throws DataException for a number that is not in the list, as those below do.
    virtual LookupTable GetLUT(unsigned int nLUT) const = 0;
    // The channel that the table belongs to, or 0.
    virtual unsigned int GetLUTChannel(unsigned int nLUT) const = 0;
    // Empty when nobody gave one.
    virtual std::string GetLUTDescription(unsigned int nLUT) const = 0;
    // Stores a table for a channel (0: none) and returns its number. Throws DataException for a table whose values do
    // not ascend.
    virtual unsigned int CreateLUT(const LookupTable& oTable, unsigned int nChannel) = 0;
    // Replaces the entries; number and channel stay. Throws what CreateLUT throws.
    virtual void UpdateLUT(unsigned int nLUT, const LookupTable& oTable) = 0;
    // Throws DataException for a dataset that is not open for updating.
    virtual void SetLUTDescription(unsigned int nLUT, const std::string& oDescription) = 0;
    // The other tables keep their numbers. Tags that refer to the table stay. Throws the same.
    virtual void DeleteLUT(unsigned int nLUT) = 0;
};

} // namespace krv::datasources

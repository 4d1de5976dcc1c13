#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// What a format is called. The order of the virtual operations is public and fixed.
// Any thread; the answers never change. Owned by the builder of the format.
class KRV_DATASOURCES_API IFileFormat
{
public:
    virtual ~IFileFormat();

    // A name for people, such as "GeoTIFF".
    virtual std::string GetDescription() const = 0;
    // File name endings without the dot.
    // None for a format that is known by its contents alone.
    // In small letters, the usual one first.
    virtual std::vector<std::string> GetExtensions() const = 0;
    // The name by which the manager knows the format. Upper case: GetFormatByName finds no other.
    virtual std::string GetShortName() const = 0;
};

// Keeps extensions and short name for a concrete format.
// A concrete format adds GetDescription.
class KRV_DATASOURCES_API ABSFileFormat : public IFileFormat
{
public:
    ABSFileFormat(const ABSFileFormat& oOther);
    ~ABSFileFormat() override;
    ABSFileFormat& operator=(const ABSFileFormat& oOther);

    // What the assignment operator does, for derived classes that have one of their own.
    void Assignment(const ABSFileFormat& oOther);

    std::vector<std::string> GetExtensions() const override;
    std::string GetShortName() const override;

protected:
    ABSFileFormat();

    // Both are copied. shortName: in capitals.
    ABSFileFormat(const std::vector<std::string>& oExtensions, std::string shortName);

private:
    std::vector<std::string> moExtensions;
    std::string moShortName;
};

} // namespace krv::datasources

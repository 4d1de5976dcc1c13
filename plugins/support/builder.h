#pragma once

#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ifileiobuilder.h"
#include "datasources/interfaces/iformatoptions.h"
#include "plugins/support/writing/options.h"
#include "toolkit/exceptions/place.h"

#include <string>
#include <vector>

namespace krv::plugins::support
{

// The description of a format, given as plain values.
// Belongs to the builder, which hands a pointer to it to the datasets that it makes.
class FormatDescription : public krv::datasources::ABSFileFormat, public krv::datasources::IFormatOptions
{
public:
    // oExtensions: small letters without the dot, the usual one first. shortName: capitals, unique among all formats.
    FormatDescription(const std::string& description, const std::vector<std::string>& oExtensions,
                      const std::string& shortName);
    ~FormatDescription() override;

    std::string GetDescription() const override { return moDescription; }
    std::vector<krv::datasources::FormatOption> ListOptions() const override { return moOptions; }

    // Replaces the list; in the order in which help texts show them.
    void SetOptions(std::vector<krv::datasources::FormatOption> oOptions) { moOptions = std::move(oOptions); }

private:
    std::string moDescription;
    std::vector<krv::datasources::FormatOption> moOptions; // as help texts show them
};

// A builder that opens files only: Create throws DataException until a format overrides it. A format adds Open and
// Identify.
// Example:
//   class MyBuilder : public Builder { ... MyBuilder() : Builder("My images", {"my"}, "MY") {} ... };
//   KRV_FORMAT_PLUGIN(MyBuilder)
class Builder : public krv::datasources::IFileIOBuilder
{
public:
    Builder(const std::string& description, const std::vector<std::string>& oExtensions, const std::string& shortName);
    ~Builder() override;

    // The builder's own; never null.
    krv::datasources::IFileFormat* GetFileFormat() override { return &moFormat; }

    // The message names the file and says that the format cannot make new ones.
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;

protected:
    // What is told of the options of a new file; a format with options says them when it is made.
    // Called by the format's constructor, with what Options::Describe gives.
    void DescribeOptions(const std::vector<Options::Description>& oOptions);
    // Throws DataException for eUpdate, for formats that only read.
    // eMode: as the manager passed it. For the first line of Open.
    void CheckReadOnly(const std::string& fileName, AccessMode eMode, const Place& oPlace = Place::Current()) const;
    // Throws DataException for options of a new file, for formats that have none.
    void RefuseOptions(const std::string& fileName, const std::string& options,
                       const Place& oPlace = Place::Current()) const;

private:
    FormatDescription moFormat;
};

} // namespace krv::plugins::support

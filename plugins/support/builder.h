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
class FormatDescription : public krv::datasources::ABSFileFormat, public krv::datasources::IFormatOptions
{
public:
    FormatDescription(const std::string& description, const std::vector<std::string>& oExtensions,
                      const std::string& shortName);
    ~FormatDescription() override;

    std::string GetDescription() const override { return moDescription; }
    std::vector<krv::datasources::FormatOption> ListOptions() const override { return moOptions; }
    void SetOptions(std::vector<krv::datasources::FormatOption> oOptions) { moOptions = std::move(oOptions); }

private:
    std::string moDescription;
    std::vector<krv::datasources::FormatOption> moOptions;
};

// A builder that opens files only: Create throws DataException until a format overrides it. A format adds Open and
// Identify.
class Builder : public krv::datasources::IFileIOBuilder
{
public:
    Builder(const std::string& description, const std::vector<std::string>& oExtensions, const std::string& shortName);
    ~Builder() override;

    krv::datasources::IFileFormat* GetFileFormat() override { return &moFormat; }
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;

protected:
    // What is told of the options of a new file; a format with options says them when it is made.
    void DescribeOptions(const std::vector<Options::Description>& oOptions);
    // Throws DataException for eUpdate, for formats that only read.
    void CheckReadOnly(const std::string& fileName, AccessMode eMode, const Place& oPlace = Place::Current()) const;
    // Throws DataException for options of a new file, for formats that have none.
    void RefuseOptions(const std::string& fileName, const std::string& options,
                       const Place& oPlace = Place::Current()) const;

private:
    FormatDescription moFormat;
};

} // namespace krv::plugins::support

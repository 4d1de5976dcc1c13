#pragma once

#include "plugins/support/writing/filewriter.h"

#include <cstdint>
#include <memory>
#include <string>

namespace krv::plugins::raw
{

// A data file that is written, with its header. Pixels are written in place. The header is another file, which is
// replaced as a whole; a new pair is there when both are.
class RawWriter : public support::FileWriter
{
public:
    // A new file, which Make makes, with a header of that name.
    RawWriter(const std::string& fileName, const std::string& headerName);
    // An existing one, open for it. The header's name is empty for files without one.
    RawWriter(std::shared_ptr<support::File> poFile, const std::string& headerName);
    ~RawWriter() override;

    const std::string& GetHeaderName() const { return moHeaderName; }

    // A file of nBytes bytes of 0; nothing is left when it throws.
    void Make(std::uint64_t nBytes);
    // Takes effect with Synchronize.
    void SetHeader(const std::string& text);
    // To be called before pixels change.
    void BeginChange();

protected:
    void Store() override;
    bool HoldsChanges() const override { return mbPixels || mbHeader; }
    void GiveName() override;

private:
    std::unique_ptr<support::NewFile> MakeHeader() const;

    std::string moHeaderName;
    std::string moHeader;
    bool mbPixels = false;
    bool mbHeader = false;
};

} // namespace krv::plugins::raw

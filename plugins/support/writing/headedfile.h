#pragma once

#include "plugins/support/writing/filewriter.h"

#include <cstdint>
#include <memory>
#include <sstream>
#include <string>

namespace krv::plugins::support
{

// A file that begins with a header: a line that tells its kind, lines of text, an empty line. A new one leaves 64 KiB
// for the header, filled up with blanks, so that the text may change; what follows is written in place. While anything
// is not stored the first line is another one, set on the disk before whatever it warns of, so that nobody takes half
// of a change for the whole.
class HeadedFile : public FileWriter
{
public:
    // The first lines, of one length, with their ends.
    // Example: {"MYFORMAT 1\n", "UNFINISHED\n"} with blanks so that both have one length.
    struct FirstLines
    {
        std::string moFinished;
        std::string moUnfinished;
    };

    // A new file, which Make makes.
    // oFirstLines: copied. Nothing is made yet.
    HeadedFile(const std::string& fileName, const FirstLines& oFirstLines);
    // An existing one. Throws FileFormatException for anything but a whole header of a finished file.
    HeadedFile(std::shared_ptr<File> poFile, const FirstLines& oFirstLines);
    ~HeadedFile() override;

    // The lines behind the first one, in the C locale.
    std::istringstream ReadHeader() const;
    // Where the header ends.
    std::uint64_t GetHeaderBytes() const { return mnHeaderBytes; }

    // A file of a header and nBytes bytes of 0; nothing is left when it throws.
    void Make(const std::string& header, std::uint64_t nBytes);
    // Takes effect with Store. Throws DataException when there is no room for the text, which changes nothing.
    void SetHeader(const std::string& header);
    // To be called before anything behind the header changes.
    void BeginChange();
    // Adds nBytes bytes of 0 and returns where they begin.
    // What nothing in the header names is nobody's.
    std::uint64_t Append(std::uint64_t nBytes);

protected:
    void Store() override;
    bool HoldsChanges() const override { return mbChanged; }

private:
    FirstLines moFirstLines; // of one length
    std::string moHeader;    // the text behind the first line, as Store writes it
    std::uint64_t mnHeaderBytes;
    bool mbMarked = false;  // for certain, on the disk
    bool mbChanged = false; // or about to be
};

} // namespace krv::plugins::support

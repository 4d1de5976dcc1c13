#pragma once

#include "fuzz/support/choices.h"
#include "plugins/tif/tifdataset.h"

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace krv::fuzz
{

using TifPointer = std::unique_ptr<krv::plugins::tif::TifDataset>;

// The samples of an image, a level or a bitmap, pixel interleaved, and which of them are known: what a damaged file or
// a lossy codec makes of the others may be anything.
struct Samples
{
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    unsigned int mnChannels = 0;
    std::size_t mnValueBytes = 0;
    std::vector<unsigned char> moBytes;
    std::vector<unsigned char> moKnown; // of each value: 0 or 1
};

// All that a dataset says of its file.
struct View
{
    Samples moImage;
    std::map<unsigned int, Samples> moLevels;
    std::map<unsigned int, Samples> moBitmaps;
    std::map<unsigned int, std::string> moStates; // of the channels of each level, 1: valid
    std::string moRecord;                         // metadata of file and channels, descriptions
    std::string moBitmapTexts;
    std::string moTables;
    std::string moGeography; // geocoding and reference system
};

// Changes a dataset at random beside a model of its file. Throws std::logic_error, with a text that says why, when an
// operation gives anything but what the model says, when one that throws changes something, and when the file that is
// left says anything but the dataset did. Pixels that a lossy codec stores are not compared.
class Edits
{
public:
    Edits(const std::string& fileName, Choices& oProgram);

    // Whether the dataset is small enough to be compared all the time.
    static bool IsSmall(krv::plugins::tif::TifDataset& oDataset, std::uint64_t nMostBytes = 1U << 14);

    void Run(TifPointer poDataset);

private:
    using Part = std::string View::*;

    void Step();
    // What may change is taken as it is afterwards.
    bool Try(const char* pWhat, const std::function<void()>& oAction, const std::vector<Part>& oMay);
    void Check(const char* pWhat, const View& oGot) const;
    void WriteWindow();
    // Whether it was not refused.
    bool WritePixels(krv::datasources::IRasterIO& oIO, Samples& oSamples, const std::vector<unsigned int>& oChannels,
                     bool bBits);
    void ChangeChannels();
    void ChangeRecord();
    void ChangeLevels();
    void ChangeBitmaps();
    void ChangeTables();
    void ChangeGeography();
    void Synchronize();
    void Reopen();

    std::string moFileName;
    Choices& moProgram;
    bool mbLossy = false;
    TifPointer mpoDataset;
    View moModel;
    View moStored; // as of the last time that the file was written
    bool mbNamed = false;
};

// An open file, of any bytes; or null when it cannot be opened so.
TifPointer OpenTif(const std::string& fileName, AccessMode eMode);

} // namespace krv::fuzz

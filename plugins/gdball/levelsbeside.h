#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "gobs/raster/datatype.h"

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::gdball
{

// The levels of an image in a file of their own, "<image>.ovr": a TIFF whose first page is the largest level, the
// others are levels below it. Their states stand in its record. One thread at a time.
class LevelsBeside
{
public:
    // Of an image of one size and of channels of one type. Looks for the file; one of another image is not used, and a
    // warning says so.
    LevelsBeside(const std::string& imageName, krv::datasources::IRasterDataset& oImage, AccessMode eMode);
    ~LevelsBeside();

    // Whether the file is there and used, or was made.
    bool IsOpen() const { return mpoFile != nullptr; }

    std::vector<unsigned int> GetLevels() const;
    krv::datasources::IRasterIO* OpenLevel(unsigned int nLevel, const std::vector<unsigned int>& oChannels);
    // The largest of all comes first, and the others are multiples of it: else DataException.
    void MakeLevel(unsigned int nLevel);
    // The largest goes with all others alone.
    void DropLevel(unsigned int nLevel);
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const;
    void SetValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid);
    // All of them, when pixels of the image changed.
    void ForgetLevels();
    std::pair<unsigned int, unsigned int> GetSize(unsigned int nLevel) const;
    krv::datasources::AuxiliaryData ReadRecord(unsigned int nLevel) const;
    std::string GetMethod() const;
    void SetMethod(const std::string& name);

    void Synchronize();
    void Close();

private:
    struct Image
    {
        unsigned int mnWidth;
        unsigned int mnHeight;
        std::vector<krv::gobs::DataType> moTypes;
    };

    krv::datasources::IRasterDataset& GetRaster() const;
    void OpenFile();
    std::string FindFault() const;
    void ListLevels();
    // The number that the file has a level under; 1 for its first page.
    unsigned int FindOwn(unsigned int nLevel, const Place& oPlace) const;
    krv::datasources::IOverviewManager& GetOwn() const;
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

    std::string moName; // of the image
    std::string moFileName;
    Image moImage;
    AccessMode meMode;
    std::unique_ptr<krv::datasources::IDataset> mpoFile;
    mutable std::unique_ptr<krv::datasources::IOverviewManager> mpoOwn; // its own levels
    std::map<unsigned int, unsigned int> moLevels;                      // as the image numbers them, and the file
    std::string moMethod;
    bool mbForgotten = false;
};

// The number of a level by its size and that of the image: one whose size, rounded up, is this, powers of two first; or
// rounded down; no value for the size of something else.
std::optional<unsigned int> FindLevelNumber(unsigned int nWidth, unsigned int nHeight, unsigned int nLevelWidth,
                                            unsigned int nLevelHeight);

} // namespace krv::plugins::gdball

#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/raster/datatype.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::krvdsk
{

// The file that holds the linked channels of a native file. It is opened when something of it is wanted first, and then
// checked: it has the size of the image, and each channel that is linked has its type still. One thread at a time.
class Link
{
public:
    // What the native file relies on.
    struct Channel
    {
        unsigned int mnNumber = 0; // in the other file
        krv::gobs::DataType moType;
    };

    // By which a change of the other file is noticed: its bytes and when it was modified, in nanoseconds since 1970; of
    // one that is linked itself the sums with those of the files that it leads to, modulo 2^64.
    struct State
    {
        std::uint64_t mnBytes = 0;
        std::uint64_t mnModified = 0;

        friend bool operator==(const State&, const State&) = default;
    };

    // owner: the native file; path: from its folder to the other one.
    Link(const std::string& owner, const std::string& path, unsigned int nWidth, unsigned int nHeight,
         std::vector<Channel> oChannels);
    ~Link();
    Link(const Link&) = delete;
    Link& operator=(const Link&) = delete;

    const std::string& GetOwner() const { return moOwner; }
    // A name that opens the other file.
    const std::string& GetName() const { return moName; }

    // The other file. Throws krv::FileException naming both when it is not there, or not what it was, and DataException
    // for a link that leads back or is one of too many.
    krv::datasources::IDataset& Get(const Place& oPlace = Place::Current());
    // The same without an exception: null when it cannot be had.
    krv::datasources::IDataset* Find() noexcept;
    // A facet of it, or null.
    template <typename Facet>
    Facet* Find() noexcept
    {
        return dynamic_cast<Facet*>(Find());
    }

    // What it was before it was opened, or is when it cannot be; no value when it is not there.
    std::optional<State> FindState() noexcept;

    // Throws krv::IOException: what went wrong with the other file, naming both. To be called in a catch block of
    // krv::Exception alone.
    [[noreturn]] void Rethrow(const Place& oPlace = Place::Current()) const;

private:
    void Open(const Place& oPlace);
    void Check(const krv::datasources::IDataset& oDataset) const;

    std::string moOwner;
    std::string moName;
    unsigned int mnWidth;
    unsigned int mnHeight;
    std::vector<Channel> moChannels;
    std::optional<State> moState;
    std::unique_ptr<krv::datasources::IDataset> mpoDataset;
};

// The channels of an image that have more than one bit, which are those that are linked.
std::vector<Link::Channel> FindLinkableChannels(const krv::datasources::IDataset& oDataset);

} // namespace krv::plugins::krvdsk

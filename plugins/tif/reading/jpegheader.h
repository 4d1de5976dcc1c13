#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace krv::plugins::tif
{

// What a JPEG stream says before its first pixels: tables and frame. Tag 347 holds a stream of tables alone, which the
// strips and tiles of its page go by. Everything points into the bytes that were read.
struct JpegHeader
{
    using Bytes = std::span<const unsigned char>;

    // Each kind of table has four places.
    enum Kind : unsigned int
    {
        eQuantisation = 0,
        eDc = 4,
        eAc = 8
    };
    static constexpr unsigned int PLACES = 4;
    static constexpr unsigned int TABLES = 12;

    struct Component
    {
        std::uint8_t mnNumber = 0;
        std::uint8_t mnAcross = 1; // samples for each block of the coarsest component
        std::uint8_t mnDown = 1;
        std::uint8_t mnQuantisation = 0; // places of its tables
        std::uint8_t mnDc = 0;
        std::uint8_t mnAc = 0;
    };

    // Never fails: what makes no sense ends the reading.
    static JpegHeader Read(Bytes oStream);

    bool Has(unsigned int nTable) const { return !moTables[nTable].empty(); }

    // Whether it ended at its first pixels or at its end.
    bool mbWhole = false;
    bool mbFirstScanIsAll = false;       // no further scans, no tables between them
    std::vector<Component> moComponents; // none without a frame
    // By kind plus place: a table as it is stored, from the byte with its place on. Empty: not there.
    std::array<Bytes, TABLES> moTables;

private:
    bool ReadTables(Bytes oSegment, bool bHuffman);
    bool ReadFrame(Bytes oSegment);
    bool ReadScan(Bytes oSegment);
};

// Makes streams that go by a page's tables complete in themselves, so that what a decoder kept of streams before does
// not matter. One thread at a time.
class JpegCompleter
{
public:
    // oShared: the bytes of tag 347, empty when there is none.
    explicit JpegCompleter(std::span<const unsigned char> oShared);

    // The stream itself when it needs nothing, else one that is valid until the next call. A Huffman table that is
    // nowhere is the standard's own one, as in motion JPEG. False when a table of quantisation is nowhere.
    bool Complete(std::span<unsigned char>& oStream);

private:
    std::vector<unsigned char> moShared;
    JpegHeader moHeader;
    std::vector<unsigned char> moComplete;
};

// The standard's Huffman table: nTable is the kind plus place 0 (brightness) or 1 (colour), the form that of moTables.
std::span<const unsigned char> GetStandardTable(unsigned int nTable);

} // namespace krv::plugins::tif

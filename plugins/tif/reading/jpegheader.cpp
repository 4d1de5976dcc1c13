#include "plugins/tif/reading/jpegheader.h"

#include <algorithm>
#include <cstring>

namespace krv::plugins::tif
{

namespace
{

using Bytes = JpegHeader::Bytes;

constexpr unsigned char MARKER = 0xFF;
constexpr unsigned char START_OF_IMAGE = 0xD8;
constexpr unsigned char END_OF_IMAGE = 0xD9;
constexpr unsigned char START_OF_SCAN = 0xDA;
constexpr unsigned char QUANTISATION_TABLES = 0xDB;
constexpr unsigned char HUFFMAN_TABLES = 0xC4;
constexpr std::size_t CODE_LENGTHS = 16;

// The tables that the standard gives for typical images, which streams go by that name none.
constexpr unsigned char BRIGHTNESS_DC[] = {0x00, 0x00, 0x01, 0x05, 0x01, 0x01, 0x01, 0x01, 0x01, 0x01,
                                           0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x01, 0x02,
                                           0x03, 0x04, 0x05, 0x06, 0x07, 0x08, 0x09, 0x0a, 0x0b};
constexpr unsigned char COLOUR_DC[] = {0x01, 0x00, 0x03, 0x01, 0x01, 0x01, 0x01, 0x01, 0x01, 0x01,
                                       0x01, 0x01, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x01, 0x02,
                                       0x03, 0x04, 0x05, 0x06, 0x07, 0x08, 0x09, 0x0a, 0x0b};
constexpr unsigned char BRIGHTNESS_AC[] = {
    0x10, 0x00, 0x02, 0x01, 0x03, 0x03, 0x02, 0x04, 0x03, 0x05, 0x05, 0x04, 0x04, 0x00, 0x00, 0x01, 0x7d, 0x01,
    0x02, 0x03, 0x00, 0x04, 0x11, 0x05, 0x12, 0x21, 0x31, 0x41, 0x06, 0x13, 0x51, 0x61, 0x07, 0x22, 0x71, 0x14,
    0x32, 0x81, 0x91, 0xa1, 0x08, 0x23, 0x42, 0xb1, 0xc1, 0x15, 0x52, 0xd1, 0xf0, 0x24, 0x33, 0x62, 0x72, 0x82,
    0x09, 0x0a, 0x16, 0x17, 0x18, 0x19, 0x1a, 0x25, 0x26, 0x27, 0x28, 0x29, 0x2a, 0x34, 0x35, 0x36, 0x37, 0x38,
    0x39, 0x3a, 0x43, 0x44, 0x45, 0x46, 0x47, 0x48, 0x49, 0x4a, 0x53, 0x54, 0x55, 0x56, 0x57, 0x58, 0x59, 0x5a,
    0x63, 0x64, 0x65, 0x66, 0x67, 0x68, 0x69, 0x6a, 0x73, 0x74, 0x75, 0x76, 0x77, 0x78, 0x79, 0x7a, 0x83, 0x84,
    0x85, 0x86, 0x87, 0x88, 0x89, 0x8a, 0x92, 0x93, 0x94, 0x95, 0x96, 0x97, 0x98, 0x99, 0x9a, 0xa2, 0xa3, 0xa4,
    0xa5, 0xa6, 0xa7, 0xa8, 0xa9, 0xaa, 0xb2, 0xb3, 0xb4, 0xb5, 0xb6, 0xb7, 0xb8, 0xb9, 0xba, 0xc2, 0xc3, 0xc4,
    0xc5, 0xc6, 0xc7, 0xc8, 0xc9, 0xca, 0xd2, 0xd3, 0xd4, 0xd5, 0xd6, 0xd7, 0xd8, 0xd9, 0xda, 0xe1, 0xe2, 0xe3,
    0xe4, 0xe5, 0xe6, 0xe7, 0xe8, 0xe9, 0xea, 0xf1, 0xf2, 0xf3, 0xf4, 0xf5, 0xf6, 0xf7, 0xf8, 0xf9, 0xfa};
constexpr unsigned char COLOUR_AC[] = {
    0x11, 0x00, 0x02, 0x01, 0x02, 0x04, 0x04, 0x03, 0x04, 0x07, 0x05, 0x04, 0x04, 0x00, 0x01, 0x02, 0x77, 0x00,
    0x01, 0x02, 0x03, 0x11, 0x04, 0x05, 0x21, 0x31, 0x06, 0x12, 0x41, 0x51, 0x07, 0x61, 0x71, 0x13, 0x22, 0x32,
    0x81, 0x08, 0x14, 0x42, 0x91, 0xa1, 0xb1, 0xc1, 0x09, 0x23, 0x33, 0x52, 0xf0, 0x15, 0x62, 0x72, 0xd1, 0x0a,
    0x16, 0x24, 0x34, 0xe1, 0x25, 0xf1, 0x17, 0x18, 0x19, 0x1a, 0x26, 0x27, 0x28, 0x29, 0x2a, 0x35, 0x36, 0x37,
    0x38, 0x39, 0x3a, 0x43, 0x44, 0x45, 0x46, 0x47, 0x48, 0x49, 0x4a, 0x53, 0x54, 0x55, 0x56, 0x57, 0x58, 0x59,
    0x5a, 0x63, 0x64, 0x65, 0x66, 0x67, 0x68, 0x69, 0x6a, 0x73, 0x74, 0x75, 0x76, 0x77, 0x78, 0x79, 0x7a, 0x82,
    0x83, 0x84, 0x85, 0x86, 0x87, 0x88, 0x89, 0x8a, 0x92, 0x93, 0x94, 0x95, 0x96, 0x97, 0x98, 0x99, 0x9a, 0xa2,
    0xa3, 0xa4, 0xa5, 0xa6, 0xa7, 0xa8, 0xa9, 0xaa, 0xb2, 0xb3, 0xb4, 0xb5, 0xb6, 0xb7, 0xb8, 0xb9, 0xba, 0xc2,
    0xc3, 0xc4, 0xc5, 0xc6, 0xc7, 0xc8, 0xc9, 0xca, 0xd2, 0xd3, 0xd4, 0xd5, 0xd6, 0xd7, 0xd8, 0xd9, 0xda, 0xe2,
    0xe3, 0xe4, 0xe5, 0xe6, 0xe7, 0xe8, 0xe9, 0xea, 0xf2, 0xf3, 0xf4, 0xf5, 0xf6, 0xf7, 0xf8, 0xf9, 0xfa};

bool HasNoLength(unsigned char nMarker)
{
    return nMarker == START_OF_IMAGE || nMarker == 0x01 || (nMarker >= 0xD0 && nMarker <= 0xD7);
}

bool IsFrame(unsigned char nMarker)
{
    return nMarker >= 0xC0 && nMarker <= 0xCF && nMarker != HUFFMAN_TABLES && nMarker != 0xC8 && nMarker != 0xCC;
}

std::size_t GetTableBytes(Bytes oSegment, bool bHuffman)
{
    if (!bHuffman)
        return 1 + 64 * (oSegment[0] >> 4 != 0 ? 2U : 1U);
    std::size_t nBytes = 1 + CODE_LENGTHS;
    for (std::size_t nAt = 1; nAt <= CODE_LENGTHS && nAt < oSegment.size(); ++nAt)
        nBytes += oSegment[nAt];
    return nBytes;
}

void Append(std::vector<unsigned char>& oStream, Bytes oTable, bool bHuffman)
{
    const std::size_t nLength = oTable.size() + 2;
    const unsigned char aBegin[] = {MARKER, bHuffman ? HUFFMAN_TABLES : QUANTISATION_TABLES,
                                    static_cast<unsigned char>(nLength >> 8), static_cast<unsigned char>(nLength)};
    oStream.insert(oStream.end(), std::begin(aBegin), std::end(aBegin));
    oStream.insert(oStream.end(), oTable.begin(), oTable.end());
}

} // namespace

Bytes GetStandardTable(unsigned int nTable)
{
    constexpr Bytes STANDARD[] = {BRIGHTNESS_DC, COLOUR_DC, BRIGHTNESS_AC, COLOUR_AC};
    const bool bKnown = nTable >= JpegHeader::eDc && nTable % JpegHeader::PLACES < 2;
    return bKnown ? STANDARD[(nTable - JpegHeader::eDc) / 2 + nTable % 2] : Bytes();
}

bool JpegHeader::ReadTables(Bytes oSegment, bool bHuffman)
{
    while (!oSegment.empty())
    {
        const unsigned int nPlace = oSegment[0] & 15U;
        const unsigned int nClass = oSegment[0] >> 4U;
        const std::size_t nBytes = GetTableBytes(oSegment, bHuffman);
        if (nPlace >= PLACES || nClass > 1 || nBytes > oSegment.size())
            return false;
        const unsigned int nKind = !bHuffman ? eQuantisation : nClass == 0 ? eDc : eAc;
        moTables[nKind + nPlace] = oSegment.first(nBytes);
        oSegment = oSegment.subspan(nBytes);
    }
    return true;
}

bool JpegHeader::ReadFrame(Bytes oSegment)
{
    if (oSegment.size() < 6 || oSegment.size() < 6 + std::size_t{3} * oSegment[5])
        return false;
    moComponents.clear();
    for (std::size_t nAt = 6; nAt < 6 + std::size_t{3} * oSegment[5]; nAt += 3)
        moComponents.push_back({oSegment[nAt], static_cast<std::uint8_t>(oSegment[nAt + 1] >> 4),
                                static_cast<std::uint8_t>(oSegment[nAt + 1] & 15),
                                static_cast<std::uint8_t>(oSegment[nAt + 2] % PLACES), 0, 0});
    return true;
}

bool JpegHeader::ReadScan(Bytes oSegment)
{
    if (oSegment.empty() || oSegment.size() < 1 + std::size_t{2} * oSegment[0])
        return false;
    for (std::size_t nAt = 1; nAt < 1 + std::size_t{2} * oSegment[0]; nAt += 2)
        for (Component& oComponent : moComponents)
            if (oComponent.mnNumber == oSegment[nAt])
            {
                oComponent.mnDc = (oSegment[nAt + 1] >> 4) % PLACES;
                oComponent.mnAc = (oSegment[nAt + 1] & 15) % PLACES;
            }
    mbFirstScanIsAll = mbFirstScanIsAll && oSegment[0] == moComponents.size();
    return true;
}

JpegHeader JpegHeader::Read(Bytes oStream)
{
    JpegHeader oHeader;
    for (std::size_t nAt = 0; nAt + 1 < oStream.size();)
    {
        const unsigned char nMarker = oStream[nAt + 1];
        // Decoders pass over what is no marker between segments.
        if (oStream[nAt] != MARKER || nMarker == 0 || nMarker == MARKER)
        {
            ++nAt;
            continue;
        }
        nAt += 2;
        oHeader.mbWhole = nMarker == END_OF_IMAGE;
        if (oHeader.mbWhole)
            break;
        if (HasNoLength(nMarker))
            continue;
        const std::size_t nLength = oStream.size() < nAt + 2 ? 0 : oStream[nAt] * 256U + oStream[nAt + 1];
        if (nLength < 2 || nLength > oStream.size() - nAt)
            break;
        const Bytes oSegment = oStream.subspan(nAt + 2, nLength - 2);
        nAt += nLength;
        bool bSound = true;
        if (nMarker == QUANTISATION_TABLES || nMarker == HUFFMAN_TABLES)
            bSound = oHeader.ReadTables(oSegment, nMarker == HUFFMAN_TABLES);
        else if (IsFrame(nMarker))
        {
            oHeader.mbFirstScanIsAll = nMarker <= 0xC1;
            bSound = oHeader.ReadFrame(oSegment);
        }
        else if (nMarker == START_OF_SCAN)
            oHeader.mbWhole = oHeader.ReadScan(oSegment);
        if (!bSound || nMarker == START_OF_SCAN)
            break;
    }
    return oHeader;
}

JpegCompleter::JpegCompleter(Bytes oShared)
    : moShared(oShared.begin(), oShared.end()), moHeader(JpegHeader::Read(moShared))
{
}

bool JpegCompleter::Complete(std::span<unsigned char>& oStream)
{
    const JpegHeader oHeader = JpegHeader::Read(oStream);
    std::array<bool, JpegHeader::TABLES> aWanted{};
    for (const JpegHeader::Component& oComponent : oHeader.moComponents)
        for (const unsigned int nTable : {JpegHeader::eQuantisation + oComponent.mnQuantisation,
                                          JpegHeader::eDc + oComponent.mnDc, JpegHeader::eAc + oComponent.mnAc})
            aWanted[nTable] = true;
    moComplete.assign({MARKER, START_OF_IMAGE});
    for (unsigned int nTable = 0; nTable < JpegHeader::TABLES; ++nTable)
    {
        const Bytes oTable = moHeader.Has(nTable) ? moHeader.moTables[nTable] : GetStandardTable(nTable);
        if (oHeader.Has(nTable) || (oHeader.mbFirstScanIsAll && !aWanted[nTable]))
            continue;
        if (!oTable.empty())
            Append(moComplete, oTable, nTable >= JpegHeader::eDc);
        else if (aWanted[nTable] && oHeader.mbWhole && nTable < JpegHeader::eDc)
            return false;
    }
    if (moComplete.size() == 2)
        return true;
    // Its own start is passed over.
    const std::size_t nSkip = oStream.size() >= 2 && oStream[0] == MARKER && oStream[1] == START_OF_IMAGE ? 2 : 0;
    moComplete.insert(moComplete.end(), oStream.begin() + static_cast<std::ptrdiff_t>(nSkip), oStream.end());
    oStream = moComplete;
    return true;
}

} // namespace krv::plugins::tif

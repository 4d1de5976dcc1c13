#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/raw/headertext.h"
#include "plugins/raw/rawform.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <optional>
#include <string>
#include <string_view>

namespace krv::plugins::raw
{

// The kinds of plain files, by who says how their pixels lie.
enum class RawKind
{
    eEnvi,   // a header that begins with ENVI
    eEsri,   // one with a keyword and a value in each line
    eHeight, // the name of an elevation tile
};

// A data file with its header.
struct RawFiles
{
    RawKind meKind = RawKind::eEnvi;
    std::string moData;
    std::string moHeader;     // empty where there is none
    std::string moHeaderText; // all of it
};

// The files that belong to a name of either, by exact names alone: "x.img" has "x.img.hdr" or "x.hdr"; the extension in
// small or capital letters. No value when the name is of no such file.
std::optional<RawFiles> FindFiles(const std::string& fileName);

// The header that a new data file gets: "x.hdr" for "x.img", unless that is another file's.
std::string ChooseHeaderName(const std::string& dataFile);

// Whether a data file of so many bytes can be what its header tells of: all of it is there, and a little behind it at
// most; or it has lost its end, which opening tells of.
bool IsSizeOf(const RawForm& oForm, std::uint64_t nBytes);

// What is said of the pixels and of where they are.
struct RawImage
{
    RawFiles moFiles;
    RawForm moForm;
    HeaderText moHeader; // of eEnvi
    krv::datasources::AuxiliaryData moTags;
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
};

// Both throw FileFormatException that names the header and what is wrong with it.
RawForm ReadForm(const RawFiles& oFiles);
RawImage ReadImage(RawFiles oFiles);

// Whether a text is a header of keywords and values.
bool IsEsriHeader(std::string_view text);

} // namespace krv::plugins::raw

#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::gdball
{

// The pictures that are read by libvips, and no others.
enum class PictureKind
{
    ePng,
    eJpeg,
    eWebp,
    eGif,
    ePnm,
    eFits,
    eHeif,
    eExr,
    eRadiance
};

// By the first bytes of a file; no value for any other.
std::optional<PictureKind> FindPictureKind(const unsigned char* pHeader, std::size_t nBytes);

// Such as "PNG".
const char* GetPictureName(PictureKind eKind);

// The kinds that are written, by a type or the ending of a file, in capitals: "PNG", "JPG". No value for others.
std::optional<PictureKind> FindPictureType(const std::string& type);
// "PNG, JPEG, ...": the types.
std::string ListPictureTypes();

// The endings of files of all kinds, in small letters.
std::vector<std::string> ListPictureExtensions();

} // namespace krv::plugins::gdball

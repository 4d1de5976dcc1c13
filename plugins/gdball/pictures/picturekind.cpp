#include "plugins/gdball/pictures/picturekind.h"

#include "plugins/gdball/pictures/pnmheader.h"
#include "toolkit/core/lettercase.h"

#include <algorithm>
#include <cstdint>
#include <string_view>

namespace krv::plugins::gdball
{

namespace
{

using namespace std::string_view_literals;

struct Form
{
    PictureKind meKind;
    const char* mpName;
    bool mbWritten;
    std::vector<std::string> moExtensions; // the first one is that of a type
};

const std::vector<Form>& GetForms()
{
    using enum PictureKind;
    static const std::vector<Form> FORMS = {{ePng, "PNG", true, {"png"}},
                                            {eJpeg, "JPEG", true, {"jpg", "jpeg", "jpe"}},
                                            {eWebp, "WebP", true, {"webp"}},
                                            {eGif, "GIF", false, {"gif"}},
                                            {ePnm, "PNM", true, {"pnm", "pbm", "pgm", "ppm", "pfm"}},
                                            {eFits, "FITS", false, {"fits", "fit", "fts"}},
                                            {eHeif, "HEIF", false, {"heic", "heif", "avif"}},
                                            {eExr, "EXR", false, {"exr"}},
                                            {eRadiance, "Radiance", false, {"rad"}}};
    return FORMS;
}

// A box of brands that comes first; one of them says that the file holds pictures.
bool IsHeif(std::string_view header)
{
    constexpr std::string_view BRANDS[] = {"heic", "heix", "hevc", "hevx", "heim", "heis",
                                           "hevm", "hevs", "mif1", "msf1", "avif", "avis"};
    constexpr std::size_t LONGEST_BOX = 256;
    if (header.size() < 16 || header.substr(4, 4) != "ftyp" || header[0] != 0 || header[1] != 0)
        return false;
    const std::size_t nBox =
        static_cast<unsigned char>(header[2]) * std::size_t{256} + static_cast<unsigned char>(header[3]);
    if (nBox < 16 || nBox > LONGEST_BOX)
        return false;
    for (std::size_t nAt = 8; nAt + 4 <= std::min(nBox, header.size()); nAt += nAt == 8 ? 8 : 4)
        if (std::find(std::begin(BRANDS), std::end(BRANDS), header.substr(nAt, 4)) != std::end(BRANDS))
            return true;
    return false;
}

} // namespace

std::optional<PictureKind> FindPictureKind(const unsigned char* pHeader, std::size_t nBytes)
{
    using enum PictureKind;
    const std::string_view header(reinterpret_cast<const char*>(pHeader), nBytes);
    if (header.starts_with("\x89PNG\r\n\x1a\n"sv))
        return ePng;
    if (header.starts_with("\xff\xd8\xff"sv))
        return eJpeg;
    if (header.starts_with("RIFF"sv) && header.size() >= 12 && header.substr(8, 4) == "WEBP"sv)
        return eWebp;
    if (header.starts_with("GIF87a"sv) || header.starts_with("GIF89a"sv))
        return eGif;
    if (header.starts_with("SIMPLE  ="sv))
        return eFits;
    if (header.starts_with("\x76\x2f\x31\x01"sv))
        return eExr;
    if (header.starts_with("#?RADIANCE"sv) || header.starts_with("#?RGBE"sv))
        return eRadiance;
    if (IsHeif(header))
        return eHeif;
    return ParsePnmHeader(pHeader, nBytes) ? std::optional(ePnm) : std::nullopt;
}

const char* GetPictureName(PictureKind eKind)
{
    for (const Form& oForm : GetForms())
        if (oForm.meKind == eKind)
            return oForm.mpName;
    return "";
}

std::optional<PictureKind> FindPictureType(const std::string& type)
{
    for (const Form& oForm : GetForms())
    {
        const auto IsType = [&type](const std::string& extension)
        {
            return krv::ToUpper(extension) == type;
        };
        if (oForm.mbWritten && (krv::ToUpper(oForm.mpName) == type ||
                                std::any_of(oForm.moExtensions.begin(), oForm.moExtensions.end(), IsType)))
            return oForm.meKind;
    }
    return std::nullopt;
}

std::string ListPictureTypes()
{
    std::string all;
    for (const Form& oForm : GetForms())
        if (oForm.mbWritten)
            all += (all.empty() ? "" : ", ") + krv::ToUpper(oForm.mpName);
    return all;
}

std::vector<std::string> ListPictureExtensions()
{
    std::vector<std::string> oAll;
    for (const Form& oForm : GetForms())
        oAll.insert(oAll.end(), oForm.moExtensions.begin(), oForm.moExtensions.end());
    return oAll;
}

} // namespace krv::plugins::gdball

#include "plugins/jp2/geo/geoboxes.h"

#include "plugins/jp2/geo/geotiffbox.h"
#include "plugins/jp2/geo/gmlbox.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>

namespace krv::plugins::jp2
{

namespace
{

constexpr std::uint64_t LARGEST_BOX = std::uint64_t{16} << 20;
constexpr int DEEPEST = 8;

// The texts in XML below boxes that associate others.
void CollectXml(const support::File& oFile, const std::vector<Box>& oBoxes, int nDepth, std::vector<Box>& oTexts)
{
    for (const Box& oBox : oBoxes)
        if (oBox.mnType == BoxType("xml ") && nDepth > 0)
            oTexts.push_back(oBox);
        else if (oBox.mnType == BoxType("asoc") && nDepth < DEEPEST)
            CollectXml(oFile, ListBoxes(oFile, oBox.mnOffset, oBox.mnOffset + oBox.mnBytes), nDepth + 1, oTexts);
}

} // namespace

std::optional<std::vector<unsigned char>> FindUuid(const support::File& oFile, const std::vector<Box>& oBoxes,
                                                   const Uuid& oUuid)
{
    for (const Box& oBox : oBoxes)
    {
        if (oBox.mnType != BoxType("uuid") || oBox.mnBytes < oUuid.size() || oBox.mnBytes > LARGEST_BOX ||
            !oBox.mbWhole)
            continue;
        Uuid oFound{};
        oFile.Read(oBox.mnOffset, oFound.data(), oFound.size());
        if (oFound != oUuid)
            continue;
        std::vector<unsigned char> oBytes = ReadBox(oFile, oBox, LARGEST_BOX);
        oBytes.erase(oBytes.begin(), oBytes.begin() + static_cast<std::ptrdiff_t>(oUuid.size()));
        return oBytes;
    }
    return std::nullopt;
}

GeoPlace ReadGeoPlace(const support::File& oFile, const std::vector<Box>& oBoxes, std::vector<std::string>& oTroubles)
{
    GeoPlace oPlace;
    if (const auto oBytes = FindUuid(oFile, oBoxes, GEOTIFF_UUID))
    {
        const support::GeoTags oTags = ParseGeoTiff(*oBytes);
        support::ReadGeocoding(oTags, oPlace.moGeocoding);
        try
        {
            std::string trouble;
            oPlace.mpoCRS = support::ReadCRS(oTags, oFile.GetName(), &trouble);
            if (!trouble.empty())
                oTroubles.push_back(trouble);
        }
        catch (const krv::DataException& oException)
        {
            oTroubles.push_back(oException.GetMessage());
        }
    }
    if (oPlace.mpoCRS && !oPlace.moGeocoding.IsIdentity())
        return oPlace;
    std::vector<Box> oTexts;
    CollectXml(oFile, oBoxes, 0, oTexts);
    for (const Box& oText : oTexts)
        try
        {
            const std::vector<unsigned char> oBytes = ReadBox(oFile, oText, LARGEST_BOX);
            const GmlGrid oGrid = ParseGml(std::string(oBytes.begin(), oBytes.end()), "the text in GML");
            if (oPlace.moGeocoding.IsIdentity() && oGrid.moGeocoding)
                oPlace.moGeocoding = *oGrid.moGeocoding;
            if (!oPlace.mpoCRS && oGrid.mnEPSG != 0)
                oPlace.mpoCRS = krv::ogc::cs::CreateCRSFromEPSG(oGrid.mnEPSG);
        }
        catch (const krv::Exception& oException)
        {
            oTroubles.push_back(oException.GetMessage());
        }
    return oPlace;
}

} // namespace krv::plugins::jp2

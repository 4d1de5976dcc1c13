#include "plugins/tif/geo/geowriter.h"

#include <algorithm>
#include <bit>
#include <cstdint>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

std::vector<double> GetDoubles(const TagList& oTags, std::uint16_t nTag)
{
    std::vector<double> oDoubles;
    const Tag* pTag = oTags.Find(nTag);
    for (std::size_t nAt = 0; pTag != nullptr && pTag->mnType == TIFF_DOUBLE && nAt + 8 <= pTag->moBytes.size();
         nAt += 8)
        oDoubles.push_back(std::bit_cast<double>(ReadNumber(pTag->moBytes.data() + nAt, 8, oTags.IsBigEndian())));
    return oDoubles;
}

void SetDoubles(TagList& oTags, std::uint16_t nTag, const std::vector<double>& oValues)
{
    if (oValues.empty())
        oTags.Remove(nTag);
    else
        oTags.SetDoubles(nTag, oValues);
}

} // namespace

support::GeoTags GeoWriter::GetTags() const
{
    const TagList& oTags = mpoPage->moTags;
    const std::vector<std::uint64_t> oNumbers = oTags.GetNumbers(support::TAG_GEO_KEYS);
    std::vector<std::uint16_t> oKeys(oNumbers.size());
    std::transform(oNumbers.begin(), oNumbers.end(), oKeys.begin(),
                   [](std::uint64_t nNumber) { return static_cast<std::uint16_t>(nNumber); });
    return {GetDoubles(oTags, support::TAG_GEO_SCALE),   GetDoubles(oTags, support::TAG_GEO_TIE_POINTS),
            GetDoubles(oTags, support::TAG_GEO_MATRIX),  oKeys,
            GetDoubles(oTags, support::TAG_GEO_DOUBLES), oTags.GetText(support::TAG_GEO_TEXTS)};
}

void GeoWriter::StorePlace(const support::GeoTags& oTags)
{
    SetDoubles(mpoPage->moTags, support::TAG_GEO_SCALE, oTags.moScale);
    SetDoubles(mpoPage->moTags, support::TAG_GEO_TIE_POINTS, oTags.moTiePoints);
    SetDoubles(mpoPage->moTags, support::TAG_GEO_MATRIX, oTags.moMatrix);
}

void GeoWriter::StoreKeys(const support::GeoTags& oTags)
{
    TagList& oStored = mpoPage->moTags;
    if (oTags.moKeys.empty())
        oStored.Remove(support::TAG_GEO_KEYS);
    else
        oStored.SetNumbers(support::TAG_GEO_KEYS, TIFF_SHORT,
                           std::vector<std::uint64_t>(oTags.moKeys.begin(), oTags.moKeys.end()));
    SetDoubles(oStored, support::TAG_GEO_DOUBLES, oTags.moDoubles);
    oStored.SetText(support::TAG_GEO_TEXTS, oTags.moTexts);
}

void GeoWriter::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    support::GeoTags oTags = GetTags();
    support::SetGeocoding(oTags, oInfo);
    StorePlace(oTags);
}

void GeoWriter::SetRasterType(bool bPoint)
{
    support::GeoTags oTags = GetTags();
    support::SetRasterType(oTags, bPoint);
    StoreKeys(oTags);
    StorePlace(oTags);
}

void GeoWriter::RemoveRasterType()
{
    support::GeoTags oTags = GetTags();
    support::RemoveRasterType(oTags);
    StoreKeys(oTags);
    StorePlace(oTags);
}

void GeoWriter::SetTiePoints(const std::vector<TiePoint>& oPoints)
{
    support::GeoTags oTags = GetTags();
    support::SetTiePoints(oTags, oPoints);
    StorePlace(oTags);
}

void GeoWriter::SetCRS(const krv::ogc::cs::ICRS& oCRS, const Place& oPlace)
{
    support::GeoTags oTags = GetTags();
    support::SetCRS(oTags, oCRS, moEditor.GetFileName(), oPlace);
    StoreKeys(oTags);
}

void GeoWriter::RemoveCRS()
{
    support::GeoTags oTags = GetTags();
    support::RemoveCRS(oTags);
    StoreKeys(oTags);
}

} // namespace krv::plugins::tif

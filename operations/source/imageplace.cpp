#include "operations/source/imageplace.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/utils/loadmathmodel.h"
#include "operations/source/sourcefile.h"
#include "toolkit/mathmodel/imathmodel.h"
#include "toolkit/ogc/cs/controlpoints.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace krv::operations
{

using krv::ogc::cs::ControlPoint;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;
using krv::ogc::cs::PolynomialFit;

namespace
{

constexpr int GEOGRAPHIC = 4326;
constexpr unsigned int STEPS = 20; // of an edge

// Brought near another longitude by whole turns.
double BringNear(double nLongitude, double nOther)
{
    return nLongitude - 360.0 * std::round((nLongitude - nOther) / 360.0);
}

} // namespace

// One of the three.
struct ImagePlace::Means
{
    GeocodingInfo geocoding;
    std::unique_ptr<const krv::mathmodel::IMathModel> model;
    double height = 0;
    std::optional<PolynomialFit> toMap;
    std::optional<PolynomialFit> toRaster;
};

std::optional<ImagePlace> ImagePlace::Find(const SourceFile& oFile, double nHeight, bool bMap)
{
    ImagePlace oPlace;
    oPlace.mnWidth = oFile.GetRaster().GetWidth();
    oPlace.mnHeight = oFile.GetRaster().GetHeight();
    oPlace.mpoCrs.reset(oFile.GetDataset().ReadCRS());
    auto poMeans = std::make_shared<Means>();
    const auto* const poGeocoded = dynamic_cast<const krv::datasources::IGeocodedDataset*>(&oFile.GetDataset());
    const bool bIdentity = poGeocoded == nullptr || poGeocoded->GetGeocoding().IsIdentity();
    auto* const poModels = dynamic_cast<krv::datasources::IMathModelDataset*>(&oFile.GetDataset());
    const auto oPoints =
        krv::ogc::cs::ParseControlPoints(oFile.GetMetadata().GetFileMetadataValue("GroundControlPoints"));
    const unsigned int nDegree = PolynomialFit::GetUsualDegree(oPoints.size());
    if (!bIdentity && poGeocoded->GetGeocoding().IsInvertible())
        poMeans->geocoding = poGeocoded->GetGeocoding();
    else if (!bMap && poModels != nullptr && poModels->HasMathModel())
    {
        poMeans->model.reset(krv::core::LoadMathModel(&oFile.GetDataset(), 0));
        if (poMeans->model == nullptr)
            return std::nullopt;
        poMeans->height = nHeight;
        oPlace.meKind = PlacedBy::eModel;
        oPlace.mpoCrs = krv::ogc::cs::CreateCRSFromEPSG(GEOGRAPHIC);
    }
    else if (nDegree != 0)
    {
        poMeans->toMap.emplace(oPoints, nDegree, PolynomialFit::eRasterToMap);
        poMeans->toRaster.emplace(oPoints, nDegree, PolynomialFit::eMapToRaster);
        oPlace.meKind = PlacedBy::ePoints;
    }
    else if (poGeocoded == nullptr || !oFile.IsIdentityPlace(oPlace.mpoCrs != nullptr))
        return std::nullopt;
    oPlace.mpoMeans = std::move(poMeans);
    return oPlace;
}

bool ImagePlace::ToMap(double nColumn, double nRow, double& nX, double& nY) const
{
    if (mpoMeans->model != nullptr)
        return mpoMeans->model->ImageToGround(nColumn, nRow, mpoMeans->height, nX, nY);
    if (mpoMeans->toMap)
        mpoMeans->toMap->Map(nColumn, nRow, nX, nY);
    else
        mpoMeans->geocoding.RasterToMap(nColumn, nRow, nX, nY);
    return true;
}

bool ImagePlace::ToRaster(double nX, double nY, double& nColumn, double& nRow) const
{
    if (mpoMeans->model != nullptr)
        return mpoMeans->model->GroundToImage(nX, nY, mpoMeans->height, nColumn, nRow);
    if (!mpoMeans->toRaster)
        return mpoMeans->geocoding.MapToRaster(nX, nY, nColumn, nRow);
    mpoMeans->toRaster->Map(nX, nY, nColumn, nRow);
    return true;
}

std::optional<GeographicBounds> ImagePlace::FindGeographicBounds() const
{
    const auto oToDegrees = mpoCrs != nullptr ? krv::ogc::cs::FindWayToDegrees(*mpoCrs) : std::nullopt;
    if (!oToDegrees)
        return std::nullopt;
    const auto ToDegrees = [&](double nColumn, double nRow, double& nX, double& nY)
    {
        return ToMap(nColumn, nRow, nX, nY) && oToDegrees->Transform(nX, nY) && std::fabs(nY) <= 90;
    };
    double nCentre = 0, nUnused = 0;
    if (!ToDegrees(mnWidth / 2, mnHeight / 2, nCentre, nUnused))
        return std::nullopt;
    GeographicBounds oBounds{nCentre, 90, nCentre, -90};
    const auto Add = [&](double nColumn, double nRow)
    {
        double nX = 0, nY = 0;
        if (!ToDegrees(nColumn, nRow, nX, nY))
            return false;
        nX = BringNear(nX, nCentre);
        oBounds = {std::min(oBounds.west, nX), std::min(oBounds.south, nY), std::max(oBounds.east, nX),
                   std::max(oBounds.north, nY)};
        return true;
    };
    for (unsigned int i = 0; i <= STEPS; ++i)
    {
        const double nColumn = mnWidth * i / STEPS, nRow = mnHeight * i / STEPS;
        if (!Add(nColumn, 0) || !Add(nColumn, mnHeight) || !Add(0, nRow) || !Add(mnWidth, nRow))
            return std::nullopt;
    }
    // A pole inside the image lies on none of its edges, and has all longitudes.
    for (const double nPole : {90.0, -90.0})
    {
        double nX = 0, nY = nPole, nColumn = 0, nRow = 0;
        const bool bInside = oToDegrees->TransformBack(nX, nY) && ToRaster(nX, nY, nColumn, nRow) && nColumn > 0 &&
                             nRow > 0 && nColumn < mnWidth && nRow < mnHeight;
        if (bInside)
            oBounds = {-180, std::min(oBounds.south, nPole), 180, std::max(oBounds.north, nPole)};
    }
    if (oBounds.east - oBounds.west >= 360)
        return GeographicBounds{-180, oBounds.south, 180, oBounds.north};
    oBounds.west = BringNear(oBounds.west, 0);
    oBounds.east = BringNear(oBounds.east, 0);
    return oBounds;
}

} // namespace krv::operations

#include "toolkit/ogc/cs/coordinatetransformation.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/detail/projcrs.h"

#include <cmath>
#include <limits>

namespace krv::ogc::cs
{

struct CoordinateTransformation::Parts
{
    detail::ProjContext moContext;
    detail::ProjObject mpoOperation;

    std::size_t Run(PJ_DIRECTION eDirection, std::size_t nCount, double* poX, double* poY, double* poZ) const;
};

std::size_t CoordinateTransformation::Parts::Run(PJ_DIRECTION eDirection, std::size_t nCount, double* poX, double* poY,
                                                 double* poZ) const
{
    constexpr std::size_t STRIDE = sizeof(double);
    constexpr double INFINITE = std::numeric_limits<double>::infinity();
    detail::Proj().proj_trans_generic(mpoOperation.get(), eDirection, poX, STRIDE, nCount, poY, STRIDE, nCount, poZ,
                                      STRIDE, poZ == nullptr ? 0 : nCount, nullptr, 0, 0);
    std::size_t nGood = 0;
    for (std::size_t nAt = 0; nAt < nCount; ++nAt)
    {
        if (std::isfinite(poX[nAt]) && std::isfinite(poY[nAt]) && (poZ == nullptr || std::isfinite(poZ[nAt])))
            ++nGood;
        else
        {
            poX[nAt] = poY[nAt] = INFINITE;
            if (poZ != nullptr)
                poZ[nAt] = INFINITE;
        }
    }
    return nGood;
}

CoordinateTransformation::CoordinateTransformation(const ICRS& oSource, const ICRS& oTarget, const Place& oPlace)
    : mpoParts(std::make_unique<Parts>())
{
    const detail::ProjContext& oContext = mpoParts->moContext;
    const detail::ProjObject poSource = detail::MakeObject(oContext, oSource, oPlace);
    const detail::ProjObject poTarget = detail::MakeObject(oContext, oTarget, oPlace);
    const detail::ProjObject poRaw(detail::Proj().proj_create_crs_to_crs_from_pj(oContext.Get(), poSource.get(),
                                                                                 poTarget.get(), nullptr, nullptr));
    if (poRaw)
        mpoParts->mpoOperation.reset(detail::Proj().proj_normalize_for_visualization(oContext.Get(), poRaw.get()));
    if (!mpoParts->mpoOperation)
        oContext.Fail("No transformation from \"" + oSource.GetName() + "\" to \"" + oTarget.GetName() + "\"", oPlace);
}

CoordinateTransformation::CoordinateTransformation(CoordinateTransformation&& oOther) noexcept = default;
CoordinateTransformation& CoordinateTransformation::operator=(CoordinateTransformation&& oOther) noexcept = default;
CoordinateTransformation::~CoordinateTransformation() = default;

std::size_t CoordinateTransformation::Transform(std::size_t nCount, double* poX, double* poY, double* poZ) const
{
    return mpoParts->Run(PJ_FWD, nCount, poX, poY, poZ);
}

std::size_t CoordinateTransformation::TransformBack(std::size_t nCount, double* poX, double* poY, double* poZ) const
{
    return mpoParts->Run(PJ_INV, nCount, poX, poY, poZ);
}

bool CoordinateTransformation::Transform(double& nX, double& nY) const
{
    return Transform(1, &nX, &nY) == 1;
}

bool CoordinateTransformation::TransformBack(double& nX, double& nY) const
{
    return TransformBack(1, &nX, &nY) == 1;
}

std::optional<CoordinateTransformation> FindWayToDegrees(const ICRS& oCRS)
{
    constexpr int EPSG_WGS84 = 4326;
    double nX = 0.0;
    double nY = 0.0;
    for (const ProjectionParameter& oParameter : oCRS.GetProjectionParameters())
        if (oParameter.name.ends_with("asting"))
            nX = oParameter.value;
        else if (oParameter.name.ends_with("orthing"))
            nY = oParameter.value;
    try
    {
        CoordinateTransformation oWay(oCRS, *CreateCRSFromEPSG(EPSG_WGS84));
        if (oWay.Transform(nX, nY) && std::abs(nX) <= 360.0 && std::abs(nY) <= 90.0)
            return oWay;
    }
    catch (const krv::DataException&)
    {
        // None, as for positions that come out nowhere.
    }
    return std::nullopt;
}

} // namespace krv::ogc::cs

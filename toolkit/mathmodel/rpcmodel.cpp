#include "toolkit/mathmodel/rpcmodel.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/detail/rpckernels.h"

#include <algorithm>
#include <cmath>

namespace krv::mathmodel
{

namespace
{

void CheckRatio(const char* pName, double nRatio, const Place& oPlace)
{
    if (!(nRatio > 0) || !std::isfinite(nRatio))
        throw ParameterException("A ratio of sizes is positive and finite: " + NumberText(nRatio),
                                 ParameterException::eInvalidValue, pName, oPlace);
}

std::size_t Run(detail::RpcKernel pKernel, const RpcCoefficients& oModel, std::size_t nCount, const double* pFirst,
                const double* pSecond, const double* pHeights, double* pFirstResult, double* pSecondResult,
                const Place& oPlace)
{
    std::size_t nReached = 0;
    for (std::size_t nAt = 0; nAt < nCount; nAt += detail::RPC_BLOCK)
    {
        const std::size_t nPoints = std::min(detail::RPC_BLOCK, nCount - nAt);
        if (pKernel(oModel, nPoints, pFirst + nAt, pSecond + nAt, pHeights + nAt, pFirstResult + nAt,
                    pSecondResult + nAt))
            throw DataException("A denominator of the rational polynomial model is zero", oPlace);
        for (std::size_t i = nAt; i < nAt + nPoints; ++i)
            nReached += std::isnan(pFirstResult[i]) ? 0 : 1;
    }
    return nReached;
}

} // namespace

RpcModel::RpcModel(const RpcCoefficients& oCoefficients) : moCoefficients(oCoefficients)
{
    const std::string fault = oCoefficients.FindFault();
    if (!fault.empty())
        throw DataException("The coefficients are no rational polynomial model: " + fault);
}

RpcModel::~RpcModel() = default;

RpcModel* RpcModel::Clone() const
{
    return new RpcModel(moCoefficients);
}

std::string RpcModel::GetName() const
{
    return "RPC";
}

RpcModel* RpcModel::CreateScaled(double nColumnRatio, double nRowRatio) const
{
    const Place oPlace = Place::Current();
    CheckRatio("nColumnRatio", nColumnRatio, oPlace);
    CheckRatio("nRowRatio", nRowRatio, oPlace);
    return new RpcModel(moCoefficients.Scaled(nColumnRatio, nRowRatio));
}

double RpcModel::GetAccuracy() const
{
    const double nBias = moCoefficients.biasError;
    const double nRandom = moCoefficients.randomError;
    const bool bStated = nBias >= 0 && nRandom >= 0 && (nBias > 0 || nRandom > 0);
    return bStated ? std::hypot(nBias, nRandom) : -1;
}

bool RpcModel::ImageToGround(double nColumn, double nRow, double nHeight, double& nLongitude, double& nLatitude) const
{
    double nEast = 0, nNorth = 0;
    if (ImageToGround(1, &nColumn, &nRow, &nHeight, &nEast, &nNorth) == 0)
        return false;
    nLongitude = nEast;
    nLatitude = nNorth;
    return true;
}

bool RpcModel::GroundToImage(double nLongitude, double nLatitude, double nHeight, double& nColumn, double& nRow) const
{
    double nAcross = 0, nDown = 0;
    if (GroundToImage(1, &nLongitude, &nLatitude, &nHeight, &nAcross, &nDown) == 0)
        return false;
    nColumn = nAcross;
    nRow = nDown;
    return true;
}

std::size_t RpcModel::ImageToGround(std::size_t nCount, const double* pColumns, const double* pRows,
                                    const double* pHeights, double* pLongitudes, double* pLatitudes) const
{
    return Run(detail::GetRpcKernels().mpToGround, moCoefficients, nCount, pColumns, pRows, pHeights, pLongitudes,
               pLatitudes, Place::Current());
}

std::size_t RpcModel::GroundToImage(std::size_t nCount, const double* pLongitudes, const double* pLatitudes,
                                    const double* pHeights, double* pColumns, double* pRows) const
{
    return Run(detail::GetRpcKernels().mpToImage, moCoefficients, nCount, pLongitudes, pLatitudes, pHeights, pColumns,
               pRows, Place::Current());
}

} // namespace krv::mathmodel

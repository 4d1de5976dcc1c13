#pragma once

#include "toolkit/mathmodel/imathmodel.h"
#include "toolkit/mathmodel/rpccoefficients.h"

#include <cstddef>

namespace krv::mathmodel
{

// The rational polynomial model. It reaches the ground whose normalised latitude and longitude are at most FITTED_RANGE
// in magnitude, as far as no denominator changes its sign: polynomials mean nothing far from the ground that they were
// fitted to. Longitudes are taken to within half a turn of the model's own, and handed out so. Positions that are no
// finite numbers are not reached. What is computed in one call for many points is what single calls give, bit for bit.
class KRV_TOOLKIT_API RpcModel final : public IMathModel
{
public:
    // Scales span the ground that the provider fitted: 1 is its border, and a half of it beyond is still served.
    static constexpr double FITTED_RANGE = 1.5;

    // Throws DataException for numbers that are no model.
    // The coefficients are copied.
    explicit RpcModel(const RpcCoefficients& oCoefficients);
    ~RpcModel() override;

    // By Newton's method from the model's centre, to 1e-9 pixel; whatever is not within 1e-6 pixel after 20 steps is
    // not reached. Both directions throw DataException where a denominator is zero.
    bool ImageToGround(double nColumn, double nRow, double nHeight, double& nLongitude,
                       double& nLatitude) const override;
    bool GroundToImage(double nLongitude, double nLatitude, double nHeight, double& nColumn,
                       double& nRow) const override;
    RpcModel* Clone() const override;
    // "RPC".
    std::string GetName() const override;
    RpcModel* CreateScaled(double nColumnRatio, double nRowRatio) const override;
    // Both errors together; unknown unless both are stated and one is not zero.
    double GetAccuracy() const override;

    // Many points at once; each array holds nCount numbers, results may replace arguments. A point that is not reached
    // gets NaN for both of its results. Returns how many are reached. Throws as for one point, with undefined results.
    // Quicker than single calls.
    std::size_t ImageToGround(std::size_t nCount, const double* pColumns, const double* pRows, const double* pHeights,
                              double* pLongitudes, double* pLatitudes) const;
    std::size_t GroundToImage(std::size_t nCount, const double* pLongitudes, const double* pLatitudes,
                              const double* pHeights, double* pColumns, double* pRows) const;

    // As the constructor got them.
    const RpcCoefficients& GetCoefficients() const { return moCoefficients; }

private:
    RpcCoefficients moCoefficients;
};

} // namespace krv::mathmodel

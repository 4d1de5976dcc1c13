#include "gobs/power/powersum.h"

#include "gobs/power/detail/powerkernels.h"
#include "gobs/raster/pixelvalue.h"

#include <algorithm>
#include <type_traits>
#include <utility>

namespace krv::gobs
{

struct PowerSum::State
{
    DataType moResult;
    detail::PowerLoop mpLoop = nullptr;
    std::vector<double> moSquares; // of each sample
    std::vector<double> moValues;
    detail::PowerForm meForm = detail::PowerForm::eWeighted;
};

PowerSum::PowerSum(const DataType& oType, const std::vector<PowerTerm>& oTerms)
{
    auto poState = std::make_unique<State>();
    poState->moResult = ResultTypeOf(oType);
    poState->mpLoop =
        VisitPartType(oType, []<class T>(std::type_identity<T>) { return detail::FindPowerLoop(PIXEL_TYPE_OF<T>); });
    for (const PowerTerm& oTerm : oTerms)
    {
        for (unsigned int nPart = 0; nPart < oType.GetParts(); ++nPart)
        {
            const bool bValue = oTerm.meKind == PowerTerm::eValue && nPart == 0;
            poState->moSquares.push_back(oTerm.meKind == PowerTerm::eSquare ? oTerm.mnWeight : 0);
            poState->moValues.push_back(bValue ? oTerm.mnWeight : 0);
        }
    }
    const auto AreAll = [](const std::vector<double>& oWeights, double nWeight)
    {
        return std::all_of(oWeights.begin(), oWeights.end(), [=](double n) { return n == nWeight; });
    };
    if (AreAll(poState->moSquares, 1) && AreAll(poState->moValues, 0))
        poState->meForm = detail::PowerForm::eSquares;
    else if (AreAll(poState->moSquares, 0) && AreAll(poState->moValues, 1))
        poState->meForm = detail::PowerForm::eValues;
    mpoState = std::move(poState);
}

PowerSum::~PowerSum() = default;

const DataType& PowerSum::GetResultType() const
{
    return mpoState->moResult;
}

void PowerSum::Run(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pPower) const
{
    mpoState->mpLoop({pPixels, nPixels, mpoState->moSquares.size(), mpoState->moSquares.data(),
                      mpoState->moValues.data(), mpoState->meForm, pPower});
}

DataType PowerSum::ResultTypeOf(const DataType& oType)
{
    const auto IsWide = []<class T>(std::type_identity<T>)
    {
        return sizeof(T) == 8 || (sizeof(T) == 4 && std::is_integral_v<T>);
    };
    return VisitPartType(oType, IsWide) ? eDT_64R : eDT_32R;
}

} // namespace krv::gobs

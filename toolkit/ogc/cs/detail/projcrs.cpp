#include "toolkit/ogc/cs/detail/projcrs.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <optional>
#include <string_view>
#include <utility>

namespace krv::ogc::cs::detail
{
namespace
{

std::string Text(const char* poText)
{
    return poText == nullptr ? std::string() : std::string(poText);
}

bool IsGeographicType(PJ_TYPE eType)
{
    return eType == PJ_TYPE_GEOGRAPHIC_2D_CRS || eType == PJ_TYPE_GEOGRAPHIC_3D_CRS;
}

int FindEPSGCode(const PJ* poObject)
{
    for (int nAt = 0; Proj().proj_get_id_auth_name(poObject, nAt) != nullptr; ++nAt)
    {
        const std::optional<int> oCode = ParseNumber<int>(Text(Proj().proj_get_id_code(poObject, nAt)));
        if (oCode && std::string_view(Proj().proj_get_id_auth_name(poObject, nAt)) == "EPSG")
            return *oCode;
    }
    return 0;
}

// The number without what conversion between units left in its last digits.
double WithoutNoise(double nValue)
{
    constexpr int DIGITS = 15;
    char aText[32];
    const char* const pEnd = std::to_chars(aText, aText + sizeof aText, nValue, std::chars_format::general, DIGITS).ptr;
    return ParseNumber<double>(std::string_view(aText, pEnd)).value_or(nValue);
}

} // namespace

ProjCRS::ProjCRS(std::unique_ptr<ProjContext> poContext, ProjObject poObject)
    : mpoContext(std::move(poContext)), mpoObject(std::move(poObject))
{
}

ProjCRS::~ProjCRS() = default;

ICRS* ProjCRS::Clone() const
{
    auto poContext = std::make_unique<ProjContext>();
    ProjObject poObject = MakeObject(*poContext, *this, Place::Current());
    return std::make_unique<ProjCRS>(std::move(poContext), std::move(poObject)).release();
}

std::string ProjCRS::GetName() const
{
    const std::string name = Text(Proj().proj_get_name(mpoObject.get()));
    return name.empty() ? "unknown" : name;
}

int ProjCRS::GetEPSG() const
{
    const int nCode = FindEPSGCode(mpoObject.get());
    return nCode != 0 ? nCode : FindEPSGCode(Horizontal().get());
}

std::string ProjCRS::GetWKT() const
{
    return Export(PJ_WKT2_2019, "WKT2");
}

std::string ProjCRS::GetWKT1() const
{
    return Export(PJ_WKT1_GDAL, "WKT1");
}

std::string ProjCRS::GetPROJJSON() const
{
    const char* const OPTIONS[] = {"MULTILINE=NO", nullptr};
    const char* poText = Proj().proj_as_projjson(mpoContext->Get(), mpoObject.get(), OPTIONS);
    if (poText == nullptr)
        mpoContext->Fail("\"" + GetName() + "\" cannot be written as PROJJSON", Place::Current());
    return poText;
}

bool ProjCRS::IsEquivalent(const ICRS& oOther) const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    const ProjObject poOther = MakeObject(*mpoContext, oOther, Place::Current());
    const ProjObject poLeft(Proj().proj_normalize_for_visualization(poContext, mpoObject.get()));
    const ProjObject poRight(Proj().proj_normalize_for_visualization(poContext, poOther.get()));
    return Proj().proj_is_equivalent_to_with_ctx(poContext, poLeft ? poLeft.get() : mpoObject.get(),
                                                 poRight ? poRight.get() : poOther.get(),
                                                 PJ_COMP_EQUIVALENT_EXCEPT_AXIS_ORDER_GEOGCRS) != 0;
}

bool ProjCRS::IsGeographic() const
{
    return IsGeographicType(Proj().proj_get_type(Horizontal().get()));
}

bool ProjCRS::IsProjected() const
{
    return Proj().proj_get_type(Horizontal().get()) == PJ_TYPE_PROJECTED_CRS;
}

bool ProjCRS::HasVertical() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    const ProjObject poObject = Unbound();
    const PJ_TYPE eType = Proj().proj_get_type(poObject.get());
    if (eType == PJ_TYPE_COMPOUND_CRS || eType == PJ_TYPE_VERTICAL_CRS)
        return true;
    const ProjObject poSystem(Proj().proj_crs_get_coordinate_system(poContext, poObject.get()));
    return poSystem && Proj().proj_cs_get_axis_count(poContext, poSystem.get()) == 3;
}

std::string ProjCRS::GetUnitName() const
{
    return HorizontalUnit().name;
}

double ProjCRS::GetUnitFactor() const
{
    return HorizontalUnit().factor;
}

std::string ProjCRS::GetDatumName() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    const ProjObject poHorizontal = Horizontal();
    const ProjObject poGeodetic(Proj().proj_crs_get_geodetic_crs(poContext, poHorizontal.get()));
    const PJ* poOwner = poGeodetic ? poGeodetic.get() : poHorizontal.get();
    ProjObject poDatum(Proj().proj_crs_get_datum(poContext, poOwner));
    if (!poDatum)
        poDatum.reset(Proj().proj_crs_get_datum_ensemble(poContext, poOwner));
    return poDatum ? Text(Proj().proj_get_name(poDatum.get())) : std::string();
}

std::string ProjCRS::GetEllipsoidName() const
{
    return FindEllipsoid().name;
}

double ProjCRS::GetSemiMajorAxis() const
{
    return FindEllipsoid().semiMajor;
}

double ProjCRS::GetInverseFlattening() const
{
    return FindEllipsoid().inverseFlattening;
}

std::string ProjCRS::GetProjectionMethod() const
{
    const char* poName = nullptr;
    const ProjObject poConversion = Conversion();
    if (poConversion)
        Proj().proj_coordoperation_get_method_info(mpoContext->Get(), poConversion.get(), &poName, nullptr, nullptr);
    return Text(poName);
}

std::vector<ProjectionParameter> ProjCRS::GetProjectionParameters() const
{
    std::vector<ProjectionParameter> oParameters;
    const ProjObject poConversion = Conversion();
    const int nCount =
        poConversion ? Proj().proj_coordoperation_get_param_count(mpoContext->Get(), poConversion.get()) : 0;
    for (int nAt = 0; nAt < nCount; ++nAt)
    {
        const char* poName = nullptr;
        const char* poUnit = nullptr;
        ProjectionParameter oParameter;
        if (Proj().proj_coordoperation_get_param(mpoContext->Get(), poConversion.get(), nAt, &poName, nullptr, nullptr,
                                                 &oParameter.value, nullptr, &oParameter.unitFactor, &poUnit, nullptr,
                                                 nullptr, nullptr) == 0)
            continue;
        oParameter.name = Text(poName);
        oParameter.unitName = Text(poUnit);
        oParameters.push_back(std::move(oParameter));
    }
    return oParameters;
}

ProjObject ProjCRS::Share(const PJ* poObject) const
{
    return ProjObject(Proj().proj_clone(mpoContext->Get(), poObject));
}

int ProjCRS::GetVerticalEPSG() const
{
    ProjObject poObject = Unbound();
    if (Proj().proj_get_type(poObject.get()) == PJ_TYPE_COMPOUND_CRS && FindEPSGCode(poObject.get()) == 0)
        poObject.reset(Proj().proj_crs_get_sub_crs(mpoContext->Get(), poObject.get(), 1));
    return Proj().proj_get_type(poObject.get()) == PJ_TYPE_VERTICAL_CRS ? FindEPSGCode(poObject.get()) : 0;
}

GeodeticParts ProjCRS::GetBase() const
{
    GeodeticParts oParts;
    const ProjObject poBase(Proj().proj_crs_get_geodetic_crs(mpoContext->Get(), Horizontal().get()));
    if (!poBase)
        return oParts;
    const ProjObject poDatum(Proj().proj_crs_get_datum(mpoContext->Get(), poBase.get()));
    oParts.code = FindEPSGCode(poBase.get());
    oParts.name = Text(Proj().proj_get_name(poBase.get()));
    oParts.datum.code = poDatum ? FindEPSGCode(poDatum.get()) : 0;
    oParts.shift = Shift();
    return oParts;
}

ProjObject ProjCRS::Unbound() const
{
    ProjObject poObject = Share(mpoObject.get());
    while (poObject && Proj().proj_get_type(poObject.get()) == PJ_TYPE_BOUND_CRS)
        poObject.reset(Proj().proj_get_source_crs(mpoContext->Get(), poObject.get()));
    return poObject;
}

// That of a bound system to WGS 84; three numbers where the method has no more.
std::vector<double> ProjCRS::Shift() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    const bool bBound = Proj().proj_get_type(mpoObject.get()) == PJ_TYPE_BOUND_CRS;
    const ProjObject poShift(bBound ? Proj().proj_crs_get_coordoperation(poContext, mpoObject.get()) : nullptr);
    std::vector<double> oShift(7);
    if (!poShift || Proj().proj_coordoperation_get_towgs84_values(poContext, poShift.get(), oShift.data(), 7, 0) == 0)
        return {};
    const char* pMethod = nullptr;
    Proj().proj_coordoperation_get_method_info(poContext, poShift.get(), &pMethod, nullptr, nullptr);
    if (Text(pMethod).starts_with("Geocentric translations"))
        oShift.resize(3);
    for (double& nValue : oShift)
        nValue = WithoutNoise(nValue);
    return oShift;
}

// The part that places pixels: below bound and compound systems.
ProjObject ProjCRS::Horizontal() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    ProjObject poObject = Share(mpoObject.get());
    for (;;)
    {
        const PJ_TYPE eType = Proj().proj_get_type(poObject.get());
        ProjObject poInner;
        if (eType == PJ_TYPE_BOUND_CRS)
            poInner.reset(Proj().proj_get_source_crs(poContext, poObject.get()));
        else if (eType == PJ_TYPE_COMPOUND_CRS)
            poInner.reset(Proj().proj_crs_get_sub_crs(poContext, poObject.get(), 0));
        if (!poInner)
            return poObject;
        poObject = std::move(poInner);
    }
}

ProjObject ProjCRS::Conversion() const
{
    const ProjObject poHorizontal = Horizontal();
    if (Proj().proj_get_type(poHorizontal.get()) != PJ_TYPE_PROJECTED_CRS)
        return nullptr;
    return ProjObject(Proj().proj_crs_get_coordoperation(mpoContext->Get(), poHorizontal.get()));
}

ProjCRS::Unit ProjCRS::HorizontalUnit() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    const ProjObject poSystem(Proj().proj_crs_get_coordinate_system(poContext, Horizontal().get()));
    Unit oUnit;
    const char* poName = nullptr;
    if (poSystem && Proj().proj_cs_get_axis_info(poContext, poSystem.get(), 0, nullptr, nullptr, nullptr, &oUnit.factor,
                                                 &poName, nullptr, nullptr) != 0)
        oUnit.name = Text(poName);
    return oUnit;
}

ProjCRS::Ellipsoid ProjCRS::FindEllipsoid() const
{
    PJ_CONTEXT* poContext = mpoContext->Get();
    Ellipsoid oEllipsoid;
    const ProjObject poEllipsoid(Proj().proj_get_ellipsoid(poContext, Horizontal().get()));
    if (!poEllipsoid)
        return oEllipsoid;
    oEllipsoid.name = Text(Proj().proj_get_name(poEllipsoid.get()));
    Proj().proj_ellipsoid_get_parameters(poContext, poEllipsoid.get(), &oEllipsoid.semiMajor, nullptr, nullptr,
                                         &oEllipsoid.inverseFlattening);
    return oEllipsoid;
}

std::string ProjCRS::Export(PJ_WKT_TYPE eType, const char* poKind) const
{
    const char* const OPTIONS[] = {"MULTILINE=NO", nullptr};
    const char* poText = Proj().proj_as_wkt(mpoContext->Get(), mpoObject.get(), eType, OPTIONS);
    if (poText == nullptr)
        mpoContext->Fail("\"" + GetName() + "\" cannot be written as " + poKind, Place::Current());
    return poText;
}

ProjObject MakeObject(const ProjContext& oContext, const ICRS& oCRS, const Place& oPlace)
{
    const auto* poOwn = dynamic_cast<const ProjCRS*>(&oCRS);
    if (poOwn == nullptr)
        return ParseDefinition(oContext, oCRS.GetWKT(), oPlace);
    ProjObject poObject(Proj().proj_clone(oContext.Get(), poOwn->GetObject()));
    if (!poObject)
        oContext.Fail("\"" + oCRS.GetName() + "\" cannot be copied", oPlace);
    return poObject;
}

} // namespace krv::ogc::cs::detail

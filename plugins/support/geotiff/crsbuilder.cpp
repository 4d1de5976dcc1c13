#include "plugins/support/geotiff/geokeylist.h"
#include "plugins/support/geotiff/geotags.h"
#include "plugins/support/geotiff/keyrules.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/crsparts.h"

#include <cmath>
#include <optional>
#include <string_view>
#include <utility>

#include <geotiff.h>
#include <geovalues.h>

namespace krv::plugins::support
{
namespace
{

using namespace krv::ogc::cs;

constexpr int FIRST_PRIVATE_CODE = 32768;
// The first edition of the keys gave vertical systems by ellipsoids and datums of their own list.
constexpr int FIRST_OLD_ELLIPSOID = 5001;
constexpr int FIRST_OLD_DATUM = 5101;
constexpr int LAST_OLD_DATUM = 5106;
constexpr std::uint16_t NO_KEY = 0;

// Behind the bracket that closes the first one to open from a place on; npos when it does not close.
std::size_t FindEnd(const std::string& text, std::size_t nFrom)
{
    int nDepth = 0;
    bool bQuoted = false;
    for (std::size_t nAt = nFrom; nAt < text.size(); ++nAt)
    {
        bQuoted = bQuoted != (text[nAt] == '"');
        const bool bOpen = text[nAt] == '[' || text[nAt] == '{';
        const bool bClose = text[nAt] == ']' || text[nAt] == '}';
        nDepth += bQuoted || bOpen == bClose ? 0 : bOpen ? 1 : -1;
        if (!bQuoted && bClose && nDepth == 0)
            return nAt + 1;
    }
    return std::string::npos;
}

// The definition that a citation holds: up to the bracket that ends it, since other parts may follow.
std::string CutDefinition(const std::string& citation)
{
    const auto nPrefix = citation.find(DEFINITION_PREFIX);
    if (nPrefix == std::string::npos)
        return {};
    const std::string text = citation.substr(nPrefix + DEFINITION_PREFIX.size());
    return text.substr(0, FindEnd(text, 0));
}

// Cuts a nested "VERTCS[...]" out of a definition and returns it; "" when there is none.
std::string CutHeights(std::string& definition)
{
    const auto nStart = definition.find(",VERTCS[");
    const auto nEnd = nStart == std::string::npos ? nStart : FindEnd(definition, nStart);
    if (nEnd == std::string::npos)
        return {};
    const std::string heights = definition.substr(nStart + 1, nEnd - nStart - 1);
    definition.erase(nStart, nEnd - nStart);
    return heights;
}

// Puts a reference system together from geographic keys. Parts that have a code come from the EPSG database, the others
// from their values, in the units of the keys. A whole definition that stands as text in a citation counts when there
// is no projected code and the model is not plainly geographic. Where keys and text contradict each other in the model
// or in the unit there is no system: one of the two is wrong, and nothing says which. Throws krv::DataException with
// the cause.
class CRSBuilder
{
public:
    // The keys are borrowed.
    CRSBuilder(const GeoKeyList& oKeys, const krv::Place& oPlace) : moKeys(oKeys), moPlace(oPlace) { ReadDefinition(); }

    // Null when the keys name no system, and when they contradict each other.
    std::unique_ptr<ICRS> Build() const
    {
        if (!FindContradiction().empty())
            return nullptr;
        try
        {
            CRS poSystem = BuildFromText();
            if (!poSystem)
                poSystem = BuildFromKeys();
            const auto oHeights = poSystem && !poSystem->HasVertical() ? Heights() : std::nullopt;
            return oHeights ? CreateCompoundCRS(*poSystem, *CreateVerticalCRS(*oHeights, moPlace), moPlace)
                            : std::move(poSystem);
        }
        catch (const krv::ParameterException& oException)
        {
            Fail(oException.GetMessage());
        }
    }

    // What contradicts what; empty when nothing does.
    std::string FindContradiction() const
    {
        const int nModel = FindStatedModel();
        const bool bCode = moKeys.FindCode(ProjectedCSTypeGeoKey) != 0;
        if (nModel == ModelTypeGeographic && bCode)
            return "their model is geographic, and they name a projected system";
        const bool bText = moDefinition && moDefinition->system && !bCode && !IsBaseDefinition();
        if (!bText)
        {
            const bool bBase = nModel == 0 && moKeys.FindCode(GeographicTypeGeoKey) != 0;
            const std::optional<EPSGUnit> oUnit = FindMapUnit();
            const bool bMap = moKeys.GetCode(ProjectedCSTypeGeoKey) == KvUserDefined || (oUnit && oUnit->isLinear);
            return bBase && bMap ? "they describe a map in a projection that they do not name" : "";
        }
        const bool bProjected = moDefinition->system->IsProjected();
        if (nModel == ModelTypeProjected && !bProjected)
            return "their model is projected, the definition in their text is not";
        if (nModel == ModelTypeGeographic && !moDefinition->system->IsGeographic())
            return "their model is geographic, the definition in their text is not";
        return CompareUnits();
    }

private:
    using CRS = std::unique_ptr<ICRS>;

    // A definition in a citation: its system, null where it is not understood.
    struct Definition
    {
        std::uint16_t key;
        std::string text;
        CRS system;
        std::string cause; // why it is not understood
    };

    // The model that the keys state, by its key or by naming a projection; 0 when they leave it open. A base system
    // alone leaves it open.
    int FindStatedModel() const
    {
        const int nModel = moKeys.GetCode(GTModelTypeGeoKey);
        if (nModel == ModelTypeProjected || nModel == ModelTypeGeographic || nModel == ModelTypeGeocentric)
            return nModel;
        const bool bProjected = moKeys.FindCode(ProjectedCSTypeGeoKey) != 0 || moKeys.FindCode(ProjectionGeoKey) != 0 ||
                                moKeys.FindCode(ProjCoordTransGeoKey) != 0;
        return bProjected ? int{ModelTypeProjected} : 0;
    }

    CRS BuildFromKeys() const
    {
        const int nModel = FindStatedModel();
        if (nModel == ModelTypeProjected)
            return BuildProjected();
        const bool bNamed = nModel != 0 || moKeys.FindCode(GeographicTypeGeoKey) != 0;
        return bNamed ? CreateGeodeticCRS(Base(), moPlace) : nullptr;
    }

    // Some writers put the whole definition as text into a citation when the keys cannot say it.
    void ReadDefinition()
    {
        if (moKeys.FindCode(ProjectedCSTypeGeoKey) != 0)
            return;
        for (const std::uint16_t nKey : {PCSCitationGeoKey, GTCitationGeoKey, GeogCitationGeoKey})
        {
            std::string text = CutDefinition(moKeys.GetText(nKey));
            if (text.empty())
                continue;
            moDefinition.emplace(Definition{nKey, text, nullptr, {}});
            try
            {
                const std::string heights = CutHeights(text);
                CRS poSystem = CreateCRSFromWKT(text, moPlace);
                moDefinition->system = heights.empty()
                                           ? std::move(poSystem)
                                           : CreateCompoundCRS(*poSystem, *CreateCRSFromWKT(heights, moPlace), moPlace);
            }
            catch (const krv::DataException& oException)
            {
                moDefinition->cause = oException.GetMessage();
            }
            return;
        }
    }

    // A geographic system in the citation of the base of a projected one.
    bool IsBaseDefinition() const
    {
        return moDefinition && moDefinition->key == GeogCitationGeoKey && moDefinition->system &&
               moDefinition->system->IsGeographic() && FindStatedModel() == ModelTypeProjected;
    }

    CRS BuildFromText() const
    {
        const int nModel = FindStatedModel();
        const bool bCode = moKeys.FindCode(ProjectedCSTypeGeoKey) != 0 ||
                           (nModel == ModelTypeGeographic && moKeys.FindCode(GeographicTypeGeoKey) != 0);
        if (!moDefinition || bCode || IsBaseDefinition())
            return nullptr;
        const bool bSaidByKeys = moKeys.FindCode(ProjectionGeoKey) != 0 || moKeys.FindCode(ProjCoordTransGeoKey) != 0;
        if (bSaidByKeys && !(moDefinition->system && FindWayToDegrees(*moDefinition->system)))
            return nullptr;
        if (moDefinition->system)
            return CRS(moDefinition->system->Clone());
        throw krv::DataException(moDefinition->cause, moPlace);
    }

    // The unit of the map is the key against the definition. Feet of different countries count as one here, the
    // definition knows better.
    std::string CompareUnits() const
    {
        constexpr double ROUNDING = 1e-5;
        const ICRS& oSystem = *moDefinition->system;
        const std::optional<EPSGUnit> oUnit = FindMapUnit();
        const bool bSame = oUnit && std::abs(oUnit->factor / oSystem.GetUnitFactor() - 1.0) < ROUNDING;
        const bool bOther = oSystem.IsProjected()    ? oUnit && !(oUnit->isLinear && bSame)
                            : oSystem.IsGeographic() ? oUnit && oUnit->isLinear && FindStatedModel() == 0
                                                     : false;
        return bOther ? "their unit is the " + oUnit->name + ", that of the definition in their text the " +
                            oSystem.GetUnitName()
                      : std::string();
    }

    // The unit of the map, where the keys give one that is known.
    std::optional<EPSGUnit> FindMapUnit() const
    {
        try
        {
            if (moKeys.FindCode(ProjLinearUnitsGeoKey) != 0)
                return FindEPSGUnit(moKeys.GetCode(ProjLinearUnitsGeoKey), moPlace);
        }
        catch (const krv::DataException&)
        {
            return std::nullopt;
        }
        const std::optional<double> oSize = moKeys.GetNumber(ProjLinearUnitSizeGeoKey);
        return oSize ? std::optional(EPSGUnit{"length of " + NumberText(*oSize) + " metres", *oSize, false, true})
                     : std::nullopt;
    }

    CRS BuildProjected() const
    {
        const int nCode = moKeys.FindCode(ProjectedCSTypeGeoKey);
        if (nCode == 0)
            return CreateProjectedCRS(Projected(), moPlace);
        return nCode >= FIRST_PRIVATE_CODE ? CreateCRSFromWKT("ESRI:" + std::to_string(nCode), moPlace)
                                           : CreateCRSFromEPSG(nCode, moPlace);
    }

    ProjectedParts Projected() const
    {
        ProjectedParts oParts;
        oParts.name = ProjectedName();
        oParts.base = Base();
        oParts.length = Unit(ProjLinearUnitsGeoKey, ProjLinearUnitSizeGeoKey);
        oParts.azimuth.code = moKeys.FindCode(GeogAzimuthUnitsGeoKey);
        oParts.conversion = moKeys.FindCode(ProjectionGeoKey);
        if (oParts.conversion != 0)
            return oParts;
        const std::uint16_t nMethod = moKeys.GetCode(ProjCoordTransGeoKey);
        oParts.method = IsPseudoMercator() ? FindProjectionMethod("Popular Visualisation Pseudo Mercator")
                                           : FindMethod(nMethod, UsesSecondVariant(nMethod));
        if (oParts.method == nullptr)
            Fail(nMethod == 0 ? "they name no projection"
                              : "projection method " + std::to_string(nMethod) + " is not known");
        for (const MethodParameter* pParameter : oParts.method->parameters)
            oParts.values.push_back(ParameterValue(nMethod, pParameter->code));
        return oParts;
    }

    double ParameterValue(std::uint16_t nMethod, int nParameter) const
    {
        const ParameterKeys& oKeys = FindParameterKeys(nMethod, nParameter);
        for (const std::uint16_t nKey : oKeys.keys)
            if (const auto oValue = nKey != NO_KEY ? moKeys.GetNumber(nKey) : std::nullopt)
                return *oValue;
        return oKeys.fallback;
    }

    bool UsesSecondVariant(std::uint16_t nMethod) const
    {
        constexpr int LATITUDE = 8801;
        constexpr int SCALE = 8805;
        constexpr double ROUNDING = 1e-9;
        if (nMethod == CT_Mercator)
            return moKeys.GetNumber(ProjStdParallel1GeoKey) && !moKeys.GetNumber(ProjScaleAtNatOriginGeoKey);
        if (nMethod != CT_PolarStereographic || std::abs(std::abs(ParameterValue(nMethod, LATITUDE)) - 90.0) < ROUNDING)
            return false;
        if (std::abs(ParameterValue(nMethod, SCALE) - 1.0) > ROUNDING)
            Fail("a polar stereographic projection has both a parallel of true scale and a scale factor");
        return true;
    }

    GeodeticParts Base() const
    {
        GeodeticParts oParts;
        oParts.code = moKeys.FindCode(GeographicTypeGeoKey);
        oParts.angle = AngleUnit();
        if (oParts.code != 0)
            return oParts;
        oParts.shift = moKeys.GetNumbers(GeogTOWGS84GeoKey);
        if (oParts.shift.size() != 3 && oParts.shift.size() != 7)
            oParts.shift.clear();
        if (IsBaseDefinition())
        {
            oParts.system = moDefinition->system.get();
            return oParts;
        }
        oParts.name = NamedPart(GeogCitationGeoKey, "GCS Name");
        oParts.geocentric = FindStatedModel() == ModelTypeGeocentric;
        oParts.length = Unit(GeogLinearUnitsGeoKey, GeogLinearUnitSizeGeoKey);
        DatumParts& oDatum = oParts.datum;
        oDatum.code = moKeys.FindCode(GeogGeodeticDatumGeoKey);
        if (oDatum.code != 0)
            return oParts;
        oDatum.name = NamedPart(GeogCitationGeoKey, "Datum");
        oDatum.ellipsoid = Ellipsoid();
        oDatum.meridian = {moKeys.FindCode(GeogPrimeMeridianGeoKey), NamedPart(GeogCitationGeoKey, "Primem"),
                           moKeys.GetNumber(GeogPrimeMeridianLongGeoKey).value_or(0.0)};
        return oParts;
    }

    EllipsoidParts Ellipsoid() const
    {
        EllipsoidParts oParts;
        oParts.code = moKeys.FindCode(GeogEllipsoidGeoKey);
        if (oParts.code != 0)
            return oParts;
        const std::optional<double> oMajor = moKeys.GetNumber(GeogSemiMajorAxisGeoKey);
        if (!oMajor)
            Fail("they name neither a geographic system nor a datum nor an ellipsoid");
        const int nUnit = moKeys.FindCode(GeogLinearUnitsGeoKey);
        const double nMetres =
            nUnit != 0 ? FindEPSGUnit(nUnit, moPlace).factor : moKeys.GetNumber(GeogLinearUnitSizeGeoKey).value_or(1.0);
        oParts.name = NamedPart(GeogCitationGeoKey, "Ellipsoid");
        oParts.semiMajorAxis = *oMajor * nMetres;
        oParts.semiMinorAxis = moKeys.GetNumber(GeogSemiMinorAxisGeoKey).value_or(*oMajor) * nMetres;
        oParts.inverseFlattening = moKeys.GetNumber(GeogInvFlatteningGeoKey).value_or(0.0);
        return oParts;
    }

    // Nothing when the keys name no heights. Codes of ellipsoids say only that heights are above the datum's own
    // ellipsoid, and add no system.
    std::optional<VerticalParts> Heights() const
    {
        const int nCode = moKeys.GetCode(VerticalCSTypeGeoKey);
        if (nCode == 0 || (nCode >= FIRST_OLD_ELLIPSOID && nCode < FIRST_OLD_DATUM))
            return std::nullopt;
        VerticalParts oParts;
        if (nCode != KvUserDefined && (nCode < FIRST_OLD_DATUM || nCode > LAST_OLD_DATUM))
        {
            oParts.code = nCode;
            return oParts;
        }
        oParts.datumCode = nCode != KvUserDefined ? nCode : moKeys.FindCode(VerticalDatumGeoKey);
        if (oParts.datumCode == 0 && moKeys.GetText(VerticalCitationGeoKey).empty())
            return std::nullopt;
        oParts.name = NamedPart(VerticalCitationGeoKey, "VCS Name");
        oParts.datumName = NamedPart(VerticalCitationGeoKey, "Datum");
        oParts.length = Unit(VerticalUnitsGeoKey, NO_KEY);
        return oParts;
    }

    // The unit in which the keys give angles: their own, else that of the geographic system.
    UnitParts AngleUnit() const
    {
        if (moKeys.GetCode(GeogAngularUnitsGeoKey) == 0 && moKeys.FindCode(GeographicTypeGeoKey) != 0)
            return {};
        const UnitParts oUnit = Unit(GeogAngularUnitsGeoKey, GeogAngularUnitSizeGeoKey);
        return oUnit.IsGiven() ? oUnit : UnitParts{Angular_Degree, {}};
    }

    UnitParts Unit(std::uint16_t nCodeKey, std::uint16_t nSizeKey) const
    {
        return {moKeys.FindCode(nCodeKey), nSizeKey != NO_KEY ? moKeys.GetNumber(nSizeKey) : std::nullopt};
    }

    // Citations are a name, or a list such as "GCS Name = a|Datum = b". "unknown" when the part is not in it.
    std::string NamedPart(std::uint16_t nCitation, const std::string& part) const
    {
        const std::string text = moKeys.GetText(nCitation);
        const auto nStart = text.find(part + " = ");
        if (nStart != std::string::npos)
        {
            const auto nName = nStart + part.size() + 3;
            return text.substr(nName, text.find('|', nName) - nName);
        }
        const bool bPlain = text.find(" = ") == std::string::npos;
        return bPlain && !text.empty() && part.ends_with(" Name") ? text : "unknown";
    }

    std::string ProjectedName() const
    {
        const std::string name = NamedPart(PCSCitationGeoKey, "PCS Name");
        return name == "unknown" ? NamedPart(GTCitationGeoKey, "PCS Name") : name;
    }

    // The keys have no method for the spherical projection of web maps: their writers say a plain Mercator there and
    // mean what the name says.
    bool IsPseudoMercator() const
    {
        if (moKeys.GetCode(ProjCoordTransGeoKey) != CT_Mercator)
            return false;
        constexpr std::uint16_t ZEROS[] = {ProjNatOriginLatGeoKey, ProjNatOriginLongGeoKey, ProjStdParallel1GeoKey,
                                           ProjFalseEastingGeoKey, ProjFalseNorthingGeoKey};
        for (const std::uint16_t nKey : ZEROS)
            if (moKeys.GetNumber(nKey).value_or(0.0) != 0.0)
                return false;
        const std::string name = ProjectedName();
        const bool bNamed = name.find("Web_Mercator") != std::string::npos ||
                            name.find("Web Mercator") != std::string::npos ||
                            name.find("Pseudo-Mercator") != std::string::npos;
        return bNamed && moKeys.GetNumber(ProjScaleAtNatOriginGeoKey).value_or(1.0) == 1.0;
    }

    [[noreturn]] void Fail(const std::string& cause) const
    {
        throw krv::DataException("The geographic keys cannot be used: " + cause, moPlace);
    }

    const GeoKeyList& moKeys;
    krv::Place moPlace;
    std::optional<Definition> moDefinition;
};

} // namespace

std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(const GeoTags& oTags, const std::string& fileName, std::string* pTrouble,
                                            const krv::Place& oPlace)
{
    try
    {
        std::string damage;
        const GeoKeyList oKeys = GeoKeyList::From(oTags, &damage);
        if (!damage.empty())
            throw krv::DataException("The geographic keys are damaged: " + damage, oPlace);
        const CRSBuilder oBuilder(oKeys, oPlace);
        const std::string contradiction = oBuilder.FindContradiction();
        if (pTrouble != nullptr && !contradiction.empty())
            *pTrouble = "the geographic keys contradict each other, and no reference system is taken from them: " +
                        contradiction;
        return oBuilder.Build();
    }
    catch (const krv::DataException& oException)
    {
        throw krv::DataException(fileName + ": " + oException.GetMessage(), oPlace);
    }
}

} // namespace krv::plugins::support

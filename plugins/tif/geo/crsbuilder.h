#pragma once

#include "plugins/tif/geo/geokeydirectory.h"
#include "plugins/tif/geo/projectionrules.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <memory>
#include <optional>
#include <string>

namespace krv::plugins::tif
{

// Puts a reference system together from geographic keys. Parts that have a code come from the EPSG database, the others
// from their values, in the units of the keys. A whole definition that stands as text in a citation counts when there
// is no projected code and the model is not plainly geographic. Where keys and text contradict each other in the model
// or in the unit there is no system: one of the two is wrong, and nothing says which. Throws krv::DataException with
// the cause.
class CRSBuilder
{
public:
    // The keys are borrowed.
    CRSBuilder(const GeoKeyDirectory& oKeys, const krv::Place& oPlace);

    // Null when the keys name no system, and when they contradict each other.
    std::unique_ptr<krv::ogc::cs::ICRS> Build() const;

    // What contradicts what; empty when nothing does.
    std::string FindContradiction() const;

private:
    using CRS = std::unique_ptr<krv::ogc::cs::ICRS>;
    struct Units
    {
        std::string angle;
        std::string azimuth;
        std::string length;
    };

    // A definition in a citation: its system, null where it is not understood.
    struct Definition
    {
        geokey_t eKey;
        std::string text;
        CRS system;
        std::string cause; // why it is not understood
    };

    int FindModel() const;
    int FindStatedModel() const;
    CRS BuildHorizontal() const;
    void ReadDefinition();
    bool IsBaseDefinition() const;
    CRS BuildFromText() const;
    std::string CompareUnits() const;
    std::optional<krv::ogc::cs::EPSGUnit> FindMapUnit() const;
    CRS BuildProjected() const;
    CRS BuildProjectedFromParts() const;
    CRS BuildGeographic() const;
    CRS BuildGeocentric() const;
    CRS Shifted(CRS poSystem) const;
    CRS WithHeights(CRS poSystem) const;

    std::string Conversion() const;
    Units FindUnits() const;
    std::string Parameter(const ParameterRule& oRule, const Units& oUnits) const;
    double ParameterValue(const ParameterRule& oRule) const;
    bool UsesSecondVariant(int nMethod) const;
    std::string BaseSystem() const;
    std::string Datum() const;
    std::string Ellipsoid() const;
    std::string PrimeMeridian() const;
    std::string Heights() const;
    std::string HeightDatum() const;
    std::string AngleUnit() const;
    std::string LengthUnit() const;
    std::string Unit(geokey_t eCode, geokey_t eSize, bool bAngle) const;
    std::string NamedPart(geokey_t eCitation, const std::string& part) const;
    std::string ProjectedName() const;
    bool IsPseudoMercator() const;
    [[noreturn]] void Fail(const std::string& cause) const;

    const GeoKeyDirectory& moKeys;
    krv::Place moPlace;
    std::optional<Definition> moDefinition;
};

} // namespace krv::plugins::tif

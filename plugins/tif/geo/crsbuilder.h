#pragma once

#include "plugins/tif/geo/geokeylist.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/crsparts.h"

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
    CRSBuilder(const GeoKeyList& oKeys, const krv::Place& oPlace);

    // Null when the keys name no system, and when they contradict each other.
    std::unique_ptr<krv::ogc::cs::ICRS> Build() const;

    // What contradicts what; empty when nothing does.
    std::string FindContradiction() const;

private:
    using CRS = std::unique_ptr<krv::ogc::cs::ICRS>;

    // A definition in a citation: its system, null where it is not understood.
    struct Definition
    {
        std::uint16_t key;
        std::string text;
        CRS system;
        std::string cause; // why it is not understood
    };

    int FindStatedModel() const;
    void ReadDefinition();
    bool IsBaseDefinition() const;
    CRS BuildFromText() const;
    CRS BuildFromKeys() const;
    CRS BuildProjected() const;
    std::string CompareUnits() const;
    std::optional<krv::ogc::cs::EPSGUnit> FindMapUnit() const;

    krv::ogc::cs::ProjectedParts Projected() const;
    krv::ogc::cs::GeodeticParts Base() const;
    krv::ogc::cs::EllipsoidParts Ellipsoid() const;
    std::optional<krv::ogc::cs::VerticalParts> Heights() const;
    krv::ogc::cs::UnitParts Unit(std::uint16_t nCodeKey, std::uint16_t nSizeKey) const;
    krv::ogc::cs::UnitParts AngleUnit() const;
    double ParameterValue(std::uint16_t nMethod, int nParameter) const;
    bool UsesSecondVariant(std::uint16_t nMethod) const;
    std::string NamedPart(std::uint16_t nCitation, const std::string& part) const;
    std::string ProjectedName() const;
    bool IsPseudoMercator() const;
    [[noreturn]] void Fail(const std::string& cause) const;

    const GeoKeyList& moKeys;
    krv::Place moPlace;
    std::optional<Definition> moDefinition;
};

} // namespace krv::plugins::tif

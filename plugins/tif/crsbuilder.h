#pragma once

#include "plugins/tif/geokeydirectory.h"
#include "plugins/tif/projectionrules.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <memory>
#include <string>

namespace krv::plugins::tif
{

// Puts a reference system together from geographic keys. Parts that have a code come from the EPSG database, the others
// from their values, in the units of the keys. Throws krv::DataException with the cause.
class CRSBuilder
{
public:
    // The keys are borrowed.
    CRSBuilder(const GeoKeyDirectory& oKeys, const krv::Place& oPlace);

    // Null when the keys name no system.
    std::unique_ptr<krv::ogc::cs::ICRS> Build() const;

private:
    using CRS = std::unique_ptr<krv::ogc::cs::ICRS>;
    struct Units
    {
        std::string angle;
        std::string azimuth;
        std::string length;
    };

    int FindModel() const;
    CRS BuildHorizontal() const;
    CRS BuildFromText() const;
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
    [[noreturn]] void Fail(const std::string& cause) const;

    const GeoKeyDirectory& moKeys;
    krv::Place moPlace;
};

} // namespace krv::plugins::tif

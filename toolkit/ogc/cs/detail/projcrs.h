#pragma once

#include "toolkit/ogc/cs/crsparts.h"
#include "toolkit/ogc/cs/detail/projcontext.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::ogc::cs::detail
{

// ICRS over a PROJ object in a context of its own.
class ProjCRS : public ICRS
{
public:
    ProjCRS(std::unique_ptr<ProjContext> poContext, ProjObject poObject);
    ~ProjCRS() override;

    ICRS* Clone() const override;
    std::string GetName() const override;
    int GetEPSG() const override;
    std::string GetWKT() const override;
    std::string GetWKT1() const override;
    std::string GetPROJJSON() const override;
    bool IsEquivalent(const ICRS& oOther) const override;
    bool IsGeographic() const override;
    bool IsProjected() const override;
    bool HasVertical() const override;
    std::string GetUnitName() const override;
    double GetUnitFactor() const override;
    std::string GetDatumName() const override;
    std::string GetEllipsoidName() const override;
    std::string GetProjectionMethod() const override;
    double GetSemiMajorAxis() const override;
    double GetInverseFlattening() const override;
    std::vector<ProjectionParameter> GetProjectionParameters() const override;

    const PJ* GetObject() const { return mpoObject.get(); }

    // The code of the heights; 0 when there are none or none with a code, and when the whole has one that says them.
    int GetVerticalEPSG() const;
    // The geographic system below: codes of it and of its datum, name and shift.
    GeodeticParts GetBase() const;

private:
    struct Unit
    {
        std::string name;
        double factor = 1.0;
    };
    struct Ellipsoid
    {
        std::string name;
        double semiMajor = 0.0;
        double inverseFlattening = 0.0;
    };

    ProjObject Share(const PJ* poObject) const;
    ProjObject Unbound() const;
    ProjObject Horizontal() const;
    std::vector<double> Shift() const;
    ProjObject Conversion() const;
    Unit HorizontalUnit() const;
    Ellipsoid FindEllipsoid() const;
    std::string Export(PJ_WKT_TYPE eType, const char* poKind) const;

    std::unique_ptr<ProjContext> mpoContext; // before the object: it goes last
    ProjObject mpoObject;
};

// The system's object, made anew in a context, for whatever implementation of ICRS. Throws krv::DataException.
ProjObject MakeObject(const ProjContext& oContext, const ICRS& oCRS, const Place& oPlace);

// An object from a definition that CreateCRSFromWKT accepts.
ProjObject ParseDefinition(const ProjContext& oContext, const std::string& definition, const Place& oPlace);

} // namespace krv::ogc::cs::detail

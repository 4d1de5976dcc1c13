#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ifileiobuilder.h"

#include <array>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace krv::test
{

// What a probe throws at the chosen call.
enum class Fault
{
    eKrv,      // krv::IOException "probe"
    eStandard, // std::runtime_error "probe"
    eForeign   // an int
};

// Watches decorated objects: notes every call that enters them, counts the objects alive, and throws at the n-th call.
class Probe
{
public:
    // Calls count anew from 1; 0 never throws.
    void Arm(unsigned int nThrowAt, Fault eFault = Fault::eKrv);
    // Every operation of a decorated object starts with this. Destructors do not.
    void Enter(const std::string& call);

    bool HasThrown() const { return mbThrown; }
    int GetLive() const { return moLive[eDataset] + moLive[eTransfer] + moLive[eOther]; }
    // Whether the last dataset went while an I/O object was still alive.
    bool HasOrphans() const { return mbOrphans; }
    // The calls since the probe was armed.
    const std::vector<std::string>& GetCalls() const { return moCalls; }

    enum Kind
    {
        eDataset,
        eTransfer, // an I/O object
        eOther
    };

    // A member of every decorated object.
    class Alive
    {
    public:
        Alive(Probe& oProbe, Kind eKind);
        Alive(const Alive&) = delete;
        Alive& operator=(const Alive&) = delete;
        ~Alive();

    private:
        Probe& moProbe;
        Kind meKind;
    };

private:
    std::vector<std::string> moCalls;
    unsigned int mnThrowAt = 0;
    Fault meFault = Fault::eKrv;
    bool mbThrown = false;
    bool mbOrphans = false;
    std::array<int, 3> moLive{};
};

// A dataset around a dataset: forwards everything, hands out decorated I/O objects, channel descriptions and overview
// managers. It has the raster, geocoding and bitmap facets, whatever the inner one has. The probe
// is the caller's and outlives it.
std::unique_ptr<krv::datasources::IDataset> Decorate(Probe& oProbe,
                                                     std::unique_ptr<krv::datasources::IDataset> poInner);

class SimpleFormat : public krv::datasources::ABSFileFormat
{
public:
    explicit SimpleFormat(const std::string& shortName) : ABSFileFormat({"test"}, shortName) {}
    std::string GetDescription() const override { return "Format of the tests"; }
};

// A builder made of functions; it notes its calls in the probe, when there is one, as "NAME::Identify" and so on.
class FunctionBuilder : public krv::datasources::IFileIOBuilder
{
public:
    using OpenFunction = std::function<krv::datasources::IDataset*(const std::string&, AccessMode)>;
    using CreateFunction = std::function<krv::datasources::IDataset*(const std::string&, const std::string&)>;
    using IdentifyFunction = std::function<int(const std::string&, const unsigned char*, unsigned int, int)>;

    explicit FunctionBuilder(const std::string& shortName, Probe* poProbe = nullptr);
    ~FunctionBuilder() override;

    krv::datasources::IFileFormat* GetFileFormat() override { return moFormat.get(); }
    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;

    std::unique_ptr<krv::datasources::IFileFormat> moFormat;
    OpenFunction moOpen;         // null is returned while it is empty
    CreateFunction moCreate;     // likewise
    IdentifyFunction moIdentify; // declines while it is empty

private:
    void Enter(const char* pCall);

    Probe* mpoProbe;
    std::unique_ptr<Probe::Alive> moAlive;
};

} // namespace krv::test

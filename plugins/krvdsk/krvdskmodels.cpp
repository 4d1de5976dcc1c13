// The sensor models and orbits of a native file.
#include "plugins/krvdsk/krvdskdataset.h"
#include "toolkit/mathmodel/rpcmodel.h"

namespace krv::plugins::krvdsk
{

using krv::datasources::EphemerisRecords;
using krv::datasources::IEphemerisDataset;
using krv::datasources::IEphemerisRecords;
using krv::datasources::IMathModelDataset;
using krv::mathmodel::IMathModel;
using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;

namespace
{

constexpr const char* RPC = "RPC";

std::vector<unsigned char> WriteModel(const RpcCoefficients& oModel)
{
    BytesWriter oWriter;
    oWriter.AddText(RPC);
    for (const double nValue : oModel.GetValues())
        oWriter.AddReal(nValue);
    return std::move(oWriter.GetBytes());
}

RpcModel* ReadModel(BytesReader oReader)
{
    const std::string kind = oReader.ReadText();
    if (kind != RPC)
        oReader.Fail("a sensor model of the kind \"" + kind + "\" is not known to this program");
    RpcCoefficients::Values oValues{};
    for (double& nValue : oValues)
        nValue = oReader.ReadReal();
    const RpcCoefficients oModel = RpcCoefficients::FromValues(oValues);
    const std::string fault = oModel.FindFault();
    if (!fault.empty())
        oReader.Fail("it is no rational polynomial model: " + fault);
    return new RpcModel(oModel);
}

} // namespace

std::vector<unsigned int> KrvdskDataset::GetMathModelList() const
{
    std::vector<unsigned int> oList = ListWithLinked(Segment::MODEL, &IMathModelDataset::GetMathModelList);
    if (oList.empty())
        for (const unsigned int nModel : GetSidecars().ListModels())
            oList.push_back(support::FIRST_BESIDE + nModel);
    return oList;
}

unsigned int KrvdskDataset::FindModelBeside(unsigned int nSegment) const
{
    const std::vector<unsigned int> oList = GetMathModelList();
    const bool bBeside = nSegment > support::FIRST_BESIDE &&
                         std::find(oList.begin(), oList.end(), nSegment) != oList.end() &&
                         ListWithLinked(Segment::MODEL, &IMathModelDataset::GetMathModelList).empty();
    return bBeside ? nSegment - support::FIRST_BESIDE : 0;
}

IMathModel* KrvdskDataset::GetMathModel(unsigned int nSegment)
{
    if (const unsigned int nBeside = FindModelBeside(nSegment))
        return new RpcModel(GetSidecars().ReadModel(nBeside));
    if (auto* const poTheirs = FindLinkedSegment(Segment::MODEL, nSegment, &IMathModelDataset::GetMathModelList))
        return poTheirs->GetMathModel(nSegment);
    const std::vector<unsigned char> oBytes = ReadSegment(Segment::MODEL, nSegment, Place::Current());
    return ReadModel({oBytes, GetFileName(), "MODEL " + std::to_string(nSegment)});
}

unsigned int KrvdskDataset::CreateMathModel(const IMathModel& oModel)
{
    const Place oPlace = Place::Current();
    const auto* const poModel = dynamic_cast<const RpcModel*>(&oModel);
    if (poModel == nullptr)
        Refuse("a native file holds rational polynomial models (RPC), not one of the kind " + oModel.GetName(), oPlace);
    return AddSegment(Segment::MODEL, WriteModel(poModel->GetCoefficients()), 0, oPlace);
}

void KrvdskDataset::DeleteMathModel(unsigned int nSegment)
{
    DeleteSegment(Segment::MODEL, nSegment, Place::Current());
}

std::vector<unsigned int> KrvdskDataset::GetEphemerisList() const
{
    return ListWithLinked(Segment::EPHEMERIS, &IEphemerisDataset::GetEphemerisList);
}

void KrvdskDataset::DeleteEphemeris(unsigned int nSegment)
{
    DeleteSegment(Segment::EPHEMERIS, nSegment, Place::Current());
}

IMathModel* KrvdskDataset::BuildMathModel(unsigned int nEphemeris, unsigned int nSegment)
{
    if (auto* const poTheirs = FindLinkedSegment(Segment::EPHEMERIS, nEphemeris, &IEphemerisDataset::GetEphemerisList))
        return poTheirs->BuildMathModel(nEphemeris, nSegment);
    Refuse("no sensor model is made from the orbit " + std::to_string(nEphemeris) + " here");
}

unsigned int KrvdskDataset::CreateEphemeris(const std::string& kind, const std::vector<unsigned char>& oRecords)
{
    BytesWriter oWriter;
    oWriter.AddText(kind);
    oWriter.AddText({oRecords.begin(), oRecords.end()});
    return AddSegment(Segment::EPHEMERIS, std::move(oWriter.GetBytes()), 0, Place::Current());
}

EphemerisRecords KrvdskDataset::ReadEphemeris(unsigned int nSegment) const
{
    if (FindLinkedSegment(Segment::EPHEMERIS, nSegment, &IEphemerisDataset::GetEphemerisList) != nullptr)
    {
        if (const auto* const poTheirs = mpoLink->Find<IEphemerisRecords>())
            return poTheirs->ReadEphemeris(nSegment);
        Refuse("the records of orbit " + std::to_string(nSegment) + " are not handed out by " + mpoLink->GetName());
    }
    const std::vector<unsigned char> oBytes = ReadSegment(Segment::EPHEMERIS, nSegment, Place::Current());
    BytesReader oReader(oBytes, GetFileName(), "EPHEMERIS " + std::to_string(nSegment));
    EphemerisRecords oRecords;
    oRecords.kind = oReader.ReadText();
    const std::string bytes = oReader.ReadText();
    oRecords.bytes.assign(bytes.begin(), bytes.end());
    return oRecords;
}

} // namespace krv::plugins::krvdsk

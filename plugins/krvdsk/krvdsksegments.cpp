// What a native file holds beside its channels, as numbered segments, and tables among them.
#include "gobs/pct/pct.h"
#include "plugins/krvdsk/krvdskdataset.h"

#include <cmath>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

std::vector<unsigned char> WritePCT(const krv::gobs::PCT& oTable)
{
    BytesWriter oWriter;
    oWriter.AddNumber(oTable.GetInterpolation() ? 1 : 0, 1);
    const auto& oBackground = oTable.GetBackground();
    for (const unsigned char nPart : {oBackground.red, oBackground.green, oBackground.blue})
        oWriter.AddNumber(nPart, 1);
    oWriter.AddNumber(oTable.GetEntries().size(), 4);
    for (const krv::gobs::PCT::Entry& oEntry : oTable.GetEntries())
    {
        oWriter.AddReal(oEntry.low);
        oWriter.AddReal(oEntry.high);
        for (const std::uint16_t nPart : {oEntry.colour.red, oEntry.colour.green, oEntry.colour.blue, oEntry.alpha})
            oWriter.AddNumber(nPart, 2);
    }
    return std::move(oWriter.GetBytes());
}

krv::gobs::PCT ReadPCT(BytesReader oReader)
{
    const auto ReadPart = [&oReader](std::size_t nBytes)
    {
        return static_cast<std::uint16_t>(oReader.ReadNumber(nBytes));
    };
    krv::gobs::PCT oTable;
    oTable.SetInterpolation(oReader.ReadNumber(1) != 0);
    krv::gobs::RGBTuple<unsigned char> oBackground;
    for (unsigned char* pPart : {&oBackground.red, &oBackground.green, &oBackground.blue})
        *pPart = static_cast<unsigned char>(oReader.ReadNumber(1));
    oTable.SetBackground(oBackground);
    double nBefore = -HUGE_VAL;
    for (std::uint32_t nLeft = oReader.ReadCount(); nLeft > 0; --nLeft)
    {
        krv::gobs::PCT::Entry oEntry{};
        oEntry.low = oReader.ReadReal();
        oEntry.high = oReader.ReadReal();
        for (std::uint16_t* pPart : {&oEntry.colour.red, &oEntry.colour.green, &oEntry.colour.blue, &oEntry.alpha})
            *pPart = ReadPart(2);
        if (!(oEntry.low >= nBefore && oEntry.high > oEntry.low))
            oReader.Fail("its ranges are not in order");
        nBefore = oEntry.high;
        oTable.Add(oEntry);
    }
    return oTable;
}

bool Ascends(const krv::datasources::LookupTable& oTable)
{
    double nBefore = -HUGE_VAL;
    for (const krv::datasources::LookupEntry& oEntry : oTable)
    {
        if (!(oEntry.value > nBefore))
            return false;
        nBefore = oEntry.value;
    }
    return true;
}

std::vector<unsigned char> WriteLUT(const krv::datasources::LookupTable& oTable)
{
    BytesWriter oWriter;
    oWriter.AddNumber(oTable.size(), 4);
    for (const krv::datasources::LookupEntry& oEntry : oTable)
    {
        oWriter.AddReal(oEntry.value);
        oWriter.AddReal(oEntry.result);
    }
    return std::move(oWriter.GetBytes());
}

krv::datasources::LookupTable ReadLUT(BytesReader oReader)
{
    krv::datasources::LookupTable oTable;
    for (std::uint32_t nLeft = oReader.ReadCount(); nLeft > 0; --nLeft)
    {
        const double nValue = oReader.ReadReal();
        oTable.push_back({nValue, oReader.ReadReal()});
    }
    if (!Ascends(oTable))
        oReader.Fail("its values do not ascend");
    return oTable;
}

} // namespace

std::vector<unsigned int> KrvdskDataset::ListSegments(const std::string& kind) const
{
    CheckOpen();
    std::vector<unsigned int> oList;
    for (const auto& [nNumber, oSegment] : GetCatalogue().moSegments)
        if (oSegment.moKind == kind)
            oList.push_back(nNumber);
    return oList;
}

const Segment& KrvdskDataset::GetSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace) const
{
    CheckOpen(oPlace);
    const auto& oSegments = GetCatalogue().moSegments;
    const auto oFound = oSegments.find(nNumber);
    if (oFound == oSegments.end() || oFound->second.moKind != kind)
        Refuse("there is no segment " + std::to_string(nNumber) + " of the kind " + kind +
                   (mpoLink ? "; what " + mpoLink->GetName() + " has of these is changed there" : std::string()),
               oPlace);
    return oFound->second;
}

Segment& KrvdskDataset::EditSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace)
{
    GetWriter("segments cannot be written", oPlace).Touch();
    GetSegment(kind, nNumber, oPlace);
    return mpoWriter->GetCatalogue().moSegments.at(nNumber);
}

unsigned int KrvdskDataset::AddSegment(Segment oSegment, const Place& oPlace)
{
    Catalogue& oCatalogue = GetWriter("segments cannot be added", oPlace).GetCatalogue();
    if (oSegment.mnChannel > GetChanCount())
        Refuse("channel " + std::to_string(oSegment.mnChannel) + " does not exist", oPlace);
    if (oCatalogue.mnNextSegment == UINT32_MAX)
        Refuse("the numbers of segments are used up", oPlace);
    const unsigned int nNumber = oCatalogue.mnNextSegment;
    oCatalogue.moSegments.emplace(nNumber, std::move(oSegment));
    ++oCatalogue.mnNextSegment;
    oCatalogue.Describe();
    mpoWriter->Touch();
    return nNumber;
}

unsigned int KrvdskDataset::AddSegment(const std::string& kind, std::vector<unsigned char> oBytes,
                                       unsigned int nChannel, const Place& oPlace)
{
    Segment oSegment;
    oSegment.moKind = kind;
    oSegment.mnChannel = nChannel;
    oSegment.moBytes.Set(std::move(oBytes));
    return AddSegment(std::move(oSegment), oPlace);
}

std::vector<unsigned char> KrvdskDataset::ReadSegment(const std::string& kind, unsigned int nNumber,
                                                      const Place& oPlace) const
{
    const Segment& oSegment = GetSegment(kind, nNumber, oPlace);
    return oSegment.moBytes.Get(*mpoStore, oSegment.Describe(nNumber));
}

void KrvdskDataset::SetSegmentBytes(const std::string& kind, unsigned int nNumber, std::vector<unsigned char> oBytes,
                                    const Place& oPlace)
{
    EditSegment(kind, nNumber, oPlace).moBytes.Set(std::move(oBytes));
}

void KrvdskDataset::DeleteSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace)
{
    Segment& oSegment = EditSegment(kind, nNumber, oPlace);
    if (oSegment.mpoPlane)
        mpoWriter->DropPlane(*oSegment.mpoPlane);
    else
        mpoWriter->DropBlob(oSegment.moBytes);
    mpoWriter->GetCatalogue().moSegments.erase(nNumber);
}

std::vector<unsigned int> KrvdskDataset::GetPCTList() const
{
    return ListWithLinked(Segment::PCT, &krv::datasources::IPCTDataset::GetPCTList);
}

krv::gobs::PCT* KrvdskDataset::GetPCT(unsigned int nPCT) const
{
    if (const auto* const poTheirs = FindLinkedPCT(nPCT))
        return poTheirs->GetPCT(nPCT);
    const std::vector<unsigned char> oBytes = ReadSegment(Segment::PCT, nPCT, Place::Current());
    return new krv::gobs::PCT(ReadPCT({oBytes, GetFileName(), "PCT " + std::to_string(nPCT)}));
}

unsigned int KrvdskDataset::GetPCTChannel(unsigned int nPCT) const
{
    if (const auto* const poTheirs = FindLinkedPCT(nPCT))
        return FindOwnChannel(poTheirs->GetPCTChannel(nPCT));
    return GetSegment(Segment::PCT, nPCT, Place::Current()).mnChannel;
}

std::string KrvdskDataset::GetPCTDescription(unsigned int nPCT) const
{
    if (const auto* const poTheirs = FindLinkedPCT(nPCT))
        return poTheirs->GetPCTDescription(nPCT);
    return GetSegment(Segment::PCT, nPCT, Place::Current()).moDescription;
}

unsigned int KrvdskDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    return AddSegment(Segment::PCT, WritePCT(oTable), nChannel, Place::Current());
}

void KrvdskDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    SetSegmentBytes(Segment::PCT, nPCT, WritePCT(oTable), Place::Current());
}

void KrvdskDataset::SetPCTDescription(unsigned int nPCT, const std::string& oDescription)
{
    EditSegment(Segment::PCT, nPCT, Place::Current()).moDescription = oDescription;
}

void KrvdskDataset::DeletePCT(unsigned int nPCT)
{
    DeleteSegment(Segment::PCT, nPCT, Place::Current());
}

std::vector<unsigned int> KrvdskDataset::GetLUTList() const
{
    return ListWithLinked(Segment::LUT, &krv::datasources::ILUTDataset::GetLUTList);
}

krv::datasources::LookupTable KrvdskDataset::GetLUT(unsigned int nLUT) const
{
    if (const auto* const poTheirs = FindLinkedLUT(nLUT))
        return poTheirs->GetLUT(nLUT);
    const std::vector<unsigned char> oBytes = ReadSegment(Segment::LUT, nLUT, Place::Current());
    return ReadLUT({oBytes, GetFileName(), "LUT " + std::to_string(nLUT)});
}

unsigned int KrvdskDataset::GetLUTChannel(unsigned int nLUT) const
{
    if (const auto* const poTheirs = FindLinkedLUT(nLUT))
        return FindOwnChannel(poTheirs->GetLUTChannel(nLUT));
    return GetSegment(Segment::LUT, nLUT, Place::Current()).mnChannel;
}

std::string KrvdskDataset::GetLUTDescription(unsigned int nLUT) const
{
    if (const auto* const poTheirs = FindLinkedLUT(nLUT))
        return poTheirs->GetLUTDescription(nLUT);
    return GetSegment(Segment::LUT, nLUT, Place::Current()).moDescription;
}

unsigned int KrvdskDataset::CreateLUT(const krv::datasources::LookupTable& oTable, unsigned int nChannel)
{
    if (!Ascends(oTable))
        Refuse("a lookup table whose values do not ascend cannot be stored");
    return AddSegment(Segment::LUT, WriteLUT(oTable), nChannel, Place::Current());
}

void KrvdskDataset::UpdateLUT(unsigned int nLUT, const krv::datasources::LookupTable& oTable)
{
    if (!Ascends(oTable))
        Refuse("a lookup table whose values do not ascend cannot be stored");
    SetSegmentBytes(Segment::LUT, nLUT, WriteLUT(oTable), Place::Current());
}

void KrvdskDataset::SetLUTDescription(unsigned int nLUT, const std::string& oDescription)
{
    EditSegment(Segment::LUT, nLUT, Place::Current()).moDescription = oDescription;
}

void KrvdskDataset::DeleteLUT(unsigned int nLUT)
{
    DeleteSegment(Segment::LUT, nLUT, Place::Current());
}

} // namespace krv::plugins::krvdsk

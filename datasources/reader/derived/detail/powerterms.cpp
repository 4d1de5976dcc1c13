#include "datasources/reader/derived/detail/powerterms.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/validitysource.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cctype>
#include <iterator>

namespace krv::datasources::detail
{

namespace
{

using krv::gobs::PowerTerm;

constexpr char MATRIX_TYPE[] = "Matrix_Type";

struct Meaning
{
    ePowerSource meSource = ePowerByRecord;
    unsigned int mnRows = 0; // of a matrix; 0 when it does not say
};

Meaning ParseMatrixType(const std::string& text)
{
    const std::string upper = ToUpper(text);
    const std::size_t nFirst = upper.find_first_not_of(" \t");
    if (nFirst == std::string::npos)
        return {};
    const char nDigit = nFirst + 1 < upper.size() ? upper[nFirst + 1] : ' ';
    const unsigned int nRows = nDigit >= '2' && nDigit <= '9' ? static_cast<unsigned int>(nDigit - '0') : 0;
    switch (upper[nFirst])
    {
    case 'S':
        return {eScatteringElements, 0};
    case 'C':
    case 'T':
        return {eHermitianMatrix, nRows};
    case 'I':
        return {eIntensities, 0};
    case 'A':
        return {eAmplitudes, 0};
    default:
        return {};
    }
}

[[noreturn]] void Refuse(const PowerChannel& oChannel, const std::string& why, const Place& oPlace)
{
    throw krv::DataException(
        "Channel " + std::to_string(oChannel.mnNumber) + " is " + oChannel.moType.Describe() + ": " + why, oPlace);
}

// The channels that are asked for, in the order of the request.
std::vector<PowerChannel> Choose(const std::vector<PowerChannel>& oChannels, const PowerRequest& oRequest,
                                 const Place& oPlace)
{
    std::vector<PowerChannel> oChosen;
    for (const unsigned int nChannel : oRequest.moChannels)
    {
        if (nChannel == 0 || nChannel > oChannels.size())
            throw krv::OutOfBoundsException({nChannel}, "Out of bounds.", oPlace);
        oChosen.push_back(oChannels[nChannel - 1]);
    }
    if (oRequest.moChannels.empty())
        std::copy_if(oChannels.begin(), oChannels.end(), std::back_inserter(oChosen),
                     [](const PowerChannel& oChannel) { return !oChannel.mbAlpha; });
    if (oChosen.empty())
        throw krv::DataException("There are no channels that hold power", oPlace);
    if (!oRequest.moWeights.empty() && oRequest.moWeights.size() != oChosen.size())
        throw krv::DataException(std::to_string(oRequest.moWeights.size()) + " weights for " +
                                     std::to_string(oChosen.size()) + " channels",
                                 oPlace);
    return oChosen;
}

Meaning FindMeaning(const std::vector<PowerChannel>& oChosen, ePowerSource eAsked, const Place& oPlace)
{
    Meaning oMeaning = ParseMatrixType(oChosen.front().moMatrixType);
    if (eAsked != ePowerByRecord)
        return {eAsked, oMeaning.meSource == eAsked ? oMeaning.mnRows : 0};
    for (const PowerChannel& oChannel : oChosen)
    {
        if (ParseMatrixType(oChannel.moMatrixType).meSource != oMeaning.meSource)
            Refuse(oChannel,
                   "its \"Matrix_Type\" \"" + oChannel.moMatrixType + "\" is not that of channel " +
                       std::to_string(oChosen.front().mnNumber),
                   oPlace);
        if (oMeaning.meSource == ePowerByRecord && oChannel.moType.IsComplex() != oChosen.front().moType.IsComplex())
            Refuse(oChannel,
                   "channel " + std::to_string(oChosen.front().mnNumber) + " is " + oChosen.front().moType.Describe() +
                       "; the tag \"Matrix_Type\" is to say what complex and real channels are together",
                   oPlace);
    }
    if (oMeaning.meSource == ePowerByRecord)
        oMeaning.meSource = oChosen.front().moType.IsComplex() ? eScatteringElements : eIntensities;
    return oMeaning;
}

void RequireComplex(const std::vector<PowerChannel>& oChosen, bool bComplex, const std::string& what,
                    const Place& oPlace)
{
    for (const PowerChannel& oChannel : oChosen)
    {
        if (oChannel.moType.IsComplex() != bComplex)
            Refuse(oChannel, what, oPlace);
    }
}

// The element in the middle of HH, HV, VV, wherever it stands.
std::size_t FindCross(const std::vector<PowerChannel>& oChosen)
{
    for (std::size_t n = 0; n < oChosen.size(); ++n)
    {
        const std::string description = ToUpper(oChosen[n].moDescription);
        if (description.find("HV") != std::string::npos || description.find("VH") != std::string::npos)
            return n;
    }
    return 1;
}

// Row and column of an element in a description such as "T12_imag"; 0 when there is none.
unsigned int FindElement(const std::string& description)
{
    const auto IsIndex = [&](std::size_t n)
    {
        return n < description.size() && description[n] >= '1' && description[n] <= '9';
    };
    for (std::size_t n = 0; n < description.size(); ++n)
    {
        const char nLetter = description[n];
        const bool bStart = n == 0 || !std::isalnum(static_cast<unsigned char>(description[n - 1]));
        if (bStart && (nLetter == 'C' || nLetter == 'T' || nLetter == 'c' || nLetter == 't') && IsIndex(n + 1) &&
            IsIndex(n + 2) && !IsIndex(n + 3))
            return static_cast<unsigned int>((description[n + 1] - '0') * 10 + (description[n + 2] - '0'));
    }
    return 0;
}

using Positions = std::vector<std::size_t>;

Positions FindDescribed(const std::vector<PowerChannel>& oChosen)
{
    Positions oDiagonal;
    for (std::size_t n = 0; n < oChosen.size(); ++n)
    {
        const unsigned int nElement = FindElement(oChosen[n].moDescription);
        if (nElement == 0)
            return {};
        if (nElement / 10 == nElement % 10)
            oDiagonal.push_back(n);
    }
    return oDiagonal;
}

Positions FindReal(const std::vector<PowerChannel>& oChosen)
{
    Positions oReal;
    for (std::size_t n = 0; n < oChosen.size(); ++n)
    {
        if (!oChosen[n].moType.IsComplex())
            oReal.push_back(n);
    }
    return oReal;
}

// The diagonal of an upper triangle row by row; off it each element takes nStep channels.
Positions Diagonal(std::size_t nRows, std::size_t nStep)
{
    Positions oDiagonal;
    std::size_t nAt = 0;
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
    {
        oDiagonal.push_back(nAt);
        nAt += 1 + nStep * (nRows - nRow - 1);
    }
    return oDiagonal;
}

// By the number of channels alone; empty when that says nothing.
Positions FindByCount(const std::vector<PowerChannel>& oChosen, unsigned int nSaid, bool bComplex)
{
    Positions oFound;
    for (std::size_t nRows = 2; nRows <= 9; ++nRows)
    {
        if (nSaid != 0 && nRows != nSaid)
            continue;
        const std::size_t nTriangle = bComplex ? nRows * (nRows + 1) / 2 : nRows * nRows;
        const bool bDiagonal = oChosen.size() == nRows && !bComplex;
        if (!bDiagonal && oChosen.size() != nTriangle)
            continue;
        if (!oFound.empty())
            return {};
        oFound = Diagonal(nRows, bDiagonal ? 0 : (bComplex ? 1 : 2));
    }
    return oFound;
}

Positions FindDiagonal(const std::vector<PowerChannel>& oChosen, unsigned int nSaid, const Place& oPlace)
{
    const Positions oReal = FindReal(oChosen);
    const bool bMixed = !oReal.empty() && oReal.size() != oChosen.size();
    Positions oDiagonal = FindDescribed(oChosen);
    if (oDiagonal.empty() && bMixed && oChosen.size() == oReal.size() * (oReal.size() + 1) / 2)
        oDiagonal = oReal;
    else if (oDiagonal.empty() && !bMixed)
        oDiagonal = FindByCount(oChosen, nSaid, oReal.empty());
    if (oDiagonal.empty())
        Refuse(oChosen.back(),
               std::to_string(oChosen.size()) + " channels, of them " + std::to_string(oReal.size()) +
                   " real, are no matrix whose diagonal can be told",
               oPlace);
    if (nSaid != 0 && oDiagonal.size() != nSaid)
        Refuse(oChosen[oDiagonal.back()],
               "the diagonal has " + std::to_string(oDiagonal.size()) + " of them where \"" +
                   oChosen.front().moMatrixType + "\" has " + std::to_string(nSaid),
               oPlace);
    if (bMixed)
    {
        for (const std::size_t n : oDiagonal)
        {
            if (oChosen[n].moType.IsComplex())
                Refuse(oChosen[n], "the diagonal of a matrix is real", oPlace);
        }
    }
    return oDiagonal;
}

std::vector<PowerTerm> MakeTerms(const std::vector<PowerChannel>& oChosen, const Meaning& oMeaning, const Place& oPlace)
{
    std::vector<PowerTerm> oTerms(oChosen.size(), PowerTerm{PowerTerm::eSquare, 1});
    switch (oMeaning.meSource)
    {
    case eScatteringElements:
        RequireComplex(oChosen, true, "scattering elements are complex", oPlace);
        if (oChosen.size() == 3)
            oTerms[FindCross(oChosen)].mnWeight = 2;
        break;
    case eHermitianMatrix:
        oTerms.assign(oChosen.size(), {});
        for (const std::size_t n : FindDiagonal(oChosen, oMeaning.mnRows, oPlace))
            oTerms[n] = {PowerTerm::eValue, 1};
        break;
    case eIntensities:
        RequireComplex(oChosen, false, "intensities are real", oPlace);
        oTerms.assign(oChosen.size(), {PowerTerm::eValue, 1});
        break;
    default:
        RequireComplex(oChosen, false, "amplitudes are real", oPlace);
    }
    return oTerms;
}

PowerChannel Describe(unsigned int nChannel, const krv::gobs::DataType& oType, const AuxiliaryData& oRecord)
{
    PowerChannel oChannel{nChannel, oType, "", oRecord.GetFileMetadataValue(MATRIX_TYPE),
                          FindAlpha(oRecord) == nChannel};
    if (nChannel > oRecord.GetChannelCount())
        return oChannel;
    oChannel.moDescription = oRecord.GetChannelDescription(nChannel);
    const std::string own = oRecord.GetChanMetadataValue(MATRIX_TYPE, nChannel);
    if (!own.empty())
        oChannel.moMatrixType = own;
    return oChannel;
}

} // namespace

std::vector<PowerChannel> DescribeChannels(const IRasterReader& oReader)
{
    const AuxiliaryData oRecord = oReader.GetAuxiliaryData();
    const auto& oInfos = oReader.GetChannelsInfo();
    std::vector<PowerChannel> oChannels;
    for (unsigned int n = 1; n <= oReader.GetChansCount(); ++n)
    {
        const IChannelInfo* const poInfo = n <= oInfos.size() ? oInfos[n - 1] : nullptr;
        oChannels.push_back(Describe(n, poInfo != nullptr ? poInfo->GetDataType() : oReader.GetDataType(), oRecord));
    }
    return oChannels;
}

std::vector<PowerChannel> DescribeChannels(IDataset& oDataset, const Place& oPlace)
{
    const auto& oRasters = RequireFacet<IRasterDataset>(&oDataset, "This dataset doesn't support Raster.", oPlace);
    const AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
    std::vector<PowerChannel> oChannels;
    for (unsigned int n = 1; n <= oRasters.GetChanCount(); ++n)
    {
        const std::unique_ptr<IChannelInfo> poInfo(oRasters.GetChannelInfo(n));
        if (poInfo == nullptr)
            throw krv::DataException("The dataset gave no description of channel " + std::to_string(n), oPlace);
        oChannels.push_back(Describe(n, poInfo->GetDataType(), oRecord));
    }
    return oChannels;
}

std::vector<PowerTerm> MakePowerTerms(const std::vector<PowerChannel>& oChannels, const PowerRequest& oRequest,
                                      const Place& oPlace)
{
    const std::vector<PowerChannel> oChosen = Choose(oChannels, oRequest, oPlace);
    const std::vector<PowerTerm> oFound = MakeTerms(oChosen, FindMeaning(oChosen, oRequest.meSource, oPlace), oPlace);
    std::vector<PowerTerm> oTerms(oChannels.size());
    for (std::size_t n = 0; n < oChosen.size(); ++n)
    {
        PowerTerm& oTerm = oTerms[oChosen[n].mnNumber - 1];
        if (oTerm.meKind != PowerTerm::eNone)
            Refuse(oChosen[n], "it is listed twice", oPlace);
        oTerm = oFound[n];
        if (!oRequest.moWeights.empty())
            oTerm.mnWeight = oRequest.moWeights[n];
    }
    return oTerms;
}

} // namespace krv::datasources::detail

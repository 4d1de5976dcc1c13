#include "plugins/jp2/reading/jp2source.h"

#include "plugins/jp2/reading/samplecopy.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::jp2
{

namespace
{

constexpr std::uint64_t STRUCTURE_BYTES = std::uint64_t{192} << 20;
constexpr unsigned int MOST_BITS = 31; // OpenJPEG's samples

std::vector<std::size_t> FindSamples(std::uint64_t nFirstPixel, std::size_t nPixels, std::uint32_t nStep,
                                     std::uint32_t nFirstSample, std::uint32_t nSamples)
{
    std::vector<std::size_t> oSamples(nPixels);
    for (std::size_t nAt = 0; nAt < nPixels; ++nAt)
        oSamples[nAt] = static_cast<std::size_t>(
            std::clamp<std::uint64_t>((nFirstPixel + nAt) / nStep, nFirstSample, nFirstSample + nSamples - 1) -
            nFirstSample);
    return oSamples;
}

} // namespace

krv::gobs::DataType Jp2Source::FindType(const Codestream& oStream, const Component& oComponent)
{
    using krv::gobs::DataType;
    if (oComponent.mnBits > MOST_BITS)
        throw krv::FileFormatException(oStream.GetFile()->GetName(), oStream.GetFile()->GetName() + ": samples of " +
                                                                         std::to_string(oComponent.mnBits) +
                                                                         " bits cannot be decoded");
    if (oComponent.mnBits <= 8)
        return DataType(oComponent.mbSigned ? krv::gobs::eDT_8S : krv::gobs::eDT_8U);
    if (oComponent.mnBits <= 16)
        return DataType(oComponent.mbSigned ? krv::gobs::eDT_16S : krv::gobs::eDT_16U);
    return DataType(oComponent.mbSigned ? krv::gobs::eDT_32S : krv::gobs::eDT_32U);
}

std::vector<support::Plane> Jp2Source::MakePlanes(const Codestream& oStream)
{
    std::vector<support::Plane> oPlanes;
    for (const Component& oComponent : oStream.GetComponents())
    {
        const krv::gobs::DataType oType = FindType(oStream, oComponent);
        if (oStream.HasColourTransform() && !oPlanes.empty() && oPlanes.back().moType == oType)
            ++oPlanes.back().mnChannels;
        else
            oPlanes.push_back({oType, 1, {}});
    }
    return oPlanes;
}

std::size_t Jp2Source::CountDecoded(const Codestream& oStream)
{
    return oStream.HasColourTransform() ? oStream.GetComponents().size() : 1;
}

Jp2Source::Jp2Source(std::shared_ptr<Codestream> poStream, unsigned int nReduce, std::uint64_t nBlockBytes)
    : mpoStream(std::move(poStream)), moResolution(*mpoStream, nReduce, CountDecoded(*mpoStream), nBlockBytes),
      moLayout(MakeLayout())
{
    std::size_t nFirst = 0;
    for (unsigned int nPlane = 0; nPlane < moLayout.GetPlaneCount(); ++nPlane)
    {
        moFirstComponents.push_back(nFirst);
        nFirst += moLayout.GetPlane(nPlane).mnChannels;
    }
}

Jp2Source::~Jp2Source() = default;

support::ImageLayout Jp2Source::MakeLayout() const
{
    return {moResolution.GetWidth(), moResolution.GetHeight(), moResolution.GetBlockWidth(),
            moResolution.GetBlockHeight(), MakePlanes(*mpoStream)};
}

void Jp2Source::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                          std::size_t nPitch)
{
    const support::PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const support::PixelRect oPixels = {oRect.mnX + oPart.mnX, oRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight};
    if (!moResolution.HasEmptyTiles())
        return ReadPixels(oBlock.mnPlane, oPixels, pTarget, nPitch);
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    for (std::uint32_t nY = 0; nY < oPixels.mnHeight; ++nY)
        for (std::uint32_t nX = 0; nX < oPixels.mnWidth; ++nX)
            ReadPixels(oBlock.mnPlane, {oPixels.mnX + nX, oPixels.mnY + nY, 1, 1},
                       pTarget + nY * nPitch + nX * nPixelBytes, nPitch);
}

void Jp2Source::ReadPixels(unsigned int nPlane, const support::PixelRect& oPixels, unsigned char* pTarget,
                           std::size_t nPitch)
{
    const GridRect oArea = moResolution.FindArea(oPixels);
    const TileRange oTiles = mpoStream->FindTiles(oArea);
    DecodeRequest oRequest;
    oRequest.mnReduce = moResolution.GetReduce();
    if (!moResolution.IsSame(oArea, mpoStream->GetRect(oTiles)))
        oRequest.moArea = oArea;
    const support::Plane& oPlane = moLayout.GetPlane(nPlane);
    const std::size_t nFirst = moFirstComponents[nPlane];
    const bool bAll = mpoStream->HasColourTransform() || mpoStream->GetComponents().size() == 1;
    if (!bAll)
        oRequest.moComponents = {static_cast<OPJ_UINT32>(nFirst)};
    const ImagePtr poImage =
        Decode(*mpoStream->GetFile(), mpoStream->CutOut(oTiles, STRUCTURE_BYTES), oRequest,
               "tile " + std::to_string(oTiles.mnTop * mpoStream->GetTilesAcross() + oTiles.mnLeft));

    std::vector<Samples> oComponents;
    for (std::size_t nAt = 0; nAt < oPlane.mnChannels; ++nAt)
    {
        const std::size_t nDecoded = bAll ? nFirst + nAt : 0;
        const Component& oComponent = mpoStream->GetComponents()[nFirst + nAt];
        if (nDecoded >= poImage->numcomps || poImage->comps[nDecoded].data == nullptr)
            throw krv::FileFormatException(GetName(), GetName() + ": component " + std::to_string(nFirst + nAt) +
                                                          " cannot be decoded");
        const opj_image_comp_t& oDecoded = poImage->comps[nDecoded];
        const std::uint32_t nX = moResolution.FindFirstSampleX(oArea, oComponent);
        const std::uint32_t nY = moResolution.FindFirstSampleY(oArea, oComponent);
        Samples oSamples{&oDecoded, {}, {}};
        const std::uint64_t nFirstX = std::uint64_t{moResolution.GetFirstX()} + oPixels.mnX;
        if (oComponent.mnStepX != 1 || oDecoded.w != oPixels.mnWidth)
            oSamples.moColumns = FindSamples(nFirstX, oPixels.mnWidth, oComponent.mnStepX, nX, oDecoded.w);
        oSamples.moRows = FindSamples(std::uint64_t{moResolution.GetFirstY()} + oPixels.mnY, oPixels.mnHeight,
                                      oComponent.mnStepY, nY, oDecoded.h);
        oComponents.push_back(std::move(oSamples));
    }
    CopySamples(oComponents, oPlane.moType, oPixels.mnWidth, oPixels.mnHeight, pTarget, nPitch);
}

} // namespace krv::plugins::jp2

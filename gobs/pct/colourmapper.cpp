#include "gobs/pct/colourmapper.h"

#include "gobs/mask/samplematch.h"
#include "gobs/pct/detail/colourkernels.h"
#include "gobs/raster/pixelvalue.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstring>
#include <vector>

namespace krv::gobs
{

class ColourMapper::Implementation
{
public:
    virtual ~Implementation() = default;
    virtual void Run(const unsigned char* pValues, std::size_t nValues, unsigned char* pColours) const = 0;
};

namespace
{

using Colour = detail::Colour;

template <class T>
Colour ColourOf(const PCT& oTable, T nValue, const SampleMatch<T>& oTransparent)
{
    unsigned char nAlpha = 0;
    const RGBTuple<unsigned char> oColour = oTable.GetValue(static_cast<double>(nValue), nAlpha);
    return {oColour.red, oColour.green, oColour.blue, oTransparent.Matches(nValue) ? std::uint8_t{0} : nAlpha};
}

// All values of one or two bytes, by their bits.
template <class T>
class Listed : public ColourMapper::Implementation
{
public:
    Listed(const PCT& oTable, const SampleMatch<T>& oTransparent, bool bAlpha)
        : mpLoop(detail::FindColourLoop(sizeof(T), bAlpha))
    {
        constexpr unsigned int COUNT = 1u << 8 * sizeof(T);
        moColours.reserve(COUNT);
        for (unsigned int nBits = 0; nBits < COUNT; ++nBits)
            moColours.push_back(ColourOf(oTable, static_cast<T>(nBits), oTransparent));
    }

    void Run(const unsigned char* pValues, std::size_t nValues, unsigned char* pColours) const override
    {
        mpLoop(moColours.data(), pValues, nValues, pColours);
    }

private:
    detail::ColourLoop mpLoop;
    std::vector<Colour> moColours;
};

// Any values: equal neighbours are looked up once.
template <class T>
class Searched : public ColourMapper::Implementation
{
public:
    Searched(const PCT& oTable, const SampleMatch<T>& oTransparent, bool bAlpha)
        : moTable(oTable), moTransparent(oTransparent), mnBytes(bAlpha ? 4 : 3)
    {
    }

    void Run(const unsigned char* pValues, std::size_t nValues, unsigned char* pColours) const override
    {
        T nLast{};
        Colour oColour = ColourOf(moTable, nLast, moTransparent);
        for (std::size_t n = 0; n < nValues; ++n, pColours += mnBytes)
        {
            T nValue;
            std::memcpy(&nValue, pValues + n * sizeof(T), sizeof(T));
            if (nValue != nLast)
                oColour = ColourOf(moTable, nLast = nValue, moTransparent);
            std::memcpy(pColours, &oColour, mnBytes);
        }
    }

private:
    PCT moTable;
    SampleMatch<T> moTransparent;
    std::size_t mnBytes;
};

} // namespace

ColourMapper::ColourMapper(const PCT& oTable, const DataType& oType, bool bAlpha,
                           const std::optional<SampleValue>& oTransparent)
{
    if (oType.IsComplex())
        throw DataException("Values of the type " + oType.Describe() + " have no colours: they are complex");
    const auto Make = [&]<class T>(std::type_identity<T>) -> std::unique_ptr<const Implementation>
    {
        const SampleMatch<T> oMatch(oTransparent);
        if constexpr (sizeof(T) <= 2)
            return std::make_unique<Listed<T>>(oTable, oMatch, bAlpha);
        else
            return std::make_unique<Searched<T>>(oTable, oMatch, bAlpha);
    };
    mpoImplementation = VisitPartType(oType, Make);
}

ColourMapper::~ColourMapper() = default;

void ColourMapper::Run(const unsigned char* pValues, std::size_t nValues, unsigned char* pColours) const
{
    mpoImplementation->Run(pValues, nValues, pColours);
}

} // namespace krv::gobs

#include "plugins/jp2/reading/samplecopy.h"

#include <cstdint>

namespace krv::plugins::jp2
{

namespace
{

// A row that lies as it is wanted is the common case: its loop has no table and, for one channel, no stride.
template <typename T>
void CopyRow(const OPJ_INT32* pSource, T* pTarget, std::size_t nWidth, std::size_t nChannels)
{
    if (nChannels == 1)
        for (std::size_t nAt = 0; nAt < nWidth; ++nAt)
            pTarget[nAt] = static_cast<T>(pSource[nAt]);
    else
        for (std::size_t nAt = 0; nAt < nWidth; ++nAt)
            pTarget[nAt * nChannels] = static_cast<T>(pSource[nAt]);
}

template <typename T>
void Copy(const std::vector<Samples>& oComponents, std::size_t nWidth, std::size_t nHeight, unsigned char* pTarget,
          std::size_t nPitch)
{
    const std::size_t nChannels = oComponents.size();
    for (std::size_t nRow = 0; nRow < nHeight; ++nRow)
        for (std::size_t nChannel = 0; nChannel < nChannels; ++nChannel)
        {
            const Samples& oSamples = oComponents[nChannel];
            const std::size_t nSampleRow = oSamples.moRows.empty() ? nRow : oSamples.moRows[nRow];
            const OPJ_INT32* pSource = oSamples.mpComponent->data + nSampleRow * oSamples.mpComponent->w;
            T* pRow = reinterpret_cast<T*>(pTarget + nRow * nPitch) + nChannel;
            if (oSamples.moColumns.empty())
                CopyRow(pSource, pRow, nWidth, nChannels);
            else
                for (std::size_t nAt = 0; nAt < nWidth; ++nAt)
                    pRow[nAt * nChannels] = static_cast<T>(pSource[oSamples.moColumns[nAt]]);
        }
}

} // namespace

void CopySamples(const std::vector<Samples>& oComponents, const krv::gobs::DataType& oType, std::size_t nWidth,
                 std::size_t nHeight, unsigned char* pTarget, std::size_t nPitch)
{
    if (oType.GetBits() == 8)
        Copy<std::uint8_t>(oComponents, nWidth, nHeight, pTarget, nPitch);
    else if (oType.GetBits() == 16)
        Copy<std::uint16_t>(oComponents, nWidth, nHeight, pTarget, nPitch);
    else
        Copy<std::uint32_t>(oComponents, nWidth, nHeight, pTarget, nPitch);
}

} // namespace krv::plugins::jp2

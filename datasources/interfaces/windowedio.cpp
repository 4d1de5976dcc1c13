#include "datasources/interfaces/windowedio.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <string>

namespace krv::datasources
{

namespace
{

std::string Text(std::int64_t nX, std::int64_t nY, std::uint64_t nWidth, std::uint64_t nHeight)
{
    return std::to_string(nWidth) + " x " + std::to_string(nHeight) + " at " + std::to_string(nX) + ", " +
           std::to_string(nY);
}

std::size_t GetPitch(unsigned int nWidth, unsigned int nHeight, std::size_t nPixelBytes, const Place& oPlace)
{
    std::int64_t nPitch = 0;
    std::int64_t nBytes = 0;
    if (__builtin_mul_overflow(std::uint64_t{nWidth}, nPixelBytes, &nPitch) ||
        __builtin_mul_overflow(nPitch, std::int64_t{nHeight}, &nBytes))
        throw DataException("A window of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) +
                                " pixels does not fit into memory",
                            oPlace);
    return static_cast<std::size_t>(nPitch);
}

} // namespace

template <typename Base>
struct WindowedIO<Base>::Transfer
{
    PixelRect moRect;                 // in the image; of width 0 when nothing is to be done
    unsigned char* mpFirst = nullptr; // the first transferred pixel
    std::size_t mnPitch = 0;
};

template <typename Base>
WindowedIO<Base>::~WindowedIO() = default;

// The part of a window of the caller's buffer, intersected with the image unless it has to lie inside.
template <typename Base>
typename WindowedIO<Base>::Transfer
WindowedIO<Base>::Cut(std::int64_t nX, std::int64_t nY, unsigned int nWidth, unsigned int nHeight,
                      const PixelRect& oPart, unsigned char* pBuffer, bool bInside, const Place& oPlace) const
{
    if (pBuffer == nullptr)
        throw DataException("The buffer is NULL", oPlace);
    if (std::uint64_t{oPart.mnX} + oPart.mnWidth > nWidth || std::uint64_t{oPart.mnY} + oPart.mnHeight > nHeight)
        throw DataException("The part " + Text(oPart.mnX, oPart.mnY, oPart.mnWidth, oPart.mnHeight) +
                                " is not inside its window of " + std::to_string(nWidth) + " x " +
                                std::to_string(nHeight),
                            oPlace);
    const std::int64_t nImageWidth = this->GetFileWidth();
    const std::int64_t nImageHeight = this->GetFileHeight();
    const std::int64_t nLeft = std::max<std::int64_t>(0, nX + oPart.mnX);
    const std::int64_t nTop = std::max<std::int64_t>(0, nY + oPart.mnY);
    const std::int64_t nRight = std::min(nImageWidth, nX + oPart.mnX + oPart.mnWidth);
    const std::int64_t nBottom = std::min(nImageHeight, nY + oPart.mnY + oPart.mnHeight);
    if (bInside && (nX + oPart.mnX != nLeft || nY + oPart.mnY != nTop || nRight - nLeft != oPart.mnWidth ||
                    nBottom - nTop != oPart.mnHeight))
        throw DataException("The window " + Text(nX + oPart.mnX, nY + oPart.mnY, oPart.mnWidth, oPart.mnHeight) +
                                " is not inside the image of " + std::to_string(nImageWidth) + " x " +
                                std::to_string(nImageHeight),
                            oPlace);
    const std::size_t nPixelBytes = GetPixelBytes();
    const std::size_t nPitch = GetPitch(nWidth, nHeight, nPixelBytes, oPlace);
    if (nLeft >= nRight || nTop >= nBottom)
        return {};
    return {{static_cast<unsigned int>(nLeft), static_cast<unsigned int>(nTop),
             static_cast<unsigned int>(nRight - nLeft), static_cast<unsigned int>(nBottom - nTop)},
            pBuffer + static_cast<std::uint64_t>(nTop - nY) * nPitch +
                static_cast<std::uint64_t>(nLeft - nX) * nPixelBytes,
            nPitch};
}

template <typename Base>
void WindowedIO<Base>::Read(const Transfer& oTransfer)
{
    if (oTransfer.mpFirst != nullptr)
        ReadPixels(oTransfer.moRect, oTransfer.mpFirst, oTransfer.mnPitch);
}

template <typename Base>
void WindowedIO<Base>::Write(const Transfer& oTransfer)
{
    if (oTransfer.mpFirst != nullptr)
        WritePixels(oTransfer.moRect, oTransfer.mpFirst, oTransfer.mnPitch);
}

template <typename Base>
void WindowedIO<Base>::ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                                  unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                                  unsigned char* pBuffer)
{
    Read(Cut(nX, nY, nWidth, nHeight, {nPartX, nPartY, nPartWidth, nPartHeight}, pBuffer, false, Place::Current()));
}

template <typename Base>
void WindowedIO<Base>::ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                  unsigned char* pBuffer)
{
    Read(Cut(nX, nY, nWidth, nHeight, {0, 0, nWidth, nHeight}, pBuffer, true, Place::Current()));
}

template <typename Base>
void WindowedIO<Base>::WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                                   unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                                   unsigned char* const pBuffer)
{
    Write(Cut(nX, nY, nWidth, nHeight, {nPartX, nPartY, nPartWidth, nPartHeight}, pBuffer, true, Place::Current()));
}

template <typename Base>
void WindowedIO<Base>::WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                   unsigned char* const pBuffer)
{
    Write(Cut(nX, nY, nWidth, nHeight, {0, 0, nWidth, nHeight}, pBuffer, true, Place::Current()));
}

template class WindowedIO<IRasterIO>;
template class WindowedIO<IOverviewIO>;

} // namespace krv::datasources

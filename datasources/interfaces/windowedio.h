#pragma once

#include "datasources/interfaces/ioverviewio.h"
#include "toolkit/exceptions/place.h"

#include <cstddef>
#include <cstdint>

namespace krv::datasources
{

// A rectangle of pixels inside an image or a block.
// A plain value: columns from mnX to mnX + mnWidth - 1, rows likewise. Nothing is checked.
struct PixelRect
{
    unsigned int mnX = 0;
    unsigned int mnY = 0;
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;

    friend bool operator==(const PixelRect&, const PixelRect&) = default;
};

// The arithmetic of windows against an image, with its checks: null buffers, sizes that overflow, a part outside its
// window, a window outside the image. What is left for a derived class to transfer is a rectangle inside the image.
// Base is IRasterIO or IOverviewIO.
// A plug-in derives its I/O from this and says the size, the bytes of a pixel and how a rectangle is transferred.
template <typename Base>
class KRV_DATASOURCES_API WindowedIO : public Base
{
public:
    ~WindowedIO() override;

    // The four are final: what they refuse, they refuse for all formats in the same words. Errors are IRasterIO's.
    void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartWidth, unsigned int nPartHeight, unsigned char* pBuffer) final;
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                    unsigned char* pBuffer) final;
    void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                     unsigned char* const pBuffer) final;
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned char* const pBuffer) final;

private:
    // The bytes of one pixel with all its channels.
    // Constant; what it says times the width of a rectangle is the least pitch.
    virtual std::size_t GetPixelBytes() const = 0;
    // A rectangle with pixels, inside the image; its row r lies at the pointer + r * nPitch bytes.
    // Throws IOException or FileFormatException, which name the file; the rectangle is then undefined.
    virtual void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) = 0;
    // The counterpart; it stores the rectangle before it returns, or throws.
    virtual void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) = 0;

    // A window that was checked and cut: its rectangle, and where that begins in the buffer.
    struct Transfer;

    Transfer Cut(std::int64_t nX, std::int64_t nY, unsigned int nWidth, unsigned int nHeight, const PixelRect& oPart,
                 unsigned char* pBuffer, bool bInside, const krv::Place& oPlace) const;
    void Read(const Transfer& oTransfer);
    void Write(const Transfer& oTransfer);
};

extern template class WindowedIO<IRasterIO>;
extern template class WindowedIO<IOverviewIO>;

} // namespace krv::datasources

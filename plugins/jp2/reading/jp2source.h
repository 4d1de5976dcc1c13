#pragma once

#include "plugins/jp2/reading/decoder.h"
#include "plugins/jp2/reading/resolution.h"
#include "plugins/support/image/iblocksource.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// The pixels of a codestream at one of its resolutions. Components that a colour transform ties together are planes of
// several channels, all others planes of their own, decoded for themselves. A component with fewer samples than the
// image repeats each for the pixels up to the next one.
class Jp2Source : public support::IBlockSource
{
public:
    // nReduce: resolutions left out. nBlockBytes: larger tiles are decoded by areas. Throws FileFormatException for
    // components that no type holds.
    Jp2Source(std::shared_ptr<Codestream> poStream, unsigned int nReduce,
              std::uint64_t nBlockBytes = Resolution::BLOCK_BYTES);
    ~Jp2Source() override;

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoStream->GetFile()->GetName(); }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;

    // The type that samples are handed out in. Throws FileFormatException when there is none.
    static krv::gobs::DataType FindType(const Codestream& oStream, const Component& oComponent);

private:
    static std::vector<support::Plane> MakePlanes(const Codestream& oStream);
    static std::size_t CountDecoded(const Codestream& oStream);
    support::ImageLayout MakeLayout() const;
    void ReadPixels(unsigned int nPlane, const support::PixelRect& oPixels, unsigned char* pTarget, std::size_t nPitch);

    std::shared_ptr<Codestream> mpoStream;
    Resolution moResolution;
    support::ImageLayout moLayout;
    std::vector<std::size_t> moFirstComponents; // of each plane
};

} // namespace krv::plugins::jp2

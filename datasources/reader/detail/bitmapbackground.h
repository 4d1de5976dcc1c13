#pragma once

#include "gobs/mask/imaskbuilder.h"

#include <memory>

namespace krv::datasources
{

class BasicReader;

namespace detail
{

// Marks, over rasters of any region, what one channel beside them says to be background: where it is 0 or not a number.
class BitmapBackground : public krv::gobs::IMaskBuilder
{
public:
    explicit BitmapBackground(std::unique_ptr<BasicReader> poReader);
    ~BitmapBackground() override;

    // A new mask that the caller owns. Throws what reading throws.
    krv::gobs::Mask* BuildMask(const krv::gobs::Raster& oRaster) const override;

    BasicReader& GetReader() const { return *mpoReader; }
    std::unique_ptr<BasicReader> TakeReader() { return std::move(mpoReader); }
    void SetReader(std::unique_ptr<BasicReader> poReader);

private:
    std::unique_ptr<BasicReader> mpoReader;
    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoZero;
};

} // namespace detail

} // namespace krv::datasources

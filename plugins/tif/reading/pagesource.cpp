#include "plugins/tif/reading/pagesource.h"

#include "plugins/tif/reading/rowsource.h"

namespace krv::plugins::tif
{

std::unique_ptr<support::IBlockSource> MakePageSource(std::shared_ptr<Page> poPage, PixelUse eUse)
{
    const PageForm& oForm = poPage->GetForm();
    const bool bCoded = oForm.mnCompression != COMPRESSION_NONE || oForm.mbReversedBits;
    if (bCoded && !oForm.mbTiled && StrileSource::GetStrileBytes(oForm) > StrileSource::MAXIMUM_STRILE_BYTES)
        return std::make_unique<RowSource>(std::move(poPage), eUse);
    return std::make_unique<StrileSource>(std::move(poPage), eUse);
}

} // namespace krv::plugins::tif

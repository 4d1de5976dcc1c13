#pragma once

#include "plugins/support/image/blockimage.h"
#include "plugins/tif/writing/fileeditor.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

// Gives a page other channels: an entry for each new channel, the old channel (from 1) that it takes its pixels from,
// or 0 for one that is 0 everywhere. The old pixels stay in the file until the next Synchronize.
class ChannelEditor
{
public:
    // The editor outlives it.
    ChannelEditor(FileEditor& oEditor, const std::vector<unsigned int>& oSources)
        : moEditor(oEditor), moSources(oSources)
    {
    }

    // Throws DataException for a page whose channels cannot be changed.
    void Rebuild(const std::shared_ptr<PageModel>& poOld, const Place& oPlace) const;

private:
    void CheckCodec(const PageModel& oPage, const Place& oPlace) const;
    std::shared_ptr<PageModel> MakePage(PageModel& oOld) const;
    void SetColours(TagList& oTags, std::uint64_t nOldChannels) const;
    void MovePlanes(const PageModel& oOld, PageModel& oNew) const;
    void CopyPixels(const std::shared_ptr<PageModel>& poOld, const std::shared_ptr<PageModel>& poNew) const;
    void FillBlock(support::BlockImage& oOld, const support::PixelRect& oRect, std::size_t nValueBytes,
                   std::vector<unsigned char>& oPixels) const;

    FileEditor& moEditor;
    std::vector<unsigned int> moSources;
};

} // namespace krv::plugins::tif

#pragma once

#include "gobs/raster/datatype.h"
#include "operations/copy/conversion.h"
#include "operations/source/sourcefile.h"

#include <cstddef>
#include <memory>
#include <optional>
#include <vector>

namespace krv::operations::detail
{

// One channel of the copy and where it comes from.
struct CopiedChannel
{
    std::size_t source = 0;
    unsigned int channel = 0;
    krv::gobs::DataType from;
    krv::gobs::DataType to;
};

// The opened files, the channels of the copy in their order, and the part of the image.
class CopyPlan
{
public:
    // Opens the files. Throws RequestException for channels and windows that are not there, DataException for files of
    // different sizes. Warns of conversions that can change values and of no-data values that get lost in them.
    explicit CopyPlan(const CopyRequest& oRequest);

    const SourceFile& GetSource(std::size_t nSource) const { return *moSources[nSource]; }
    std::size_t GetSourceCount() const { return moSources.size(); }
    const std::vector<CopiedChannel>& GetChannels() const { return moChannels; }
    const PixelWindow& GetWindow() const { return moWindow; }
    // Whether the copy is of a part of the image.
    bool IsCut() const;
    // Whether values may change.
    bool IsLossy() const { return mbLossy; }
    // Whether each channel keeps its type.
    bool AreTypesKept() const;
    // Whether these are all channels of one file in its own order.
    bool IsWholeFile() const;
    std::vector<krv::gobs::DataType> GetTypes() const;
    // The bits that all channels are stored with where these are less than their type has and the user asks for no
    // type; else 0.
    unsigned int GetNarrowBits() const;

private:
    void CheckSizes() const;
    void ChooseChannels(const std::vector<unsigned int>& oWanted);
    void ChooseWindow(const WindowRequest& oRequest);
    void ChooseTypes(const CopyRequest& oRequest);
    void WarnOfLosses();

    std::vector<std::unique_ptr<SourceFile>> moSources;
    std::vector<CopiedChannel> moChannels;
    PixelWindow moWindow;
    bool mbTypesKept = true; // the user asks for none
    bool mbLossy = false;
};

} // namespace krv::operations::detail

#pragma once

#include "plugins/gdball/pictures/picturekind.h"
#include "plugins/support/image/plainsource.h"
#include "plugins/support/writing/filewriter.h"
#include "plugins/support/writing/options.h"

#include <memory>
#include <string>
#include <vector>

#include <vips/vips.h>

namespace krv::plugins::gdball
{

// What users may ask of a new picture.
struct PictureOptions
{
    unsigned int mnCompression = 6; // of PNG
    unsigned int mnQuality = 90;    // of JPEG and lossy WebP
    bool mbLossless = true;         // of WebP
    bool mbProgressive = false;     // of JPEG

    // Throws DataException for a key that the kind does not take.
    static PictureOptions Parse(PictureKind eKind, const std::string& options);
};

// A new picture. Its pixels wait in a scratch file, in whatever order they come, until Store has libvips make the file
// of them: whole each time, under a temporary name. libvips does that in threads of its own, which have no more to do
// when Store ends.
class PictureWriter : public support::FileWriter
{
public:
    PictureWriter(const std::string& fileName, PictureKind eKind, const PictureOptions& oOptions);
    ~PictureWriter() override;

    // Lays the picture out. Throws DataException for what the kind does not hold.
    void Make(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
              const Place& oPlace);
    const std::shared_ptr<support::PlainSource>& GetPixels() const { return mpoPixels; }
    PictureKind GetKind() const { return meKind; }
    bool IsLossless() const;
    // What readers will take the channels for.
    VipsInterpretation GetMeaning() const;
    // Throws DataException when writing has ended.
    void Change();

protected:
    void Store() override;
    bool HoldsChanges() const override { return mbChanged; }

private:
    void Save(support::File& oFile) const;

    PictureKind meKind;
    PictureOptions moOptions;
    std::shared_ptr<support::PlainSource> mpoPixels;
    bool mbChanged = false;
};

} // namespace krv::plugins::gdball

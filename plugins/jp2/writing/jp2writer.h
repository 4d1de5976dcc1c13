#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "plugins/jp2/writing/createoptions.h"
#include "plugins/jp2/writing/tilestore.h"
#include "plugins/support/geotiff/geotags.h"
#include "plugins/support/writing/filewriter.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// A new JPEG 2000 file. Tiles and what is said of them are kept apart until Store makes the file of them: a new one, or
// one in the place of that which it made before, whole each time.
class Jp2Writer : public support::FileWriter
{
public:
    Jp2Writer(const std::string& fileName, const CreateOptions& oOptions);
    ~Jp2Writer() override;

    // Lays the image out. Throws DataException for what JPEG 2000 does not hold.
    void Make(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
              const Place& oPlace);
    const std::shared_ptr<TileStore>& GetTiles() const { return mpoTiles; }

    bool IsLossless() const { return moOptions.IsLossless(); }

    const krv::datasources::AuxiliaryData& GetRecord() const { return moRecord; }
    void SetRecord(const krv::datasources::AuxiliaryData& oRecord);
    const support::GeoTags& GetGeoTags() const { return moGeoTags; }
    // Without them the file is a bare codestream, which has no place for records.
    bool HasBoxes() const;
    void SetGeoTags(support::GeoTags oTags);
    const std::optional<krv::gobs::PCT>& GetPalette() const { return moPalette; }
    // Throws DataException for an image that is no single channel of unsigned samples.
    void SetPalette(std::optional<krv::gobs::PCT> oPalette, const Place& oPlace);

protected:
    void Store() override;
    bool HoldsChanges() const override { return mbChanged; }

private:
    std::vector<unsigned char> MakeBoxes() const;
    std::vector<unsigned char> MakeHeaderBox() const;
    std::vector<unsigned char> MakeMainHeader() const;
    void WriteAll(support::File& oFile) const;
    void Change();

    CreateOptions moOptions;
    std::shared_ptr<TileStore> mpoTiles;
    krv::datasources::AuxiliaryData moRecord;
    support::GeoTags moGeoTags;
    std::optional<krv::gobs::PCT> moPalette;
    bool mbChanged = false;
};

} // namespace krv::plugins::jp2

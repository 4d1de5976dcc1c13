#include "plugins/gdball/pictures/picturemodule.h"
#include "plugins/gdball/pictures/vips/picturedataset.h"

namespace krv::plugins::gdball
{

namespace
{

krv::datasources::IDataset* OpenPicture(const std::string& fileName, PictureKind eKind, unsigned int nPage,
                                        krv::datasources::IFileFormat* poFormat)
{
    Picture oPicture{std::make_shared<support::File>(fileName, support::File::Mode::eRead), eKind, nPage, {}, {}};
    oPicture.moClaims = ReadClaims(*oPicture.mpoFile, eKind);
    StartVips(fileName);
    return new PictureDataset(fileName, std::move(oPicture), poFormat);
}

krv::datasources::IDataset* CreatePicture(const std::string& fileName, PictureKind eKind, const std::string& options,
                                          krv::datasources::IFileFormat* poFormat)
{
    const PictureOptions oOptions = PictureOptions::Parse(eKind, options);
    StartVips(fileName);
    return new PictureDataset(poFormat, std::make_shared<PictureWriter>(fileName, eKind, oOptions));
}

constexpr PictureModule MODULE = {&OpenPicture, &CreatePicture};

} // namespace

extern "C" __attribute__((visibility("default"))) const PictureModule* krvGetPictureModule();

const PictureModule* krvGetPictureModule()
{
    return &MODULE;
}

} // namespace krv::plugins::gdball

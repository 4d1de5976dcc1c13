#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "plugins/gdball/pictures/picturekind.h"

#include <string>

namespace krv::plugins::gdball
{

// The part that stands on libvips: a library of its own beside the plug-in's, which is loaded when a picture is met
// first, so that no program pays for libvips that meets none.
struct PictureModule
{
    // nPage: of an animation or a book, from 1; the dataset of a later one is called "name[page=2]". poFormat: kept as
    // a pointer. Throw what IFileIOBuilder's operations throw.
    krv::datasources::IDataset* (*mpOpen)(const std::string& fileName, PictureKind eKind, unsigned int nPage,
                                          krv::datasources::IFileFormat* poFormat);
    krv::datasources::IDataset* (*mpCreate)(const std::string& fileName, PictureKind eKind, const std::string& options,
                                            krv::datasources::IFileFormat* poFormat);
};

// The name of its entry point: const PictureModule* (). It is as old as the plug-in: both are built together.
inline constexpr char PICTURE_ENTRY[] = "krvGetPictureModule";

// Whether the part was built.
bool HasPictures();

// Loads it. fileName: the picture that asks for it, which messages name. Throws DataException when it cannot be loaded.
const PictureModule& GetPictureModule(const std::string& fileName);

} // namespace krv::plugins::gdball

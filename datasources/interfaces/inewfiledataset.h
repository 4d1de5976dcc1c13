#pragma once

#include "datasources/api.h"

namespace krv::datasources
{

// A dataset whose file may still have to get its name: until then IDataset::Delete removes what was made and leaves
// another file of the name alone. The order of the virtual operations is public and fixed.
// Writers of new files ask for it; a program with a dataset of DatasetManager::NewDataset may do so itself.
class KRV_DATASOURCES_API INewFileDataset
{
public:
    virtual ~INewFileDataset();

    // From now on a new file takes its name only when no other file has it: the call that gives the name throws
    // krv::IOException otherwise, leaves the other file as it is, and may be tried again. Unless this is called a new
    // file replaces one of its name. Does nothing for a file that has its name.
    virtual void KeepExisting() = 0;
    // Whether the file will give the very pixels that were written. False where they are encoded with loss: a no-data
    // value says nothing of validity then, and a mask does. Throws DataException before the image is laid out.
    virtual bool KeepsPixels() const = 0;
};

} // namespace krv::datasources

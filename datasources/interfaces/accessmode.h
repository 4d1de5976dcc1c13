#pragma once

#include "datasources/api.h"

// How a dataset is opened. At global scope, intended: plug-ins name it so.
enum AccessMode
{
    eReadOnly = 0,
    eUpdate = 1
};

namespace krv::datasources
{

// The outcome of IDataset::Delete. 0 is also what a dataset without a file of its own returns.
enum FileAccessState
{
    eDone = 0,     // it is gone
    eNotFound = 1, // there was no such file
    eDenied = 2    // the system does not allow it, and the file stays
};

// What a facet of a dataset allows, as the format and the way in which the file was opened have it.
class KRV_DATASOURCES_API AccessCapabilities
{
public:
    AccessCapabilities() = default;
    AccessCapabilities(bool bReadable, bool bWritable, bool bUpdatable);
    AccessCapabilities(const AccessCapabilities&) = default;
    AccessCapabilities& operator=(const AccessCapabilities&) = default;
    ~AccessCapabilities();

    // Takes over all three.
    void Copy(const AccessCapabilities& oOther);
    // Its contents can be read.
    bool IsReadable() const { return mbReadable; }
    bool IsWritable() const { return mbWritable; }
    bool IsUpdatable() const { return mbUpdatable; }

private:
    bool mbReadable = false;
    bool mbWritable = false;
    bool mbUpdatable = false;
};

} // namespace krv::datasources

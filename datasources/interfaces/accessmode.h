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
    eDone = 0,
    eNotFound = 1,
    eDenied = 2
};

// What a facet of a dataset allows.
class KRV_DATASOURCES_API AccessCapabilities
{
public:
    AccessCapabilities() = default;
    AccessCapabilities(bool bReadable, bool bWritable, bool bUpdatable);
    AccessCapabilities(const AccessCapabilities&) = default;
    AccessCapabilities& operator=(const AccessCapabilities&) = default;
    ~AccessCapabilities();

    void Copy(const AccessCapabilities& oOther);
    bool IsReadable() const { return mbReadable; }
    bool IsWritable() const { return mbWritable; }
    bool IsUpdatable() const { return mbUpdatable; }

private:
    bool mbReadable = false;
    bool mbWritable = false;
    bool mbUpdatable = false;
};

} // namespace krv::datasources

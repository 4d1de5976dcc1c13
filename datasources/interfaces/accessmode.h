#pragma once

#include "datasources/api.h"

// How a dataset is opened. At global scope, intended: plug-ins name it so.
// The numbers are public: plug-ins get them.
enum AccessMode
{
    eReadOnly = 0, // nothing of the file changes, not even its times
    eUpdate = 1    // pixels and what belongs to them may be changed; what changed is the file's after Synchronize
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
// A plain value. It says what may be asked for; a call may fail all the same, on a full disk.
class KRV_DATASOURCES_API AccessCapabilities
{
public:
    // Nothing is allowed.
    AccessCapabilities() = default;
    AccessCapabilities(bool bReadable, bool bWritable, bool bUpdatable);
    AccessCapabilities(const AccessCapabilities&) = default;
    AccessCapabilities& operator=(const AccessCapabilities&) = default;
    ~AccessCapabilities();

    // Takes over all three.
    void Copy(const AccessCapabilities& oOther);
    // Its contents can be read.
    bool IsReadable() const { return mbReadable; }

    // New contents can be made; with the next one, what is there can be changed.
    bool IsWritable() const { return mbWritable; }
    bool IsUpdatable() const { return mbUpdatable; }

private:
    bool mbReadable = false;
    bool mbWritable = false;
    bool mbUpdatable = false;
};

} // namespace krv::datasources

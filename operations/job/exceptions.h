#pragma once

#include "operations/api.h"
#include "toolkit/exceptions/exceptions.h"

#include <string>

namespace krv::operations
{

// What was asked for makes no sense by itself or for this file, such as a channel that it does not have.
// The message tells what to ask for instead where that is known. Nothing was changed.
class KRV_OPERATIONS_API RequestException : public krv::Exception
{
public:
    explicit RequestException(const std::string& message, const krv::Place& oPlace = krv::Place::Current());
    // field: the member of the request that is to be another one, by its name in the header, such as "coordinates".
    RequestException(const std::string& message, const std::string& field,
                     const krv::Place& oPlace = krv::Place::Current());
    ~RequestException() override;

    // By it a program tells its user where in its own window, or by which option, to ask for something else. Empty
    // where the message says all.
    const std::string& GetField() const { return moField; }

private:
    std::string moField;
};

// The caller's progress function said to stop; the message is "stopped".
// No failure: programs end quietly when they get it.
class KRV_OPERATIONS_API StoppedException : public krv::Exception
{
public:
    explicit StoppedException(const krv::Place& oPlace = krv::Place::Current());
    ~StoppedException() override;
};

// What the exception that is being handled says by itself, whatever its kind. To be called in a catch block only.
// It is what(), so that a message that is fixed and says too little comes with its description (Described).
KRV_OPERATIONS_API std::string CurrentMessage();

} // namespace krv::operations

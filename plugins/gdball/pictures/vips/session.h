#pragma once

#include "toolkit/exceptions/place.h"

#include <set>
#include <string>
#include <vector>

namespace krv::plugins::gdball
{

// Starts libvips, once in a process: without a cache of operations, without those that it says are not for untrusted
// files but the ones that read pictures. A program that uses libvips itself keeps its own settings. Throws
// DataException that names the file.
void StartVips(const std::string& fileName);

// What libvips says of one picture in this thread while an object of it lives. Its warnings become ours, each once for
// all objects over one set.
class Listener
{
public:
    // fileName: what messages name. Both outlive the object.
    Listener(const std::string& fileName, std::set<std::string>& oSaid);
    // Passes the warnings on.
    ~Listener();
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;

    // Throws FileFormatException that names the file, with what libvips gives as the cause, in an error or else in a
    // warning; these are passed on no more. what: such as "cannot be opened".
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace = Place::Current());

    void Take(const char* pText) noexcept;

private:
    const std::string& moFileName;
    std::set<std::string>& moSaid;
    std::vector<std::string> moTexts;
    Listener* mpoOuter;
};

} // namespace krv::plugins::gdball

#pragma once

#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

namespace krv::test
{

// The exception that is being handled, as "kind: message"; a number that was thrown is "foreign".
inline std::string DescribeException()
{
    try
    {
        throw;
    }
    catch (const krv::Exception& oException)
    {
        const auto* const poLibrary = dynamic_cast<const krv::LibraryException*>(&oException);
        const auto* const poSystem = dynamic_cast<const krv::OSException*>(&oException);
        const std::string kind =
            poLibrary != nullptr ? "library " + std::to_string(poLibrary->GetType()) + " " + poLibrary->GetLibraryFile()
            : poSystem != nullptr ? "system " + std::to_string(poSystem->GetError())
            : dynamic_cast<const krv::DataException*>(&oException) != nullptr        ? "data"
            : dynamic_cast<const krv::OutOfBoundsException*>(&oException) != nullptr ? "bounds"
            : dynamic_cast<const krv::IOException*>(&oException) != nullptr          ? "io"
            : dynamic_cast<const krv::FileException*>(&oException) != nullptr        ? "file"
                                                                                     : "krv";
        return kind + ": " + oException.GetMessage();
    }
    catch (const std::exception& oException)
    {
        return std::string("standard: ") + oException.what();
    }
    catch (int)
    {
        return "foreign";
    }
}

// What an operation throws, as above; empty when it succeeds.
template <class Operation>
std::string Error(const Operation& oOperation)
{
    try
    {
        oOperation();
    }
    catch (...)
    {
        return DescribeException();
    }
    return "";
}

// What an operation throws; any other exception passes.
template <class Kind, class Operation>
Kind Thrown(const Operation& oOperation)
{
    try
    {
        oOperation();
    }
    catch (const Kind& oException)
    {
        return oException;
    }
    throw std::logic_error("nothing was thrown");
}

// The place that an exception reports. function: a part of the signature.
inline void ExpectPlace(const krv::Exception& oException, const std::string& function, const std::string& sourceFile,
                        unsigned int nLine)
{
    EXPECT_NE(oException.GetFunction().find(function), std::string::npos) << oException.GetFunction();
    EXPECT_EQ(oException.GetSourceFile(), sourceFile);
    EXPECT_EQ(oException.GetLine(), nLine);
}

inline void ExpectNoPlace(const krv::Exception& oException)
{
    EXPECT_EQ(oException.GetFunction(), "");
    ExpectPlace(oException, "", "", 0);
}

} // namespace krv::test

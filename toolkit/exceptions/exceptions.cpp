#include "toolkit/exceptions/exceptions.h"

namespace krv
{

Exception::Exception(const std::string& message, const Place& oPlace)
    : moMessage(message), moFunction(oPlace.GetFunction()), moSourceFile(oPlace.GetSourceFile()),
      mnLine(oPlace.GetLine())
{
}

Exception::Exception(const Exception&) = default;
Exception& Exception::operator=(const Exception&) = default;
Exception::~Exception() = default;

const char* Exception::what() const noexcept
{
    return moMessage.c_str();
}

DataException::DataException(const std::string& message, const Place& oPlace) : Exception(message, oPlace) {}

ParameterException::ParameterException(const std::string& message, int nType, const std::string& parameter,
                                       const Place& oPlace)
    : Exception(message, oPlace), mnType(nType), moParameter(parameter)
{
}

FileException::FileException(const std::string& fileName, const std::string& message, const Place& oPlace)
    : Exception(message, oPlace), moFileName(fileName)
{
}

FileNotFoundException::FileNotFoundException(const std::string& fileName, const std::string& message,
                                             const Place& oPlace)
    : FileException(fileName, message, oPlace)
{
}

FileFormatException::FileFormatException(const std::string& fileName, const std::string& message, const Place& oPlace)
    : FileException(fileName, message, oPlace)
{
}

IOException::IOException(const std::string& fileName, const std::string& message, const Place& oPlace)
    : FileException(fileName, message, oPlace)
{
}

OSException::OSException(int nError, const std::string& message, const Place& oPlace)
    : Exception(message, oPlace), mnError(nError)
{
}

LibraryException::LibraryException(const std::string& libraryFile, int nType, const std::string& message,
                                   const Place& oPlace)
    : Exception(message, oPlace), moLibraryFile(libraryFile), mnType(nType)
{
}

OutOfBoundsException::OutOfBoundsException(const std::vector<unsigned int>& oIndices, const std::string& message,
                                           const Place& oPlace)
    : Exception(message, oPlace), moIndices(oIndices)
{
}

DataException::~DataException() = default;
ParameterException::~ParameterException() = default;
FileException::~FileException() = default;
FileNotFoundException::~FileNotFoundException() = default;
FileFormatException::~FileFormatException() = default;
IOException::~IOException() = default;
OSException::~OSException() = default;
LibraryException::~LibraryException() = default;
OutOfBoundsException::~OutOfBoundsException() = default;

} // namespace krv

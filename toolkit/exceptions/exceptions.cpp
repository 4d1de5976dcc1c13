#include "toolkit/exceptions/exceptions.h"

namespace krv
{

Exception::Exception(const std::string& message, const Place& oPlace)
    : moMessage(message), moFunction(oPlace.GetFunction()), moSourceFile(oPlace.GetSourceFile()),
      mnLine(oPlace.GetLine())
{
}

Exception::Exception(const std::string& message, const std::string& function, const std::string& sourceFile,
                     unsigned int nLine)
    : moMessage(message), moFunction(function), moSourceFile(sourceFile), mnLine(nLine)
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

DataException::DataException(const std::string& message, const std::string& function, const std::string& sourceFile,
                             unsigned int nLine)
    : Exception(message, function, sourceFile, nLine)
{
}

ParameterException::ParameterException(const std::string& message, int nType, const std::string& parameter,
                                       const std::string& function, const std::string& sourceFile, unsigned int nLine)
    : Exception(message, function, sourceFile, nLine), mnType(nType), moParameter(parameter)
{
}

FileException::FileException(const std::string& fileName, const std::string& message, const std::string& function,
                             const std::string& sourceFile, unsigned int nLine)
    : Exception(message, function, sourceFile, nLine), moFileName(fileName)
{
}

FileNotFoundException::FileNotFoundException(const std::string& fileName, const std::string& message,
                                             const std::string& function, const std::string& sourceFile,
                                             unsigned int nLine)
    : FileException(fileName, message, function, sourceFile, nLine)
{
}

FileFormatException::FileFormatException(const std::string& fileName, const std::string& message,
                                         const std::string& function, const std::string& sourceFile, unsigned int nLine)
    : FileException(fileName, message, function, sourceFile, nLine)
{
}

IOException::IOException(const std::string& fileName, const std::string& message, const std::string& function,
                         const std::string& sourceFile, unsigned int nLine)
    : FileException(fileName, message, function, sourceFile, nLine)
{
}

OSException::OSException(int nError, const std::string& message, const std::string& function,
                         const std::string& sourceFile, unsigned int nLine)
    : Exception(message, function, sourceFile, nLine), mnError(nError)
{
}

LibraryException::LibraryException(const std::string& libraryFile, int nType, const std::string& message,
                                   const std::string& function, const std::string& sourceFile, unsigned int nLine)
    : Exception(message, function, sourceFile, nLine), moLibraryFile(libraryFile), mnType(nType)
{
}

OutOfBoundsException::OutOfBoundsException(const std::vector<unsigned int>& oIndices, const std::string& message,
                                           const std::string& function, const std::string& sourceFile,
                                           unsigned int nLine)
    : Exception(message, function, sourceFile, nLine), moIndices(oIndices)
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

#include "toolkit/xml/detail/saxreader.h"

#include "toolkit/xml/detail/xmlexception.h"
#include "toolkit/xml/xmlutil.h"

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax2/XMLReaderFactory.hpp>
#include <xercesc/util/SecurityManager.hpp>
#include <xercesc/util/XMLUni.hpp>

#include <cerrno>
#include <cstring>
#include <utility>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace krv::xml::detail
{
namespace
{

class FileDescriptor
{
public:
    explicit FileDescriptor(const std::string& fileName)
        : mnFile(::open(fileName.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY))
    {
    }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;
    ~FileDescriptor()
    {
        if (mnFile >= 0)
            ::close(mnFile);
    }
    int Get() const { return mnFile; }

private:
    int mnFile;
};

[[noreturn]] void ThrowFileError(const std::string& cause, const std::string& fileName)
{
    ThrowParseError("The XML file cannot be read: " + cause, fileName);
}

std::size_t CheckedSize(int nFile, const std::string& fileName)
{
    struct stat oStatus = {};
    if (::fstat(nFile, &oStatus) != 0)
        ThrowFileError(std::strerror(errno), fileName);
    if (!S_ISREG(oStatus.st_mode))
        ThrowFileError("not a regular file", fileName);
    if (static_cast<unsigned long long>(oStatus.st_size) > MAX_DOCUMENT_BYTES)
        ThrowFileError("it is larger than " + std::to_string(MAX_DOCUMENT_BYTES) + " bytes", fileName);
    return static_cast<std::size_t>(oStatus.st_size);
}

} // namespace

void ThrowParseError(const std::string& message, const std::string& name)
{
    throw ParseException(
        xercesc::SAXParseException(XmlTranscode(message).c_str(), nullptr, XmlTranscode(name).c_str(), 0, 0));
}

void ThrowingErrorHandler::warning(const xercesc::SAXParseException&) {}

void ThrowingErrorHandler::error(const xercesc::SAXParseException& oException)
{
    throw ParseException(oException);
}

void ThrowingErrorHandler::fatalError(const xercesc::SAXParseException& oException)
{
    throw ParseException(oException);
}

void ThrowingErrorHandler::resetErrors() {}

DocumentMeter::DocumentMeter(std::string name) : moName(std::move(name)) {}

void DocumentMeter::EnterElement(const xercesc::Attributes& oAttributes)
{
    if (++mnDepth > MAX_DOCUMENT_DEPTH)
        ThrowParseError("Elements are nested more than " + std::to_string(MAX_DOCUMENT_DEPTH) + " deep", moName);
    mnNodes += 1 + oAttributes.getLength();
    if (mnNodes > MAX_DOCUMENT_NODES)
        ThrowParseError("More than " + std::to_string(MAX_DOCUMENT_NODES) + " elements and attributes", moName);
}

void DocumentMeter::LeaveElement()
{
    --mnDepth;
}

void DocumentMeter::RefuseDocumentType() const
{
    ThrowParseError("Document type declarations are not accepted", moName);
}

std::unique_ptr<xercesc::SAX2XMLReader> CreateReader(xercesc::ErrorHandler& oErrors)
{
    std::unique_ptr<xercesc::SAX2XMLReader> poReader(xercesc::XMLReaderFactory::createXMLReader());
    poReader->setFeature(xercesc::XMLUni::fgSAX2CoreNameSpaces, true);
    poReader->setFeature(xercesc::XMLUni::fgSAX2CoreNameSpacePrefixes, true);
    poReader->setFeature(xercesc::XMLUni::fgSAX2CoreValidation, false);
    poReader->setFeature(xercesc::XMLUni::fgXercesDynamic, false);
    poReader->setFeature(xercesc::XMLUni::fgXercesSchema, false);
    poReader->setFeature(xercesc::XMLUni::fgXercesLoadExternalDTD, false);
    poReader->setFeature(xercesc::XMLUni::fgXercesDisableDefaultEntityResolution, true);
    poReader->setErrorHandler(&oErrors);
    return poReader;
}

void Parse(xercesc::SAX2XMLReader& oReader, std::string_view data, const std::string& name)
{
    constexpr XMLSize_t MAX_ENTITY_EXPANSIONS = 100;
    if (data.size() > MAX_DOCUMENT_BYTES)
        ThrowParseError("The document is larger than " + std::to_string(MAX_DOCUMENT_BYTES) + " bytes", name);
    xercesc::SecurityManager oSecurity;
    oSecurity.setEntityExpansionLimit(MAX_ENTITY_EXPANSIONS);
    oReader.setProperty(xercesc::XMLUni::fgXercesSecurityManager, &oSecurity);
    const xercesc::MemBufInputSource oSource(reinterpret_cast<const XMLByte*>(data.data()), data.size(),
                                             XmlTranscode(name).c_str());
    oReader.parse(oSource);
}

std::string ReadFile(const std::string& fileName)
{
    const FileDescriptor oFile(fileName);
    if (oFile.Get() < 0)
        ThrowFileError(std::strerror(errno), fileName);
    std::string data(CheckedSize(oFile.Get(), fileName), '\0');
    std::size_t nDone = 0;
    while (nDone < data.size())
    {
        const ssize_t nRead = ::read(oFile.Get(), data.data() + nDone, data.size() - nDone);
        if (nRead < 0 && errno == EINTR)
            continue;
        if (nRead < 0)
            ThrowFileError(std::strerror(errno), fileName);
        if (nRead == 0)
            break;
        nDone += static_cast<std::size_t>(nRead);
    }
    data.resize(nDone);
    return data;
}

} // namespace krv::xml::detail

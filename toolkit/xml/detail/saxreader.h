#pragma once

#include "toolkit/xml/limits.h"

#include <xercesc/sax/ErrorHandler.hpp>
#include <xercesc/sax2/Attributes.hpp>
#include <xercesc/sax2/SAX2XMLReader.hpp>

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

namespace krv::xml::detail
{

// Throws ParseException with a message of ours.
[[noreturn]] void ThrowParseError(const std::string& message, const std::string& name);

// Turns every error of the parser into its exception, and keeps it from printing.
class ThrowingErrorHandler : public xercesc::ErrorHandler
{
public:
    void warning(const xercesc::SAXParseException& oException) override;
    void error(const xercesc::SAXParseException& oException) override;
    void fatalError(const xercesc::SAXParseException& oException) override;
    void resetErrors() override;
};

// Counts what a document holds while it is parsed and throws when it goes beyond the limits.
class DocumentMeter
{
public:
    explicit DocumentMeter(std::string name);

    void EnterElement(const xercesc::Attributes& oAttributes);
    void LeaveElement();
    [[noreturn]] void RefuseDocumentType() const;

private:
    std::string moName;
    std::size_t mnDepth = 0;
    std::size_t mnNodes = 0;
};

// A namespace-aware reader without validation, schemas, external entities or DTD loading.
std::unique_ptr<xercesc::SAX2XMLReader> CreateReader(xercesc::ErrorHandler& oErrors);

// Parses the bytes with a reader whose handlers are set.
void Parse(xercesc::SAX2XMLReader& oReader, std::string_view data, const std::string& name);

// The bytes of a regular file within the limit. Never blocks on a pipe or device.
std::string ReadFile(const std::string& fileName);

} // namespace krv::xml::detail

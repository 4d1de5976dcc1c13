#pragma once

#include "toolkit/api.h"

#include <xalanc/Include/PlatformDefinitions.hpp>

#include <cstddef>
#include <memory>
#include <string>

namespace XALAN_CPP_NAMESPACE
{
class DOMSupport;
class XalanDocument;
} // namespace XALAN_CPP_NAMESPACE

namespace krv::xml
{

// A parsed document and what it needs to stay alive; it keeps XML support started. Movable, not copyable.
// XPaths are evaluated over it with xalanc::XPathEvaluator:
//     xalanc::XPathEvaluator oEvaluator;
//     XalanNode* poNode = oEvaluator.selectSingleNode(oDocument.GetSupport(), oDocument.Get(), xpath.c_str());
// Nodes belong to the document; comments are left out. One thread at a time.
class KRV_TOOLKIT_API Document
{
public:
    Document(Document&& oOther) noexcept;
    Document& operator=(Document&& oOther) noexcept;
    ~Document();

    // Null only after the document was moved from.
    xalanc::XalanDocument* Get() const;

    // What the evaluator of XPaths asks for; it belongs to the document.
    xalanc::DOMSupport& GetSupport() const;

private:
    struct Parts;
    explicit Document(std::unique_ptr<Parts> poParts);
    friend Document ParseMemory(const void* poData, std::size_t nBytes, const std::string& name);

    std::unique_ptr<Parts> mpoParts;
};

// Parse a file (its name in the bytes of the file system) or bytes in memory; name stands in the messages.
// Whatever is wrong (no such file, not a regular file, not readable, malformed, beyond the limits of limits.h, holding
// a document type declaration) is thrown as a class below xercesc::SAXParseException and std::exception. Nothing
// outside the document is ever read, and nothing is printed.
// Example: const Document oDocument = ParseFile("format.xml");
KRV_TOOLKIT_API Document ParseFile(const std::string& fileName);

// poData: nBytes bytes, borrowed for the call.
KRV_TOOLKIT_API Document ParseMemory(const void* poData, std::size_t nBytes, const std::string& name);

} // namespace krv::xml

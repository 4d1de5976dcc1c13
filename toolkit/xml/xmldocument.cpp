#include "toolkit/xml/xmldocument.h"

#include "toolkit/xml/detail/saxreader.h"
#include "toolkit/xml/xmlutil.h"

#include <xalanc/XalanSourceTree/XalanSourceTreeContentHandler.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeDOMSupport.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeDocument.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeParserLiaison.hpp>

#include <string_view>
#include <utility>

namespace krv::xml
{

// In the order in which they need each other.
struct Document::Parts
{
    Parts() : moLiaison(moSupport) { moSupport.setParserLiaison(&moLiaison); }

    XmlSession moSession;
    xalanc::XalanSourceTreeDOMSupport moSupport;
    xalanc::XalanSourceTreeParserLiaison moLiaison;
    xalanc::XalanSourceTreeDocument* mpoDocument = nullptr; // owned by the liaison
};

namespace
{

class TreeBuilder : public xalanc::XalanSourceTreeContentHandler
{
public:
    TreeBuilder(xalanc::XalanSourceTreeDocument* poDocument, std::string name)
        : XalanSourceTreeContentHandler(*xercesc::XMLPlatformUtils::fgMemoryManager, poDocument),
          moMeter(std::move(name))
    {
    }

    void startElement(const XMLCh* const poUri, const XMLCh* const poLocalName, const XMLCh* const poName,
                      const xercesc::Attributes& oAttributes) override
    {
        moMeter.EnterElement(oAttributes);
        XalanSourceTreeContentHandler::startElement(poUri, poLocalName, poName, oAttributes);
    }

    void endElement(const XMLCh* const poUri, const XMLCh* const poLocalName, const XMLCh* const poName) override
    {
        moMeter.LeaveElement();
        XalanSourceTreeContentHandler::endElement(poUri, poLocalName, poName);
    }

    void comment(const XMLCh* const, const XMLSize_t) override {}

    void startDTD(const XMLCh* const, const XMLCh* const, const XMLCh* const) override { moMeter.RefuseDocumentType(); }

private:
    detail::DocumentMeter moMeter;
};

} // namespace

Document::Document(std::unique_ptr<Parts> poParts) : mpoParts(std::move(poParts)) {}

Document::Document(Document&& oOther) noexcept = default;
Document& Document::operator=(Document&& oOther) noexcept = default;
Document::~Document() = default;

xalanc::XalanDocument* Document::Get() const
{
    return mpoParts ? mpoParts->mpoDocument : nullptr;
}

xalanc::DOMSupport& Document::GetSupport() const
{
    return mpoParts->moSupport;
}

Document ParseFile(const std::string& fileName)
{
    const XmlSession oSession;
    const std::string data = detail::ReadFile(fileName);
    return ParseMemory(data.data(), data.size(), fileName);
}

Document ParseMemory(const void* poData, std::size_t nBytes, const std::string& name)
{
    auto poParts = std::make_unique<Document::Parts>();
    poParts->mpoDocument = poParts->moLiaison.createXalanSourceTreeDocument();
    TreeBuilder oBuilder(poParts->mpoDocument, name);
    detail::ThrowingErrorHandler oErrors;
    const auto poReader = detail::CreateReader(oErrors);
    poReader->setContentHandler(&oBuilder);
    poReader->setLexicalHandler(&oBuilder);
    detail::Parse(*poReader, std::string_view(static_cast<const char*>(poData), nBytes), name);
    return Document(std::move(poParts));
}

} // namespace krv::xml

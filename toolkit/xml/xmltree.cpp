#include "toolkit/xml/xmltree.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/detail/saxreader.h"
#include "toolkit/xml/xmlerror.h"
#include "toolkit/xml/xmlutil.h"

#include <xercesc/sax2/DefaultHandler.hpp>

#include <algorithm>

namespace krv::xml
{
namespace
{

class TreeCollector : public xercesc::DefaultHandler
{
public:
    explicit TreeCollector(const std::string& name) : moMeter(name) {}

    void startElement(const XMLCh* const, const XMLCh* const, const XMLCh* const poName,
                      const xercesc::Attributes& oAttributes) override
    {
        moMeter.EnterElement(oAttributes);
        Element& oElement = moOpen.emplace_back().element;
        oElement.name = XmlTranscode(poName);
        oElement.attributes.reserve(oAttributes.getLength());
        for (XMLSize_t nAt = 0; nAt < oAttributes.getLength(); ++nAt)
            oElement.attributes.emplace_back(XmlTranscode(oAttributes.getQName(nAt)),
                                             XmlTranscode(oAttributes.getValue(nAt)));
    }

    void endElement(const XMLCh* const, const XMLCh* const, const XMLCh* const) override
    {
        moMeter.LeaveElement();
        Element oElement = std::move(moOpen.back().element);
        oElement.text = XmlTranscode(moOpen.back().text.data(), moOpen.back().text.size());
        moOpen.pop_back();
        if (moOpen.empty())
            moRoot = std::move(oElement);
        else
            moOpen.back().element.children.push_back(std::move(oElement));
    }

    void characters(const XMLCh* const poText, const XMLSize_t nLength) override
    {
        moOpen.back().text.append(poText, nLength);
    }

    void startDTD(const XMLCh* const, const XMLCh* const, const XMLCh* const) override { moMeter.RefuseDocumentType(); }

    Element TakeRoot() { return std::move(moRoot); }

private:
    detail::DocumentMeter moMeter;
    // The text stays in the parser's units until the end, since one character may come in two calls.
    struct OpenElement
    {
        Element element;
        std::basic_string<XMLCh> text;
    };

    std::vector<OpenElement> moOpen; // from the root to the innermost open element
    Element moRoot;
};

Element Collect(std::string_view data, const std::string& name)
{
    TreeCollector oCollector(name);
    detail::ThrowingErrorHandler oErrors;
    const auto poReader = detail::CreateReader(oErrors);
    poReader->setContentHandler(&oCollector);
    poReader->setLexicalHandler(&oCollector);
    detail::Parse(*poReader, data, name);
    return oCollector.TakeRoot();
}

std::string_view WithoutTerminator(std::string_view data)
{
    while (!data.empty() && data.back() == '\0')
        data.remove_suffix(1);
    return data;
}

} // namespace

Element::Element() = default;
Element::Element(const Element&) = default;
Element::Element(Element&&) noexcept = default;
Element& Element::operator=(const Element&) = default;
Element& Element::operator=(Element&&) noexcept = default;
Element::~Element() = default;

const std::string* Element::FindAttribute(std::string_view attribute) const
{
    const auto oFound = std::find_if(attributes.begin(), attributes.end(),
                                     [attribute](const auto& oPair) { return oPair.first == attribute; });
    return oFound == attributes.end() ? nullptr : &oFound->second;
}

const Element* Element::FindChild(std::string_view child) const
{
    const auto oFound = std::find_if(children.begin(), children.end(),
                                     [child](const Element& oElement) { return oElement.name == child; });
    return oFound == children.end() ? nullptr : &*oFound;
}

Element ParseTree(const char* poData, std::size_t nBytes, const std::string& name)
{
    const XmlSession oSession;
    try
    {
        return Collect(WithoutTerminator(std::string_view(poData, nBytes)), name);
    }
    catch (...)
    {
        throw DataException(DescribeCurrentException());
    }
}

} // namespace krv::xml

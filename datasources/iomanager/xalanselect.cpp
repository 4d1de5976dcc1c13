#include "datasources/iomanager/xalanselect.h"

#include "toolkit/xml/xmlutil.h"

#include <xalanc/DOMSupport/DOMServices.hpp>
#include <xalanc/XPath/ElementPrefixResolverProxy.hpp>
#include <xalanc/XPath/NodeRefList.hpp>
#include <xalanc/XPath/XPath.hpp>
#include <xalanc/XPath/XPathConstructionContextDefault.hpp>
#include <xalanc/XPath/XPathEvaluator.hpp>
#include <xalanc/XPath/XPathParserException.hpp>
#include <xalanc/XPath/XPathProcessorImpl.hpp>
#include <xalanc/XalanDOM/XalanDOMString.hpp>
#include <xalanc/XalanDOM/XalanDocument.hpp>
#include <xalanc/XalanDOM/XalanNode.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeDOMSupport.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLChar.hpp>

namespace krv::datasources
{

namespace
{

xercesc::MemoryManager& GetMemory()
{
    return *xercesc::XMLPlatformUtils::fgMemoryManager;
}

// The library's own context prints what is wrong with an expression before it throws.
class QuietContext : public xalanc::XPathConstructionContextDefault
{
public:
    void problem(eSource, eClassification eKind, const xalanc::XalanDOMString& text, const xalanc::Locator*,
                 const xalanc::XalanNode*) override
    {
        if (eKind == eError)
            throw xalanc::XPathParserException(text, GetMemory());
    }

    void problem(eSource eFrom, eClassification eKind, const xalanc::XalanDOMString& text,
                 const xalanc::XalanNode* poNode) override
    {
        problem(eFrom, eKind, text, nullptr, poNode);
    }
};

// A parsed expression and what it refers to.
struct Expression
{
    explicit Expression(const std::string& xpath) : moXPath(GetMemory())
    {
        const xalanc::ElementPrefixResolverProxy oNoPrefixes(nullptr, GetMemory());
        const auto text = XmlTranscode(xpath);
        xalanc::XPathProcessorImpl().initXPath(moXPath, moContext, xalanc::XalanDOMString(text.c_str()), oNoPrefixes);
    }

    QuietContext moContext;
    xalanc::XPath moXPath;
};

} // namespace

xalanc::XalanNode* SelectSingleNode(const std::string& xpath, xalanc::XalanDocument* poDocument)
{
    xalanc::XalanSourceTreeDOMSupport oSupport;
    return xalanc::XPathEvaluator().selectSingleNode(oSupport, poDocument, Expression(xpath).moXPath);
}

std::string SelectNodeValue(const std::string& xpath, xalanc::XalanDocument* poDocument)
{
    const xalanc::XalanNode* const poNode = SelectSingleNode(xpath, poDocument);
    const xalanc::XalanNode* const poChild = poNode != nullptr ? poNode->getFirstChild() : nullptr;
    return poChild != nullptr ? TrimXalanWhitespace(poChild->getNodeValue()) : std::string();
}

std::vector<xalanc::XalanNode*> SelectMultipleNode(const std::string& xpath, xalanc::XalanDocument* poDocument)
{
    xalanc::XalanSourceTreeDOMSupport oSupport;
    xalanc::NodeRefList oFound;
    xalanc::XPathEvaluator().selectNodeList(oFound, oSupport, poDocument, Expression(xpath).moXPath);

    std::vector<xalanc::XalanNode*> oNodes;
    oNodes.reserve(oFound.getLength());
    for (xalanc::NodeRefList::size_type nIndex = 0; nIndex < oFound.getLength(); ++nIndex)
        oNodes.push_back(oFound.item(nIndex));
    return oNodes;
}

std::string GetNodeText(const xalanc::XalanNode& oNode)
{
    xalanc::XalanDOMString text;
    xalanc::DOMServices::getNodeData(oNode, text);
    return TrimXalanWhitespace(text);
}

std::string TrimXalanWhitespace(const xalanc::XalanDOMString& oText)
{
    using xercesc::XMLChar1_0;
    const XMLCh* pBegin = oText.c_str();
    const XMLCh* pEnd = pBegin + oText.size();
    while (pBegin != pEnd && XMLChar1_0::isWhitespace(*pBegin))
        ++pBegin;
    while (pBegin != pEnd && XMLChar1_0::isWhitespace(*(pEnd - 1)))
        --pEnd;
    return XmlTranscode(pBegin, static_cast<std::size_t>(pEnd - pBegin));
}

} // namespace krv::datasources

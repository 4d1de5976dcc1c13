#include "datasources/iomanager/xalanselect.h"

#include "toolkit/xml/xmlutil.h"

#include <xalanc/DOMSupport/DOMServices.hpp>
#include <xalanc/XPath/NodeRefList.hpp>
#include <xalanc/XPath/XPathEvaluator.hpp>
#include <xalanc/XalanDOM/XalanDOMString.hpp>
#include <xalanc/XalanDOM/XalanDocument.hpp>
#include <xalanc/XalanDOM/XalanNode.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeDOMSupport.hpp>
#include <xercesc/util/XMLChar.hpp>

namespace krv::datasources
{

std::string SelectNodeValue(const std::string& xpath, xalanc::XalanDocument* poDocument)
{
    xalanc::XalanSourceTreeDOMSupport oSupport;
    xalanc::XPathEvaluator oEvaluator;
    xalanc::XalanNode* const poNode = oEvaluator.selectSingleNode(oSupport, poDocument, XmlTranscode(xpath).c_str());
    const xalanc::XalanNode* const poChild = poNode != nullptr ? poNode->getFirstChild() : nullptr;
    return poChild != nullptr ? TrimXalanWhitespace(poChild->getNodeValue()) : std::string();
}

std::vector<xalanc::XalanNode*> SelectMultipleNode(const std::string& xpath, xalanc::XalanDocument* poDocument)
{
    xalanc::XalanSourceTreeDOMSupport oSupport;
    xalanc::XPathEvaluator oEvaluator;
    xalanc::NodeRefList oFound;
    oEvaluator.selectNodeList(oFound, oSupport, poDocument, XmlTranscode(xpath).c_str());

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

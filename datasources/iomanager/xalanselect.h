#pragma once

#include "datasources/api.h"

#include <xalanc/Include/PlatformDefinitions.hpp>

#include <string>
#include <vector>

namespace XALAN_CPP_NAMESPACE
{
class XalanDocument;
class XalanDOMString;
class XalanNode;
} // namespace XALAN_CPP_NAMESPACE

namespace krv::datasources
{

// Queries by XPath over a parsed document. Failures of the evaluation are the XML library's own exceptions; nothing is
// printed.

// The first selected node, null when none matches; it belongs to the document.
// XML support is started (XmlSession) and the document lives while its nodes are used. One thread at a time.
KRV_DATASOURCES_API xalanc::XalanNode* SelectSingleNode(const std::string& xpath, xalanc::XalanDocument* poDocument);

// The text of the first child of the first selected node, without surrounding white space; empty when no node matches.
KRV_DATASOURCES_API std::string SelectNodeValue(const std::string& xpath, xalanc::XalanDocument* poDocument);

// All selected nodes in document order; they belong to the document.
KRV_DATASOURCES_API std::vector<xalanc::XalanNode*> SelectMultipleNode(const std::string& xpath,
                                                                       xalanc::XalanDocument* poDocument);

// The whole text of a node, comments left out, without surrounding white space; an attribute's value.
KRV_DATASOURCES_API std::string GetNodeText(const xalanc::XalanNode& oNode);

// The text without leading and trailing XML white space, as UTF-8.
KRV_DATASOURCES_API std::string TrimXalanWhitespace(const xalanc::XalanDOMString& oText);

} // namespace krv::datasources

// Part of libkrvxml: what libkrvdatasources calls in it.
#include "datasources/iomanager/detail/xmlsupport.h"
#include "datasources/iomanager/xalanselect.h"
#include "toolkit/xml/xmldocument.h"
#include "toolkit/xml/xmlerror.h"
#include "toolkit/xml/xmlutil.h"

#include <xalanc/PlatformSupport/XSLException.hpp>
#include <xalanc/XalanDOM/XalanNode.hpp>

#include <exception>

namespace krv::datasources::detail
{

namespace
{

constexpr char UNKNOWN_ERROR[] = "An unknown error occur during the XPath evaluation"; // the wording is intended

bool SelectText(const std::string& path, const std::string& xpath, std::string& text, std::string& problem)
{
    try
    {
        const krv::xml::Document oDocument = krv::xml::ParseFile(path);
        const xalanc::XalanNode* const poNode = SelectSingleNode(xpath, oDocument.Get());
        if (poNode != nullptr)
            text = GetNodeText(*poNode);
        return poNode != nullptr;
    }
    catch (const xalanc::XSLException& oException)
    {
        problem = XmlTranscode(oException.getMessage().c_str());
    }
    catch (const krv::xml::ParseError&)
    {
        // The XML parser's own exception has no words here, intended, whatever else it is.
        problem = UNKNOWN_ERROR;
    }
    catch (const std::exception& oException)
    {
        problem = oException.what();
    }
    catch (...)
    {
        problem = UNKNOWN_ERROR;
    }
    return false;
}

void CheckFile(const std::string& path)
{
    static_cast<void>(krv::xml::ParseFile(path));
}

} // namespace

extern "C" KRV_DATASOURCES_API const XmlSupport* krvXmlSupport()
{
    static constexpr XmlSupport SUPPORT = {&KRV_XMLUtil::Initialize, &KRV_XMLUtil::Terminate, &CheckFile, &SelectText};
    return &SUPPORT;
}

} // namespace krv::datasources::detail

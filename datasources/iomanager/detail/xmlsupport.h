#pragma once

#include <string>

namespace krv::datasources::detail
{

// What the framework wants of Xerces and Xalan. These and what they need take longer to load than all else of a small
// program's run, and a whole installation is read without them: what uses them is in libkrvxml, which is loaded when
// an XPath is more than a way of names, or a document is wrong and the parser's own exception has to say so.
struct XmlSupport
{
    // As those of KRV_XMLUtil.
    void (*mpInitialize)();
    void (*mpTerminate)();

    // Parses the file and throws as krv::xml::ParseFile.
    void (*mpCheckFile)(const std::string& path);

    // Whether the XPath finds a node in the file, and its text. Never throws but for memory: `problem` says what
    // failed.
    bool (*mpSelectText)(const std::string& path, const std::string& xpath, std::string& text, std::string& problem);
};

// The name under which libkrvxml hands it out: a function without arguments, of C linkage.
constexpr char XML_SUPPORT_SYMBOL[] = "krvXmlSupport";

// Loads libkrvxml, which lies beside libkrvdatasources; it stays loaded. Throws krv::LibraryException. Any thread.
const XmlSupport& LoadXmlSupport();

// Whether the program has Xerces itself, so that it sees whether XML support was started.
bool HasXerces();

} // namespace krv::datasources::detail

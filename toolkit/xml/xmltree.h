#pragma once

#include "toolkit/api.h"

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace krv::xml
{

// One element of a small document, for those who need no XPath. All texts are UTF-8. Names keep their prefixes, the
// declarations of which are attributes; comments and processing instructions are left out. A plain value.
// Example: for (const Element& oBand : ParseTree(text.data(), text.size()).children) ...
struct KRV_TOOLKIT_API Element
{
    std::string name; // with its prefix, such as "gml:pos"
    std::vector<std::pair<std::string, std::string>>
        attributes;   // in the order of the text, declarations of prefixes first
    std::string text; // all text directly inside, white space kept
    std::vector<Element> children;

    Element();
    Element(const Element&);
    Element(Element&&) noexcept;
    Element& operator=(const Element&);
    Element& operator=(Element&&) noexcept;
    ~Element();

    // The value of the attribute; null when it is absent. Valid until the element changes.
    // Names are compared byte by byte, prefixes included. The first counts where one stands twice.
    const std::string* FindAttribute(std::string_view attribute) const;

    // The first child of that name; null when there is none. Valid until the element changes.
    const Element* FindChild(std::string_view child) const;
};

// Parses a document from bytes that nobody vouches for and returns its root element. Zero bytes at the end are ignored,
// since texts in files are often stored with their terminator. XML support (xmlutil.h) is not needed. name stands in
// the messages. Throws krv::DataException naming the cause for anything malformed, any text that is not valid in its
// encoding (UTF-8 unless UTF-16 or one with a byte for each character is declared), document type declarations and
// anything beyond limits.h; std::bad_alloc; no exception of another kind, no output.
// Any thread. Takes time and memory linear in the document's size.
KRV_TOOLKIT_API Element ParseTree(const char* poData, std::size_t nBytes, const std::string& name = "XML text");

} // namespace krv::xml

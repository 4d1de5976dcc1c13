#pragma once

#include "toolkit/api.h"
#include "toolkit/xml/xmltree.h"

#include <string>
#include <string_view>

namespace krv::xml
{

// Whether XML can hold a text: UTF-8 of the characters that it allows.
// False for control characters but tab, line feed and carriage return, and for bytes that are no UTF-8.
KRV_TOOLKIT_API bool IsXmlText(std::string_view text);

// The text as far as XML can hold it, for programs that know nothing of its bytes: what is no UTF-8 is taken for
// Latin-1, what no document holds becomes a question mark.
KRV_TOOLKIT_API std::string MakeXmlText(std::string_view text);

// An element as a document without a declaration, its texts as they are: they are to be ones that XML can hold. The
// text of an element stands before its children.
// UTF-8. Characters with a meaning in XML are escaped, so that ParseTree reads the same texts.
KRV_TOOLKIT_API std::string WriteTree(const Element& oRoot);

} // namespace krv::xml

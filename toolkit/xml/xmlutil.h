#pragma once

#include "toolkit/api.h"

#include <xercesc/util/XercesDefs.hpp>

#include <cstddef>
#include <string>
#include <string_view>

// Start and end of XML support (Xerces and Xalan) in the process. It is in libkrvxml, the library that programs link
// that use those two, and which the library itself loads when it first needs them: they take longer to load than all
// else. Calls are counted and may come from any thread: the first Initialize starts it (about 2.4 ms), the Terminate
// that answers it ends it, and it can be started anew afterwards. An exception of the XML library survives the end;
// what it says can be read with XmlTranscode even then.
class KRV_TOOLKIT_API KRV_XMLUtil
{
public:
    // Programs mostly take an XmlSession instead.
    static void Initialize();

    // One call for each Initialize; a call too many does nothing.
    static void Terminate();

    KRV_XMLUtil() = delete;
};

// Text between UTF-8 and the XML library's UTF-16, whatever the locale. What is not valid in the source comes out as
// the replacement character U+FFFD. Needs no started XML support, and no libkrvxml.
KRV_TOOLKIT_API std::basic_string<XMLCh> XmlTranscode(std::string_view text);
KRV_TOOLKIT_API std::string XmlTranscode(const XMLCh* poText); // up to the terminating zero; null gives ""
KRV_TOOLKIT_API std::string XmlTranscode(const XMLCh* poText, std::size_t nLength);

namespace krv::xml
{

// Keeps XML support started while it lives.
// Such objects may be nested and may live in several threads: each is one Initialize and one Terminate.
// Throws what Initialize throws.
class KRV_TOOLKIT_API XmlSession
{
public:
    XmlSession();
    XmlSession(const XmlSession&) = delete;
    XmlSession& operator=(const XmlSession&) = delete;
    ~XmlSession();
};

} // namespace krv::xml

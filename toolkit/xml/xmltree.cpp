#include "toolkit/xml/xmltree.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/limits.h"

#include <expat.h>
#include <iconv.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

namespace krv::xml
{
namespace
{

// Stands between the parts of a name that the parser gives, URI, local name and prefix. No name may hold it, and no
// text of a document either.
constexpr char NAME_SEPARATOR = '\f';

struct ParserFree
{
    void operator()(XML_Parser oParser) const { XML_ParserFree(oParser); }
};

using ParserOwner = std::unique_ptr<std::remove_pointer_t<XML_Parser>, ParserFree>;

// A name as it stands in the text, with its prefix.
std::string WrittenName(const char* pName)
{
    const char* const pLocal = std::strchr(pName, NAME_SEPARATOR);
    if (pLocal == nullptr)
        return pName;
    const char* const pPrefix = std::strchr(pLocal + 1, NAME_SEPARATOR);
    return pPrefix == nullptr ? pLocal + 1 : std::string(pPrefix + 1) + ":" + std::string(pLocal + 1, pPrefix);
}

// What a byte means in an encoding that the parser does not know itself: those of one byte to a character, as the
// system has them. -1: nothing.
int FillEncoding(void*, const char* pName, XML_Encoding* poEncoding)
{
    constexpr char NAMES[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_.:";
    if (pName[std::strspn(pName, NAMES)] != '\0')
        return XML_STATUS_ERROR;
    const iconv_t oConversion = iconv_open("UTF-32LE", pName);
    // NOLINTNEXTLINE(performance-no-int-to-ptr): iconv's own word for a failure
    if (oConversion == reinterpret_cast<iconv_t>(-1))
        return XML_STATUS_ERROR;
    for (int nByte = 0; nByte < 256; ++nByte)
    {
        char cIn = static_cast<char>(nByte);
        char* pIn = &cIn;
        std::size_t nIn = 1;
        std::int32_t nCode = -1;
        char* pOut = reinterpret_cast<char*>(&nCode);
        std::size_t nOut = sizeof nCode;
        const bool bKnown = iconv(oConversion, &pIn, &nIn, &pOut, &nOut) != static_cast<std::size_t>(-1) && nOut == 0;
        poEncoding->map[nByte] = bKnown ? nCode : -1;
        iconv(oConversion, nullptr, nullptr, nullptr, nullptr);
    }
    iconv_close(oConversion);
    poEncoding->convert = nullptr;
    poEncoding->release = nullptr;
    return XML_STATUS_OK;
}

// Builds the tree while the parser runs. The parser is C code: what is wrong is kept and told afterwards.
class TreeCollector
{
public:
    explicit TreeCollector(const std::string& name)
        : moName(name), mpoParser(XML_ParserCreateNS(nullptr, NAME_SEPARATOR))
    {
        if (mpoParser == nullptr)
            throw std::bad_alloc();
        XML_SetReturnNSTriplet(mpoParser.get(), 1);
        XML_SetUserData(mpoParser.get(), this);
        XML_SetStartNamespaceDeclHandler(mpoParser.get(), &OnNamespace);
        XML_SetElementHandler(mpoParser.get(), &OnStart, &OnEnd);
        XML_SetCharacterDataHandler(mpoParser.get(), &OnText);
        XML_SetStartDoctypeDeclHandler(mpoParser.get(), &OnDocumentType);
        XML_SetUnknownEncodingHandler(mpoParser.get(), &FillEncoding, nullptr);
    }

    Element Collect(std::string_view data)
    {
        if (data.size() > MAX_DOCUMENT_BYTES)
            Fail("The document is larger than " + std::to_string(MAX_DOCUMENT_BYTES) + " bytes");
        const bool bParsed = XML_Parse(mpoParser.get(), data.data(), static_cast<int>(data.size()), 1) == XML_STATUS_OK;
        if (!moRefusal.empty())
            Fail(moRefusal);
        const XML_Error eError = XML_GetErrorCode(mpoParser.get());
        if (eError == XML_ERROR_NO_MEMORY)
            throw std::bad_alloc();
        if (!bParsed)
            throw DataException(moName + ":" + std::to_string(XML_GetCurrentLineNumber(mpoParser.get())) + ":" +
                                std::to_string(XML_GetCurrentColumnNumber(mpoParser.get()) + 1) + ": " +
                                XML_ErrorString(eError));
        return std::move(moRoot);
    }

private:
    [[noreturn]] void Fail(const std::string& cause) const { throw DataException(moName + ": " + cause); }

    void Refuse(std::string cause)
    {
        if (moRefusal.empty())
            moRefusal = std::move(cause);
        XML_StopParser(mpoParser.get(), XML_FALSE);
    }

    // Memory that runs out must not unwind the parser.
    template <typename Step>
    static void Guard(void* poSelf, Step oStep) noexcept
    {
        auto& oSelf = *static_cast<TreeCollector*>(poSelf);
        if (!oSelf.moRefusal.empty())
            return;
        try
        {
            oStep(oSelf);
        }
        catch (const std::bad_alloc&)
        {
            oSelf.Refuse("Out of memory");
        }
    }

    static void OnNamespace(void* poSelf, const char* pPrefix, const char* pUri)
    {
        Guard(poSelf,
              [=](TreeCollector& oSelf)
              {
                  oSelf.moDeclared.emplace_back(pPrefix != nullptr ? std::string("xmlns:") + pPrefix : "xmlns",
                                                pUri != nullptr ? pUri : "");
              });
    }

    static void OnStart(void* poSelf, const char* pName, const char** ppAttributes)
    {
        Guard(poSelf, [=](TreeCollector& oSelf) { oSelf.Enter(pName, ppAttributes); });
    }

    static void OnEnd(void* poSelf, const char*)
    {
        Guard(poSelf, [](TreeCollector& oSelf) { oSelf.Leave(); });
    }

    static void OnText(void* poSelf, const char* pText, int nBytes)
    {
        Guard(poSelf,
              [=](TreeCollector& oSelf) { oSelf.moOpen.back().text.append(pText, static_cast<std::size_t>(nBytes)); });
    }

    static void OnDocumentType(void* poSelf, const char*, const char*, const char*, int)
    {
        Guard(poSelf, [](TreeCollector& oSelf) { oSelf.Refuse("Document type declarations are not accepted"); });
    }

    void Enter(const char* pName, const char** ppAttributes)
    {
        if (moOpen.size() == MAX_DOCUMENT_DEPTH)
            return Refuse("Elements are nested more than " + std::to_string(MAX_DOCUMENT_DEPTH) + " deep");
        Element& oElement = moOpen.emplace_back();
        oElement.name = WrittenName(pName);
        oElement.attributes = std::move(moDeclared);
        moDeclared.clear();
        for (; *ppAttributes != nullptr; ppAttributes += 2)
            oElement.attributes.emplace_back(WrittenName(ppAttributes[0]), ppAttributes[1]);
        mnNodes += 1 + oElement.attributes.size();
        if (mnNodes > MAX_DOCUMENT_NODES)
            Refuse("More than " + std::to_string(MAX_DOCUMENT_NODES) + " elements and attributes");
    }

    void Leave()
    {
        Element oElement = std::move(moOpen.back());
        moOpen.pop_back();
        if (moOpen.empty())
            moRoot = std::move(oElement);
        else
            moOpen.back().children.push_back(std::move(oElement));
    }

    std::string moName;
    ParserOwner mpoParser;
    std::string moRefusal;                                       // why it was stopped
    std::vector<std::pair<std::string, std::string>> moDeclared; // namespaces of the element that begins
    std::vector<Element> moOpen;                                 // from the root to the innermost open element
    Element moRoot;
    std::size_t mnNodes = 0;
};

// Whether characters take two bytes, the upper one of most behind the lower.
bool IsWide(std::string_view data)
{
    return data.starts_with("\xFF\xFE") || data.starts_with(std::string_view("<\0", 2));
}

std::string_view WithoutTerminator(std::string_view data)
{
    const std::string_view end("\0\0", IsWide(data) ? 2 : 1);
    while (data.ends_with(end) && (end.size() == 1 || data.size() % 2 == 0))
        data.remove_suffix(end.size());
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
    return TreeCollector(name).Collect(WithoutTerminator(std::string_view(poData, nBytes)));
}

} // namespace krv::xml

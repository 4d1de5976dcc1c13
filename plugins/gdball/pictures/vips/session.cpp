#include "plugins/gdball/pictures/vips/session.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <cstring>
#include <memory>

#include <vips/vips.h>

namespace krv::plugins::gdball
{

namespace
{

thread_local Listener* spoListener = nullptr;

// Of what is no fault of a file: the colours of a picture are taken as they are stored, whatever profile it names.
bool IsHarmless(const gchar* pText)
{
    return std::strstr(pText, "ignoring nclx profile") != nullptr;
}

void OnLog(const gchar*, GLogLevelFlags, const gchar* pText, gpointer)
{
    if (spoListener != nullptr && !IsHarmless(pText))
        spoListener->Take(pText);
}

// Lines become one.
std::string OneLine(std::string text)
{
    while (!text.empty() && (text.back() == '\n' || text.back() == ' '))
        text.pop_back();
    for (std::size_t nAt = text.find('\n'); nAt != std::string::npos; nAt = text.find('\n', nAt))
        text.replace(nAt, 1, "; ");
    return text;
}

std::string TakeErrors()
{
    const std::unique_ptr<char, void (*)(void*)> poText(vips_error_buffer_copy(), g_free);
    return OneLine(poText ? poText.get() : "");
}

// Empty, or why not.
std::string Start()
{
    const bool bOthers = g_type_from_name("VipsObject") != 0;
    if (vips_init("krv") != 0)
        return "vips_init failed: " + TakeErrors();
    if (bOthers)
        return {};
    vips_cache_set_max(0);
    vips_block_untrusted_set(TRUE);
    for (const char* pLoader :
         {"VipsForeignLoadPpm", "VipsForeignLoadFits", "VipsForeignLoadOpenexr", "VipsForeignLoadRad"})
        vips_operation_block_set(pLoader, FALSE);
    g_log_set_handler("VIPS", static_cast<GLogLevelFlags>(G_LOG_LEVEL_WARNING | G_LOG_LEVEL_MESSAGE), &OnLog, nullptr);
    return {};
}

} // namespace

void StartVips(const std::string& fileName)
{
    static const std::string soTrouble = Start();
    if (!soTrouble.empty())
        throw DataException(fileName + ": libvips, which reads pictures, cannot be started: " + soTrouble);
}

Listener::Listener(const std::string& fileName, std::set<std::string>& oSaid)
    : moFileName(fileName), moSaid(oSaid), mpoOuter(spoListener)
{
    spoListener = this;
    vips_error_clear();
}

Listener::~Listener()
{
    spoListener = mpoOuter;
    try
    {
        for (const std::string& text : moTexts)
            if (moSaid.insert(text).second)
                krv::nspio::Warning::Warn(moFileName + ": " + text);
    }
    catch (...)
    {
        // A sink that throws has been told.
    }
}

void Listener::Take(const char* pText) noexcept
{
    try
    {
        moTexts.push_back(OneLine(pText));
    }
    catch (...)
    {
        // A warning less.
    }
}

void Listener::Fail(const std::string& what, const Place& oPlace)
{
    std::string cause = TakeErrors();
    if (cause.empty() && !moTexts.empty())
        cause = moTexts.back();
    moTexts.clear();
    throw FileFormatException(
        moFileName, moFileName + ": " + what + ": " + (cause.empty() ? "libvips does not say why" : cause), oPlace);
}

} // namespace krv::plugins::gdball

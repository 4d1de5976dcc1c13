#include "tools/krv/errors.h"

#include "datasources/formatregistrar/winformatregistrar.h"
#include "operations/diagnosis/diagnosis.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmlerror.h"

#include <fmt/format.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <new>
#include <string_view>
#include <system_error>

namespace krv::tool
{

namespace
{

constexpr std::size_t LONGEST_LINE = 1200;

bool IsContinuation(char c)
{
    return (static_cast<unsigned char>(c) & 0xC0U) == 0x80U;
}

// How many bytes the first character of a text takes that a terminal can show and that leaves the terminal as it is; 0
// for controls, marks that turn the direction of writing, and what is no UTF-8.
std::size_t PrintableBytes(std::string_view text)
{
    const auto nLead = static_cast<unsigned char>(text.front());
    if (nLead < 0x80)
        return nLead >= 0x20 && nLead != 0x7F ? 1 : 0;
    const std::size_t nBytes = nLead >= 0xF0 ? 4 : nLead >= 0xE0 ? 3 : 2;
    if (nLead < 0xC2 || nLead > 0xF4 || text.size() < nBytes)
        return 0;
    char32_t nCode = nLead & (0x7FU >> nBytes);
    for (const char c : text.substr(1, nBytes - 1))
    {
        if (!IsContinuation(c))
            return 0;
        nCode = nCode << 6U | (static_cast<unsigned char>(c) & 0x3FU);
    }
    const auto Within = [nCode](char32_t nFirst, char32_t nLast)
    {
        return nCode >= nFirst && nCode <= nLast;
    };
    const bool bTooLong = (nBytes == 3 && nCode < 0x800) || (nBytes == 4 && !Within(0x10000, 0x10FFFF));
    const bool bControl = Within(0x80, 0x9F) || Within(0x2028, 0x202E) || Within(0x2066, 0x2069);
    return bTooLong || bControl || Within(0xD800, 0xDFFF) ? 0 : nBytes;
}

std::string RegistryPath()
{
    return krv::datasources::GetFormatHome() + "/etc/" + krv::datasources::GetFormatRegistryFilename();
}

std::string NotFoundText(const std::string& file)
{
    const std::string why = operations::WhyUnreadable(file);
    return file + ": " + (why.empty() ? "it cannot be opened; try again, or look with `krv doctor`" : why);
}

// A file name belongs in front unless the message has it already.
std::string WithFile(const std::string& file, const std::string& message)
{
    return file.empty() || message.find(file) != std::string::npos ? message : file + ": " + message;
}

std::string FormatText(const krv::FileFormatException& oError)
{
    const std::string& file = oError.GetFileName();
    if (oError.GetMessage().empty())
    {
        const std::string kind = operations::DescribeUnknown(file);
        return fmt::format("{0}: no format recognises this file{1}{2}; try `krv doctor {0}`", file,
                           kind.empty() ? "" : ": ", kind);
    }
    const std::string message = WithFile(file, oError.GetMessage());
    const bool bSaid = message.find("is damaged") != std::string::npos || message.find("not read") != std::string::npos;
    const char* const pGuess = message.find("truncated") != std::string::npos
                                   ? "; the file is damaged"
                                   : "; the file is damaged or of a kind that is not read";
    return fmt::format("{}{} (`krv doctor {}` tells more)", message, bSaid ? "" : pGuess, file);
}

std::string LibraryText(const krv::LibraryException& oError)
{
    if (oError.GetLibraryFile() == krv::datasources::GetFormatLibraryFilename("", "so"))
        return fmt::format("{}: a description listed there names no library; add <Object>name</Object> to it, or take "
                           "it out of the registry (`krv doctor` tells which)",
                           RegistryPath());
    const char* pRemedy = "reinstall it; the registry is";
    if (oError.GetType() == krv::LibraryException::eLibraryNotFound &&
        oError.GetMessage().ends_with("=" + std::to_string(ENOENT)))
        pRemedy = "install what is missing, or take its description out of the registry";
    if (oError.GetType() == krv::LibraryException::eVersionMismatch)
        pRemedy = "install the plug-in of this version, or take its description out of the registry";
    const std::string loader = IMPLibraryError();
    return fmt::format("plug-in {}: {}{}; {} {} (`krv doctor` shows all)", oError.GetLibraryFile(), oError.GetMessage(),
                       loader.empty() ? "" : " (" + loader + ")", pRemedy, RegistryPath());
}

// By which option the member of a request is asked for that is to be another one.
std::string OptionText(const std::string& field)
{
    struct FieldOption
    {
        std::string_view field;
        std::string_view option;
    };
    static constexpr FieldOption OPTIONS[] = {{"channels", "--channels"},
                                              {"coordinates", "--coordinates"},
                                              {"format", "--format"},
                                              {"method", "--resampling"},
                                              {"options", "--options; `krv formats NAME` lists those of a format"},
                                              {"power", "convert --power"},
                                              {"scale", "--scale"},
                                              {"target", "--write, --zone"},
                                              {"type", "--type"},
                                              {"unscale", "--unscale"}};
    const auto* const pOption = std::ranges::find(OPTIONS, std::string_view(field), &FieldOption::field);
    return pOption == std::end(OPTIONS) ? std::string() : fmt::format(" ({})", pOption->option);
}

std::string DataText(const krv::Exception& oError, const std::string& file)
{
    if (oError.GetMessage() == "No format libraries registered successfully")
        return fmt::format("{}: the registry lists no format; reinstall, or list the formats in it", RegistryPath());
    if (oError.GetMessage() == "Margin behaviour is eException")
        return WithFile(file, "tiles at the border have margins outside of the image; choose a --behaviour that makes "
                              "them, or no margins");
    constexpr std::string_view TWICE = "Format already registered: short name=";
    if (oError.GetMessage().starts_with(TWICE))
        return fmt::format("{}: the format {} is listed twice; take one of the two out of the registry", RegistryPath(),
                           oError.GetMessage().substr(TWICE.size()));
    return WithFile(file, oError.GetMessage().empty() ? "it failed without saying why" : oError.GetMessage());
}

// What to do, by the system's own words at the end of the message.
const char* IoRemedy(const std::string& message)
{
    for (const int nError : {ENOSPC, EDQUOT, EFBIG})
    {
        if (message.ends_with(std::strerror(nError)))
            return "make room there, or name a file elsewhere";
    }
    for (const int nError : {EACCES, EPERM, EROFS})
    {
        if (message.ends_with(std::strerror(nError)))
            return "get the right to write there, or name a file elsewhere";
    }
    if (message.ends_with("which is not replaced"))
        return "take another name, or remove that file";
    return message.ends_with("by another program or dataset") ? "try again when that is done"
                                                              : "is the file complete and its disk sound?";
}

// Some messages say what to do themselves.
std::string IoText(const krv::IOException& oError)
{
    const std::string& message = oError.GetMessage();
    const std::string remedy = message.find("; ") == std::string::npos ? std::string("; ") + IoRemedy(message) : "";
    return WithFile(oError.GetFileName(), message) + remedy;
}

std::string XmlText(const std::string& message)
{
    const std::string folder = std::filesystem::path(RegistryPath()).parent_path().string() + "/";
    if (message.starts_with(folder + ":"))
        return fmt::format("{}: an entry is empty; name a description in it, or take it out", RegistryPath());
    return fmt::format("{}; mend or reinstall that file, or set KRVHOME to another installation (`krv doctor` checks "
                       "all)",
                       message);
}

std::string PlaceText(const krv::Exception& oError)
{
    if (oError.GetFunction().empty() && oError.GetSourceFile().empty())
        return " [the place is not known]";
    return fmt::format(" [{}, {}, line {}]", oError.GetFunction(), oError.GetSourceFile(), oError.GetLine());
}

std::string Describe(const std::string& file, const krv::Exception** ppError)
{
    try
    {
        throw;
    }
    catch (const krv::FileNotFoundException& oError)
    {
        *ppError = &oError;
        return oError.GetMessage().empty() ? NotFoundText(oError.GetFileName())
                                           : WithFile(oError.GetFileName(), oError.GetMessage());
    }
    catch (const krv::FileFormatException& oError)
    {
        *ppError = &oError;
        return FormatText(oError);
    }
    catch (const krv::IOException& oError)
    {
        *ppError = &oError;
        return IoText(oError);
    }
    catch (const krv::FileException& oError)
    {
        *ppError = &oError;
        return WithFile(oError.GetFileName(), oError.GetMessage());
    }
    catch (const krv::LibraryException& oError)
    {
        *ppError = &oError;
        return LibraryText(oError);
    }
    catch (const operations::StoppedException& oError)
    {
        return oError.what();
    }
    catch (const operations::RequestException& oError)
    {
        *ppError = &oError;
        return oError.what() + OptionText(oError.GetField());
    }
    catch (const krv::Exception& oError)
    {
        *ppError = &oError;
        return DataText(oError, file);
    }
    catch (const std::bad_alloc&)
    {
        return WithFile(file, "there is not enough memory; a smaller tile or size may do");
    }
    catch (const krv::xml::ParseError& oError)
    {
        return XmlText(oError.what());
    }
    catch (const std::exception& oError)
    {
        return WithFile(file, oError.what());
    }
    catch (...)
    {
        return WithFile(file, "unknown error");
    }
}

} // namespace

std::string CurrentMessage()
{
    return OneLine(operations::CurrentMessage());
}

std::string OneLine(const std::string& text)
{
    std::string line;
    for (std::string_view rest = text; !rest.empty();)
    {
        const std::size_t nBytes = PrintableBytes(rest);
        const char c = rest.front();
        if (nBytes > 0)
            line += rest.substr(0, nBytes);
        else
            line += c == '\n' || c == '\r' || c == '\t' ? " " : fmt::format("\\x{:02x}", static_cast<unsigned char>(c));
        rest.remove_prefix(std::max<std::size_t>(nBytes, 1));
    }
    if (line.size() <= LONGEST_LINE)
        return line;
    std::size_t nHead = LONGEST_LINE * 2 / 3;
    std::size_t nTail = line.size() - LONGEST_LINE / 3;
    while (IsContinuation(line[nHead]))
        --nHead;
    while (IsContinuation(line[nTail]))
        ++nTail;
    return line.substr(0, nHead) + " ... " + line.substr(nTail);
}

// The pointer from the inner handler stays valid: the caller's catch block holds the same exception.
std::string DescribeError(const std::string& file, bool bVerbose)
{
    const krv::Exception* poError = nullptr;
    std::string text = Describe(file, &poError);
    if (bVerbose && poError != nullptr)
        text += PlaceText(*poError);
    return OneLine(text);
}

} // namespace krv::tool

#include "tools/krv/errors.h"

#include "datasources/formatregistrar/winformatregistrar.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmlerror.h"
#include "tools/krv/interrupt.h"

#include <fmt/format.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <new>
#include <system_error>

namespace krv::tool
{

namespace
{

std::string RegistryPath()
{
    return krv::datasources::GetFormatHome() + "/etc/" + krv::datasources::GetFormatRegistryFilename();
}

std::string NotFoundText(const std::string& file)
{
    const std::string why = WhyUnreadable(file);
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
        return fmt::format("{0}: no format recognises this file; try `krv doctor {0}`", file);
    return fmt::format("{}; the file is damaged or of a kind that is not read (`krv doctor {}` tells more)",
                       WithFile(file, oError.GetMessage()), file);
}

std::string LibraryText(const krv::LibraryException& oError)
{
    const char* pRemedy = "reinstall it; the registry is";
    if (oError.GetType() == krv::LibraryException::eLibraryNotFound)
        pRemedy = "install what is missing, or take its description out of the registry";
    if (oError.GetType() == krv::LibraryException::eVersionMismatch)
        pRemedy = "install the plug-in of this version, or take its description out of the registry";
    const std::string loader = IMPLibraryError();
    return fmt::format("plug-in {}: {}{}; {} {} (`krv doctor` shows all)", oError.GetLibraryFile(), oError.GetMessage(),
                       loader.empty() ? "" : " (" + loader + ")", pRemedy, RegistryPath());
}

std::string DataText(const krv::Exception& oError, const std::string& file)
{
    if (oError.GetMessage() == "No format libraries registered successfully")
        return fmt::format("{}: the registry lists no format; reinstall, or list the formats in it", RegistryPath());
    return WithFile(file, oError.GetMessage().empty() ? "it failed without saying why" : oError.GetMessage());
}

std::string IoText(const krv::IOException& oError)
{
    return WithFile(oError.GetFileName(), oError.GetMessage()) + "; is the file complete and its disk sound?";
}

std::string XmlText(const std::string& message)
{
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
    catch (const krv::Exception& oError)
    {
        *ppError = &oError;
        return DataText(oError, file);
    }
    catch (const Stopped& oError)
    {
        return oError.what();
    }
    catch (const std::bad_alloc&)
    {
        return WithFile(file, "there is not enough memory; a smaller tile or size may do");
    }
    catch (const std::exception& oError)
    {
        return WithFile(file, oError.what());
    }
    catch (...)
    {
        return XmlText(krv::xml::DescribeCurrentException());
    }
}

} // namespace

std::string CurrentMessage()
{
    try
    {
        throw;
    }
    catch (const std::exception& oError)
    {
        return OneLine(oError.what());
    }
    catch (...)
    {
        return OneLine(krv::xml::DescribeCurrentException());
    }
}

std::string OneLine(const std::string& text)
{
    std::string line = text;
    for (char& c : line)
    {
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7F)
            c = ' ';
    }
    return line;
}

std::string WhyUnreadable(const std::string& file)
{
    struct stat oStatus = {};
    if (stat(file.c_str(), &oStatus) != 0)
    {
        if (errno == ENOENT)
            return "there is no such file; check the name and the folder";
        return std::string("it cannot be reached: ") + std::strerror(errno);
    }
    if (S_ISDIR(oStatus.st_mode))
        return "it is a folder; name a file in it";
    if (!S_ISREG(oStatus.st_mode))
        return "it is not a regular file; copy its content into one";
    if (access(file.c_str(), R_OK) != 0)
        return "it may not be read; ask its owner for the right to read it";
    return {};
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

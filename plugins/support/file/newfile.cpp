#include "plugins/support/file/newfile.h"

#include "toolkit/exceptions/exceptions.h"

#include <atomic>
#include <cerrno>
#include <cstdio>

#include <sys/stat.h>
#include <unistd.h>

namespace krv::plugins::support
{

namespace
{

void CheckName(const std::string& fileName, bool bReplace, const Place& oPlace)
{
    struct stat oStatus = {};
    if (fileName.empty() || fileName.back() == '/')
        throw IOException(fileName, "\"" + fileName + "\": it names a folder; give a new file a name in it", oPlace);
    if (::stat(fileName.c_str(), &oStatus) == 0 && !S_ISREG(oStatus.st_mode))
        throw IOException(fileName, fileName + ": is not a plain file and is not replaced", oPlace);
    if (!bReplace && ::lstat(fileName.c_str(), &oStatus) == 0)
        ThrowNameTaken(fileName, oPlace);
    if (::access(fileName.c_str(), W_OK) != 0 && errno != ENOENT && errno != ENOTDIR)
        throw IOException(fileName, fileName + ": cannot be replaced: " + SystemErrorText(errno), oPlace);
    const std::size_t nSlash = fileName.rfind('/');
    const std::size_t nBegin = nSlash == std::string::npos ? 0 : nSlash + 1;
    const std::string folder = nBegin == 0 ? "." : fileName.substr(0, nBegin == 1 ? 1 : nBegin - 1);
    if (::access(folder.c_str(), W_OK | X_OK) != 0)
    {
        if (errno == ENOENT || errno == ENOTDIR)
            throw FileNotFoundException(fileName, fileName + ": there is no folder " + folder + " to create it in",
                                        oPlace);
        throw IOException(fileName, fileName + ": cannot be created: " + SystemErrorText(errno), oPlace);
    }
}

std::string MakeCheckedName(const std::string& fileName, bool bReplace, const Place& oPlace)
{
    CheckName(fileName, bReplace, oPlace);
    return MakeTemporaryName(fileName);
}

// Some folders say that they can be written and take no file: what a user reads names the file that was asked for.
std::shared_ptr<File> MakeFile(const std::string& temporary, const std::string& fileName, const Place& oPlace)
{
    try
    {
        return std::make_shared<File>(temporary, File::Mode::eCreate, oPlace);
    }
    catch (const krv::FileException& oError)
    {
        const std::string& message = oError.GetMessage();
        throw IOException(fileName, fileName + ": cannot be created: " + message.substr(message.rfind(": ") + 2),
                          oPlace);
    }
}

} // namespace

// The name is of no length that a folder does not take.
std::string MakeTemporaryName(const std::string& fileName)
{
    static std::atomic<unsigned int> nCounter = 0;
    const std::size_t nSlash = fileName.rfind('/');
    const std::size_t nBegin = nSlash == std::string::npos ? 0 : nSlash + 1;
    return fileName.substr(0, nBegin) + "." + fileName.substr(nBegin, 200) + "." + std::to_string(::getpid()) + "." +
           std::to_string(nCounter++) + ".part";
}

NewFile::NewFile(const std::string& fileName, bool bReplaces, const Place& oPlace)
    : moFileName(fileName), moTemporary(MakeCheckedName(fileName, bReplaces, oPlace)),
      mpoFile(MakeFile(moTemporary, fileName, oPlace))
{
    mpoFile->ShowAs(fileName);
}

NewFile::~NewFile()
{
    if (!moTemporary.empty())
        std::remove(moTemporary.c_str());
}

void NewFile::TakeName(bool bReplaces, const Place& oPlace)
{
    mpoFile->Rename(moFileName, bReplaces, oPlace);
    moTemporary.clear();
}

} // namespace krv::plugins::support

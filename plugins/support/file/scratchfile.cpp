#include "plugins/support/file/scratchfile.h"

#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::support
{

std::shared_ptr<File> MakeScratchFile(const std::string& fileName, const Place& oPlace)
{
    const std::string given = IMPGetEnv("TMPDIR");
    const std::string folder = given.empty() ? "/var/tmp" : given;
    try
    {
        auto poFile = std::make_shared<File>(folder, File::Mode::eScratch, oPlace);
        poFile->ShowAs(fileName + " (its scratch file in " + folder + ")");
        return poFile;
    }
    catch (const Exception& oError)
    {
        throw IOException(
            fileName, fileName + ": no scratch file can be made, TMPDIR names a folder for it: " + oError.GetMessage(),
            oPlace);
    }
}

} // namespace krv::plugins::support

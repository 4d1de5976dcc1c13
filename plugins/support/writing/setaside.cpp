#include "plugins/support/writing/setaside.h"

#include "plugins/support/file/file.h"
#include "plugins/support/file/newfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <cerrno>
#include <cstdio>

namespace krv::plugins::support
{

SetAside::SetAside(const std::vector<std::string>& oNames)
{
    moMoved.reserve(oNames.size());
    for (const std::string& name : oNames)
    {
        std::string aside = MakeTemporaryName(name);
        if (std::rename(name.c_str(), aside.c_str()) == 0)
            moMoved.push_back({name, std::move(aside)});
        else if (errno != ENOENT)
        {
            const std::string cause = SystemErrorText(errno);
            PutBack();
            throw IOException(name, name + ": belongs to the file that is replaced and cannot be removed: " + cause);
        }
    }
}

SetAside::~SetAside()
{
    PutBack();
}

void SetAside::PutBack() noexcept
{
    for (const Moved& oMoved : moMoved)
        std::rename(oMoved.moAside.c_str(), oMoved.moName.c_str());
    moMoved.clear();
}

void SetAside::Drop()
{
    for (const Moved& oMoved : moMoved)
        std::remove(oMoved.moAside.c_str());
    moMoved.clear();
}

} // namespace krv::plugins::support

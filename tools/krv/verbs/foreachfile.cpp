#include "operations/job/exceptions.h"
#include "tools/krv/errors.h"
#include "tools/krv/verbs/verbs.h"

#include <cstdio>

namespace krv::tool
{

int ForEachFile(Selection& oSelection, const std::vector<std::string>& oNames,
                const std::function<void(const std::string& file)>& oWork)
{
    int nFirst = 0;
    std::string told;
    const auto Tell = [&](const std::string& file, int nCode)
    {
        const std::string text = DescribeError(file, oSelection.verbose);
        if (text != told) // what is wrong with the request is so for every file
            std::fprintf(stderr, "krv: %s\n", text.c_str());
        told = text;
        nFirst = nFirst == 0 ? nCode : nFirst;
    };
    for (const std::string& file : oNames)
    {
        oSelection.file = file;
        try
        {
            oWork(file);
        }
        catch (const operations::StoppedException&)
        {
            throw;
        }
        catch (const UsageError&)
        {
            if (oNames.size() == 1)
                throw;
            Tell(file, 2);
        }
        catch (...)
        {
            if (oNames.size() == 1)
                throw;
            Tell(file, 1);
        }
    }
    return nFirst;
}

} // namespace krv::tool

#include "datasources/interfaces/formatplugin.h"
#include "plugins/demo/demodataset.h"
#include "plugins/support/builder.h"

namespace krv::plugins::demo
{

class DemoBuilder : public support::Builder
{
public:
    DemoBuilder() : Builder("Demonstration of a format plug-in", {"demo"}, "DEMO") {}

    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override
    {
        CheckReadOnly(fileName, eMode);
        return new DemoDataset(fileName, GetFileFormat());
    }

    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override
    {
        RefuseOptions(fileName, options);
        return new DemoDataset(GetFileFormat(),
                               std::make_shared<support::HeadedFile>(fileName, DemoDataset::FIRST_LINES));
    }

    // By the first bytes alone: cheap, no file access, no side effects. A file that was not written to its end is known
    // too: Open says what is wrong with it.
    int Identify(const std::string&, const unsigned char* pHeader, unsigned int nHeaderLength, int) override
    {
        const std::string_view header(reinterpret_cast<const char*>(pHeader), nHeaderLength);
        return header.starts_with(DemoDataset::FIRST_LINES.moFinished) ||
                       header.starts_with(DemoDataset::FIRST_LINES.moUnfinished)
                   ? 0
                   : 1;
    }
};

} // namespace krv::plugins::demo

KRV_FORMAT_PLUGIN(krv::plugins::demo::DemoBuilder)

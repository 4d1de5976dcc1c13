#include "datasources/iomanager/linkchain.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>
#include <memory>
#include <system_error>

namespace krv::datasources
{

namespace
{

// Files that one chain leads to, at most: a file may link to many, which link to many more.
constexpr unsigned int MAXIMUM_FILES = 256;

class LinkFollower
{
public:
    LinkFollower(const std::string& target, const Place& oPlace) : moTarget(target), moPlace(oPlace) {}

    const std::vector<std::string>& GetFiles() const { return moFiles; }

    void Follow(const IDataset& oDataset, unsigned int nLinks)
    {
        const auto* const poLinked = dynamic_cast<const ILinkedDataset*>(&oDataset);
        if (poLinked == nullptr)
            return;
        for (const std::string& file : poLinked->GetLinkedFiles())
        {
            std::error_code oNone;
            if (std::filesystem::equivalent(file, moTarget, oNone))
                throw DataException(moTarget + ": the file would be linked to itself, by way of others", moPlace);
            if (nLinks >= MAXIMUM_LINKS || moFiles.size() >= MAXIMUM_FILES)
                throw DataException(moTarget + ": more than " + std::to_string(MAXIMUM_LINKS) +
                                        " links lead to the pixels; link to the file that holds them",
                                    moPlace);
            moFiles.push_back(file);
            if (const std::unique_ptr<IDataset> poNext = TryOpen(file))
                Follow(*poNext, nLinks + 1);
        }
    }

private:
    static std::unique_ptr<IDataset> TryOpen(const std::string& file)
    {
        try
        {
            return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eReadOnly));
        }
        catch (const krv::Exception&)
        {
            return nullptr;
        }
    }

    std::string moTarget;
    Place moPlace;
    std::vector<std::string> moFiles;
};

} // namespace

std::vector<std::string> FollowLinks(const IDataset& oSource, const std::string& target, const Place& oPlace)
{
    LinkFollower oFollower(target, oPlace);
    oFollower.Follow(oSource, 1);
    return oFollower.GetFiles();
}

} // namespace krv::datasources

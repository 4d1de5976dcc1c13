#include "plugins/support/sidecar/levelsfile.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"

#include <memory>
#include <vector>

namespace krv::plugins::support
{

void ForgetLevels(krv::datasources::IDataset& oLevels)
{
    auto& oRaster = dynamic_cast<krv::datasources::IRasterDataset&>(oLevels);
    krv::datasources::AuxiliaryData oBook = oLevels.ReadAuxiliaryData();
    if (krv::datasources::SetLevelInvalid(oBook, FIRST_LEVEL_PAGE))
        oLevels.WriteAuxiliaryData(oBook);
    const std::unique_ptr<krv::datasources::IOverviewManager> poOwn(oRaster.GetOverviewManager());
    if (poOwn == nullptr)
        return;
    for (const unsigned int nLevel : poOwn->GetLevels())
    {
        std::vector<unsigned int> oValid;
        for (unsigned int nChannel = 1; nChannel <= oRaster.GetChanCount(); ++nChannel)
            if (poOwn->IsValid(nChannel, nLevel))
                oValid.push_back(nChannel);
        if (!oValid.empty())
            krv::datasources::SetChannelsValid(*poOwn, oValid, nLevel, false);
    }
}

} // namespace krv::plugins::support

#include "datasources/interfaces/datatypechannelfilter.h"

#include "datasources/interfaces/channelinfo.h"
#include "tests/support/probe.h"
#include "tests/support/syntheticdataset.h"

#include <gtest/gtest.h>

using namespace krv::datasources;
using krv::gobs::DataType;

namespace
{

using Channels = std::vector<unsigned int>;

std::shared_ptr<krv::test::ImageModel> ModelOf(std::vector<DataType> oTypes)
{
    auto oModel = std::make_shared<krv::test::ImageModel>();
    oModel->moTypes = std::move(oTypes);
    return oModel;
}

} // namespace

TEST(DataTypeChannelFilter, ComparesAllSixFields)
{
    const DataType oBase(16, true, false, 3, 4, false);
    const std::vector<DataType> oTypes = {
        oBase,
        {8, true, false, 3, 4, false},
        {16, false, false, 3, 4, false},
        {16, true, true, 3, 4, false},
        {16, true, false, 0, 4, false},
        {16, true, false, 3, 0, false},
        {16, true, false, 3, 4, true},
        oBase,
    };
    const krv::test::SyntheticDataset oDataset(ModelOf(oTypes));
    EXPECT_EQ(DataTypeChannelFilter(oBase).Accept(oDataset), (Channels{1, 8}));
    for (unsigned int nChannel = 2; nChannel < 8; ++nChannel)
    {
        EXPECT_EQ(DataTypeChannelFilter(oTypes[nChannel - 1]).Accept(oDataset), Channels{nChannel});
        EXPECT_FALSE(DataTypeChannelFilter(oBase).Accept(oDataset, nChannel)) << nChannel;
    }
}

TEST(FileFormat, FlagsKeepTheirValues)
{
    EXPECT_EQ(eReadOnly, 0);
    EXPECT_EQ(eUpdate, 1);
    EXPECT_EQ(eDone, 0);
}

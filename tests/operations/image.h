#pragma once

#include "datasources/interfaces/idataset.h"
#include "tests/support/syntheticdataset.h"

#include <memory>

namespace krv::test
{

// A synthetic image of channels of one type, to be cut into awkward tiles.
inline std::unique_ptr<krv::datasources::IDataset> MakeImage(unsigned int nChannels,
                                                             krv::gobs::NativeDataTypeCode eType)
{
    const auto poModel = std::make_shared<ImageModel>();
    poModel->moTypes.assign(nChannels, eType);
    poModel->moAuxiliary = krv::datasources::AuxiliaryData(nChannels);
    return std::make_unique<SyntheticDataset>(poModel);
}

} // namespace krv::test

#include "plugins/demo/demodataset.h"

#include "plugins/demo/demoblocksource.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <limits>

namespace krv::plugins::demo
{

DemoDataset::DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat, Mode eMode)
    : Dataset(fileName, poFormat), meMode(eMode)
{
    if (meMode == Mode::eOpen)
        UseFile(std::make_shared<DemoFile>(fileName));
}

// I/O objects may keep the file a little longer.
DemoDataset::~DemoDataset()
{
    if (mpoFile != nullptr && mpoFile->IsChanged())
        WarnOfLoss();
    if (mpoFile != nullptr)
        mpoFile->Discard();
}

void DemoDataset::UseFile(std::shared_ptr<DemoFile> poFile)
{
    SetImage(std::make_unique<DemoBlockSource>(poFile));
    mpoFile = std::move(poFile);
}

void DemoDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    CheckOpen();
    if (meMode == Mode::eOpen || HasImage())
        Refuse("an image exists already");
    if (std::min(nWidth, nHeight) < 1 || std::max(nWidth, nHeight) > std::numeric_limits<int>::max() || oTypes.empty())
        Refuse("an image of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) + " pixels and " +
               std::to_string(oTypes.size()) + " channels cannot be laid out");
    for (const krv::gobs::DataType& oType : oTypes)
        if (oType.GetNativeCode() == krv::gobs::eDT_BIT)
            Refuse("channels of single bits cannot be stored");
    UseFile(std::make_shared<DemoFile>(
        GetFileName(),
        DemoHeader{nWidth, nHeight, oTypes, krv::datasources::AuxiliaryData(static_cast<unsigned int>(oTypes.size()))},
        Replaces()));
}

bool DemoDataset::Exists() const
{
    return meMode == Mode::eCreate ? mpoFile != nullptr : Dataset::Exists();
}

krv::datasources::FileAccessState DemoDataset::Delete()
{
    const bool bNamed = meMode == Mode::eOpen || (mpoFile != nullptr && mpoFile->IsNamed());
    if (mpoFile != nullptr)
        mpoFile->Discard();
    if (bNamed)
        return Dataset::Delete();
    Close();
    return krv::datasources::eDone;
}

krv::datasources::AuxiliaryData DemoDataset::ReadAuxiliaryData()
{
    static_cast<void>(GetImage());
    return mpoFile->GetHeader().moTags;
}

void DemoDataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData)
{
    if (!IsWritable())
        return Dataset::WriteAuxiliaryData(oData);
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
               std::to_string(GetChanCount()));
    mpoFile->SetTags(oData);
}

void DemoDataset::Synchronize()
{
    CheckOpen();
    if (IsWritable())
        mpoFile->Finish();
}

void DemoDataset::Close()
{
    if (IsWritable())
    {
        mpoFile->Finish();
        mpoFile->Discard();
    }
    Dataset::Close();
}

krv::datasources::AccessCapabilities DemoDataset::GetRasterCapabilities()
{
    return {true, meMode == Mode::eCreate, meMode == Mode::eCreate};
}

} // namespace krv::plugins::demo

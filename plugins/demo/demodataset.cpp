#include "plugins/demo/demodataset.h"

#include "gobs/raster/datatypeadapter.h"
#include "plugins/support/image/plainsource.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <bit>
#include <climits>
#include <sstream>

namespace krv::plugins::demo
{

static_assert(std::endian::native == std::endian::little, "values would have to be swapped");

const support::HeadedFile::FirstLines DemoDataset::FIRST_LINES = {"DEMO1\n", "DEMO-\n"};

DemoDataset::DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : RecordDataset(fileName, poFormat), FacetsBeside(this),
      mpoFile(std::make_shared<support::HeadedFile>(
          std::make_shared<support::File>(fileName, support::File::Mode::eRead), FIRST_LINES))
{
    ReadHeader();
    SetImage(MakeLevelSource(1, mpoFile->GetHeaderBytes()));
}

DemoDataset::DemoDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<support::HeadedFile> poNew)
    : RecordDataset(poFormat, poNew), FacetsBeside(this), mpoFile(std::move(poNew))
{
}

void DemoDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    CheckCreate(nWidth, nHeight, oTypes, Place::Current());
    mnWidth = nWidth;
    mnHeight = nHeight;
    moTypes = oTypes;
    support::RecordText oRecord;
    oRecord.moTags = krv::datasources::AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
    mpoFile->Make(MakeHeader(oRecord), support::PlainSource::CountBytes(MakeLayout(1)));
    ShowRecord(std::move(oRecord));
    SetImage(MakeLevelSource(1, mpoFile->GetHeaderBytes()));
}

void DemoDataset::ReadHeader()
{
    std::istringstream oLines = mpoFile->ReadHeader();
    long long nWidth = 0, nHeight = 0; // every number from a file is hostile: read wide and signed, then checked
    std::string line;
    std::getline(oLines >> nWidth >> nHeight >> std::ws, line);
    if (std::min(nWidth, nHeight) < 1 || std::max(nWidth, nHeight) > INT_MAX || line.empty())
        throw krv::FileFormatException(GetFileName(), GetFileName() + " has no valid image size or no channels");
    mnWidth = static_cast<unsigned int>(nWidth);
    mnHeight = static_cast<unsigned int>(nHeight);
    std::istringstream oWords(line);
    for (std::string type; oWords >> type;)
    {
        const auto oType = krv::gobs::DataTypeAdapter::StringToType(type);
        if (!oType)
            throw krv::FileFormatException(GetFileName(), GetFileName() + " has channels of the unknown type " + type);
        moTypes.emplace_back(*oType);
    }
    support::RecordText oRecord;
    oRecord.moTags = krv::datasources::AuxiliaryData(static_cast<unsigned int>(moTypes.size()));
    oRecord.Read(oLines);
    ShowRecord(std::move(oRecord));
}

std::string DemoDataset::MakeHeader(const support::RecordText& oRecord) const
{
    std::string text = std::to_string(mnWidth) + " " + std::to_string(mnHeight) + "\n";
    for (const krv::gobs::DataType& oType : moTypes)
        text += oType.Describe() + " ";
    return text + "\n" + oRecord.Write();
}

support::ImageLayout DemoDataset::MakeLayout(unsigned int nLevel) const
{
    constexpr unsigned int BLOCK_SIZE = 256; // readers take it for their tiles
    std::vector<support::Plane> oPlanes;
    for (const krv::gobs::DataType& oType : moTypes)
        oPlanes.push_back({oType, 1, {}});
    return {(mnWidth - 1) / nLevel + 1, (mnHeight - 1) / nLevel + 1, BLOCK_SIZE, BLOCK_SIZE, std::move(oPlanes)};
}

void DemoDataset::StoreRecord(const support::RecordText& oRecord) const
{
    mpoFile->SetHeader(MakeHeader(oRecord));
}

std::uint64_t DemoDataset::MakeRoom(unsigned int nLevel)
{
    return mpoFile->Append(support::PlainSource::CountBytes(MakeLayout(nLevel)));
}

std::shared_ptr<support::IBlockSource> DemoDataset::MakeLevelSource(unsigned int nLevel, std::uint64_t nPlace)
{
    const auto BeforeWrite = [this, nLevel]
    {
        mpoFile->BeginChange();
        if (nLevel == 1)
            ForgetOldPixels();
    };
    return std::make_shared<support::PlainSource>(mpoFile->GetFile(), nPlace, MakeLayout(nLevel),
                                                  IsWritten() ? BeforeWrite : std::function<void()>());
}

} // namespace krv::plugins::demo

// Any bytes as a native file: read, and opened for update and changed. The first byte says whether checksums are made
// right before: what they would refuse is seen then too.
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"
#include "plugins/krvdsk/krvdskbuilder.h"
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/krvdsk/store/storefile.h"
#include "plugins/support/codec/checksum.h"
#include "toolkit/exceptions/exceptions.h"

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"

#include <cstring>
#include <memory>
#include <vector>

namespace
{

using krv::plugins::krvdsk::KrvdskBuilder;
using krv::plugins::krvdsk::KrvdskDataset;
using krv::plugins::krvdsk::Root;

// Puts the signature, a root that is right and the checksum of its directory into the bytes.
void Reseal(std::vector<unsigned char>& oBytes)
{
    if (oBytes.size() < Root::SECOND_SLOT + Root::BYTES)
        return;
    const auto& signature = krv::plugins::krvdsk::SIGNATURE;
    std::memcpy(oBytes.data(), signature.data(), signature.size());
    Root oRoot;
    oRoot.mnGeneration = 1;
    oRoot.mnFileBytes = oBytes.size();
    std::memcpy(&oRoot.moDirectory.mnOffset, &oBytes[Root::SECOND_SLOT + 24], 8);
    std::memcpy(&oRoot.moDirectory.mnBytes, &oBytes[Root::SECOND_SLOT + 32], 4);
    if (oRoot.moDirectory.mnOffset < oBytes.size() &&
        oRoot.moDirectory.mnBytes <= oBytes.size() - oRoot.moDirectory.mnOffset)
        oRoot.moDirectory.mnChecksum =
            krv::plugins::codec::Checksum(0, &oBytes[oRoot.moDirectory.mnOffset], oRoot.moDirectory.mnBytes);
    const std::vector<unsigned char> oRight = oRoot.Make();
    std::memcpy(&oBytes[Root::SECOND_SLOT], oRight.data(), oRight.size());
}

// Every step may be refused; what the file says afterwards can be read.
void Change(const std::string& fileName)
{
    const std::unique_ptr<KrvdskDataset> poDataset(
        static_cast<KrvdskDataset*>(KrvdskBuilder().Open(fileName, eUpdate)));
    const auto Try = [](const auto& oStep)
    {
        try
        {
            oStep();
        }
        catch (const krv::Exception&)
        {
        }
    };
    if (poDataset->GetChanCount() != 0)
        Try(
            [&]
            {
                const std::unique_ptr<krv::datasources::IRasterIO> poIO(poDataset->GetRasterIO({1}));
                std::vector<unsigned char> oPixel(64, 7);
                poIO->WriteWindow(0U, 0U, 1U, 1U, oPixel.data());
            });
    Try(
        [&]
        {
            std::vector<unsigned char> oTile;
            if (poDataset->ReadEncoded(1, {}, oTile))
                poDataset->StoreEncoded(1, {}, oTile.data(), oTile.size());
        });
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poDataset->GetOverviewManager());
    Try([&] { poLevels->CreateLevel(2); });
    Try([&] { poDataset->SetEncodedForm(2, poDataset->GetEncodedForm(2)); });
    Try([&] { poLevels->DeleteLevel(4); });
    Try([&] { poDataset->WriteAuxiliaryData(poDataset->ReadAuxiliaryData()); });
    const std::vector<unsigned int> oBitmaps = poDataset->GetBitmapList();
    if (!oBitmaps.empty())
        Try([&] { poDataset->DeleteBitmap(oBitmaps.front()); });
    Try([&] { poDataset->DeleteChannel(1); });
    Try([&] { poDataset->Verify({}); });
    Try([&] { poDataset->Close(); });
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* pBytes, std::size_t nBytes)
{
    if (nBytes == 0)
        return 0;
    std::vector<unsigned char> oBytes(pBytes + 1, pBytes + nBytes);
    if (pBytes[0] % 2 == 0)
        Reseal(oBytes);
    const krv::fuzz::InputFile oFile(oBytes.data(), oBytes.size());
    krv::fuzz::ExerciseFile(oFile.GetName());
    try
    {
        Change(oFile.GetName());
    }
    catch (const krv::Exception&)
    {
    }
    return 0;
}

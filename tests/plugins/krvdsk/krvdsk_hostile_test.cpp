// Files that are cut, damaged or of another version, and those whose checksums agree with what is wrong.
#include "datasources/interfaces/irasterio.h"
#include "fuzz/support/exercise.h"
#include "plugins/krvdsk/store/bytes.h"
#include "plugins/support/codec/checksum.h"
#include "tests/plugins/krvdsk/changes.h"
#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <cstring>

namespace
{

using namespace krv::gobs;
using namespace krv::plugins::krvdsk;
using namespace krv::test;
using krv::conformance::ReadFile;
using krv::conformance::TempFolder;

// A file with something of everything, of one generation.
std::string MakeSample(const TempFolder& oFolder, const std::string& options)
{
    const std::string fileName = oFolder.File("sample.krv");
    std::mt19937 oRandom(5);
    const NativePointer poNew = CreateNative(fileName, options, 90, 50, {eDT_8U, eDT_8U, eDT_16S, eDT_C32R});
    for (const Change eChange : CHANGES)
        for (int nTime = 0; nTime < 3; ++nTime)
            Make(*poNew, eChange, oRandom);
    poNew->Close();
    return ReadFile(fileName);
}

// What opening the bytes and telling all that they hold comes to.
std::string TellBytes(const std::string& fileName, const std::string& bytes, AccessMode eMode = eReadOnly)
{
    WriteAnew(fileName, bytes);
    std::string told;
    const std::string error = Error([&] { told = Tell(*OpenNative(fileName, eMode)); });
    return error.empty() ? told : "refused: " + error;
}

constexpr const char* OPTIONS[] = {"BLOCKXSIZE=32 BLOCKYSIZE=16", "BLOCKXSIZE=40 BLOCKYSIZE=30 COMPRESS=DEFLATE"};

TEST(KrvdskHostile, AFileThatIsCutAnywhereIsRefusedByName)
{
    const TempFolder oFolder;
    for (const char* const pOptions : OPTIONS)
    {
        const std::string whole = MakeSample(oFolder, pOptions), fileName = oFolder.File("cut.krv");
        ASSERT_EQ(TellBytes(fileName, whole).find("refused"), std::string::npos);
        for (std::size_t nBytes = 0; nBytes < whole.size();
             nBytes += nBytes < 600 || nBytes > whole.size() - 40 ? 1 : 97)
        {
            const std::string told = TellBytes(fileName, whole.substr(0, nBytes));
            ASSERT_EQ(told.find("refused: "), 0U) << nBytes;
            ASSERT_NE(told.find(fileName), std::string::npos) << told;
        }
    }
}

// Never other pixels or metadata than there were: what does not agree with its checksum is refused.
TEST(KrvdskHostile, DamageIsFoundOrDoesNoHarm)
{
    const TempFolder oFolder;
    std::mt19937 oRandom(6);
    for (const char* const pOptions : OPTIONS)
    {
        const std::string whole = MakeSample(oFolder, pOptions), fileName = oFolder.File("damaged.krv");
        const std::string told = TellBytes(fileName, whole);
        int nRefused = 0, nVerified = 0;
        for (int nTime = 0; nTime < 5000; ++nTime)
        {
            std::string damaged = whole;
            const std::size_t nAt = oRandom() % whole.size(), nBytes = 1 + oRandom() % 40;
            for (std::size_t nByte = nAt; nByte < std::min(nAt + nBytes, whole.size()); ++nByte)
                damaged[nByte] = static_cast<char>(oRandom() % 3 == 0 ? 0 : oRandom());
            const std::string got = TellBytes(fileName, damaged, nTime % 2 == 0 ? eReadOnly : eUpdate);
            const bool bRefused = got.starts_with("refused: ");
            ASSERT_TRUE(bRefused || got == told) << "damage at " << nAt << "\n" << got;
            ASSERT_TRUE(!bRefused || got.find(fileName) != std::string::npos) << got;
            nRefused += bRefused;
            if (nTime % 50 == 0 && bRefused && got.find("tile") != std::string::npos)
            {
                WriteAnew(fileName, damaged);
                const std::vector<std::string> oWrong = OpenNative(fileName)->Verify({});
                EXPECT_EQ(oWrong.size(), 1U);
                ++nVerified;
            }
        }
        EXPECT_GT(nRefused, 500) << "hardly any damage was found";
        EXPECT_GT(nVerified, 3);
    }
}

// Puts other bytes into the directory and makes all checksums right again.
std::string Replant(std::string file, const std::function<void(std::string& directory, Root& oRoot)>& oChange)
{
    Root oRoot = *Root::Parse(reinterpret_cast<const unsigned char*>(file.data()) + Root::SECOND_SLOT);
    std::string directory = file.substr(oRoot.moDirectory.mnOffset, oRoot.moDirectory.mnBytes);
    oChange(directory, oRoot);
    oRoot.moDirectory.mnOffset = file.size();
    oRoot.moDirectory.mnBytes = static_cast<std::uint32_t>(directory.size());
    oRoot.moDirectory.mnChecksum = krv::plugins::codec::Checksum(0, directory.data(), directory.size());
    file += directory;
    oRoot.mnFileBytes = file.size();
    const std::vector<unsigned char> oBytes = oRoot.Make();
    return file.replace(Root::SECOND_SLOT, oBytes.size(), std::string(oBytes.begin(), oBytes.end()));
}

TEST(KrvdskHostile, DirectoriesThatContradictThemselvesAreRefused)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("planted.krv");
    CreateNative(fileName, "BLOCKXSIZE=32 BLOCKYSIZE=16", 90, 50, {eDT_8U, eDT_16S})->Close();
    const std::string whole = ReadFile(fileName);
    const auto Set = [](std::size_t nAt, std::uint32_t nValue)
    {
        return [=](std::string& directory, Root&)
        {
            std::memcpy(&directory[nAt], &nValue, 4);
        };
    };
    constexpr std::size_t IMAGE = 8, ITEM = 8;
    const std::string planes = "Plan";
    const std::tuple<const char*, std::function<void(std::string&, Root&)>, const char*> PLANTED[] = {
        {"nothing", [](std::string&, Root&) {}, ""},
        {"width 0", Set(IMAGE, 0), "an image of 0 x 50 pixels"},
        {"width 2^31", Set(IMAGE, 1U << 31), "cannot be"},
        {"tiles of 0", Set(IMAGE + 8, 0), "cannot be"},
        {"huge tiles",
         [](std::string& directory, Root&)
         {
             const std::uint32_t aNumbers[] = {65536, 65536, 65536, 65536};
             std::memcpy(&directory[IMAGE], aNumbers, sizeof(aNumbers));
         },
         "more than 100663296"},
        {"too many tiles",
         [](std::string& directory, Root&)
         {
             const std::uint32_t aNumbers[] = {INT32_MAX, INT32_MAX, 1, 1};
             std::memcpy(&directory[IMAGE], aNumbers, sizeof(aNumbers));
         },
         "tiles"},
        {"no image", [](std::string& directory, Root&) { directory.erase(0, directory.find("Levl")); }, "begin with"},
        {"cut", [](std::string& directory, Root&) { directory.pop_back(); }, "ends too early"},
        {"unknown item", [](std::string& directory, Root&) { directory += std::string("Newt\0\0\0\0", ITEM); },
         "\"Newt\", which this program does not know"},
        {"item to be passed over",
         [](std::string& directory, Root&) { directory += std::string("newt\2\0\0\0xy", 10); }, ""},
        {"other type", [&](std::string& directory, Root&) { directory[directory.find(planes) + ITEM + 1] = 77; },
         "type 77"},
        {"predictor of reals", [&](std::string& directory, Root&) { directory[directory.find(planes) + ITEM + 3] = 3; },
         "predictor 3"},
        {"bits",
         [&](std::string& directory, Root&) { directory[directory.find(planes, directory.find(planes) + 1) - 1] = 9; },
         "9 bits of a value of type 8U"},
        {"no channel", [&](std::string& directory, Root&) { directory[directory.find(planes) + ITEM + 9] = 0; },
         "no channels"},
        {"later version", [](std::string&, Root& oRoot) { oRoot.mnVersion = 2; },
         "is of version 2.0 of the format; this program reads those up to 1.0"}};
    for (const auto& [pWhat, oChange, pError] : PLANTED)
    {
        const std::string got = TellBytes(fileName, Replant(whole, oChange));
        EXPECT_EQ(got.starts_with("refused: "), pError[0] != 0) << pWhat << ": " << got;
        EXPECT_NE(got.find(pError), std::string::npos) << pWhat << ": " << got;
    }
    const auto Later = [](std::string&, Root& oRoot)
    {
        oRoot.mnRevision = 1;
    };
    EXPECT_EQ(TellBytes(fileName, Replant(whole, Later)), TellBytes(fileName, whole));
    EXPECT_NE(TellBytes(fileName, Replant(whole, Later), eUpdate).find("it can be read, not updated"),
              std::string::npos);
}

// Of what comes from another file as it is stored there checksums are compared too: all of it comes, or nothing.
TEST(KrvdskHostile, DamageIsNotTakenOver)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("damaged.krv"), options = "BLOCKXSIZE=16 BLOCKYSIZE=16 COMPRESS=LZ4";
    {
        const NativePointer poNew = CreateNative(fileName, options, 64, 16, {eDT_8U});
        std::vector<unsigned char> oPixels(std::size_t{64} * 16, 7);
        std::unique_ptr<krv::datasources::IRasterIO>(poNew->GetRasterIO({1}))
            ->WriteWindow(0U, 0U, 48U, 16U, oPixels.data());
        poNew->Close();
    }
    std::string bytes = ReadFile(fileName);
    const auto Take = [&](std::vector<unsigned char>& oTile)
    {
        WriteAnew(fileName, bytes);
        const NativePointer poFrom = OpenNative(fileName);
        const NativePointer poTo = CreateNative(oFolder.File("copy.krv"), options, 64, 16, {eDT_8U});
        const std::string error = Error(
            [&] {
                EXPECT_TRUE(poTo->TakeBlocks(1, *poFrom, {{0, 0, 0}, {0, 1, 0}, {0, 2, 0}, {0, 3, 0}}));
            });
        return error + (poTo->ReadEncoded(1, {0, 0, 0}, oTile) ? "+" : "-") +
               (poTo->ReadEncoded(1, {0, 2, 0}, oTile) ? "+" : "-") +
               (poTo->ReadEncoded(1, {0, 3, 0}, oTile) ? "+" : "-");
    };
    std::vector<unsigned char> oTile, oLast;
    EXPECT_EQ(Take(oTile), "++-");
    OpenNative(fileName)->ReadEncoded(1, {0, 2, 0}, oLast);
    const std::string tile(oLast.begin(), oLast.end()); // all are alike
    const std::size_t nSecond = bytes.find(tile, bytes.find(tile, Root::FIRST_PIECE) + tile.size());
    ASSERT_NE(nSecond, std::string::npos);
    bytes[nSecond + tile.size() / 2] ^= 1;
    EXPECT_TRUE(Take(oTile).ends_with(", 0: is damaged: its checksum is wrong---"));
}

// The entry of one tile in the place of another's: the checksums are those of tiles, and both name one place.
TEST(KrvdskHostile, TwoTilesInOnePlaceAreNotUpdated)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("twice.krv");
    std::mt19937 oRandom(3);
    {
        const NativePointer poNew = CreateNative(fileName, "BLOCKXSIZE=32 BLOCKYSIZE=32", 32, 32, {eDT_8U, eDT_16S});
        for (int nTime = 0; nTime < 9; ++nTime)
            Make(*poNew, Change::eTiles, oRandom);
        poNew->Close();
    }
    // Of so small an image the directory names the tiles themselves.
    const auto Twice = [](std::string& directory, Root&)
    {
        const std::size_t nFirst = directory.find("Plan"), nSecond = directory.find("Plan", nFirst + 1);
        const std::size_t nEntry = nSecond - nFirst - Entry::BYTES - 1;
        directory.replace(nSecond + nEntry, 8, directory, nFirst + nEntry, 8);
    };
    const std::string twice = Replant(ReadFile(fileName), Twice);
    EXPECT_NE(TellBytes(fileName, twice, eUpdate).find("share the bytes at offset"), std::string::npos);
    EXPECT_NE(TellBytes(fileName, twice).find("channel 2, tile 0, 0: is damaged: its checksum is wrong"),
              std::string::npos);
}

} // namespace

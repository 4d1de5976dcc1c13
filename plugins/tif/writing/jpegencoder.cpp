#include "plugins/tif/writing/jpegencoder.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <csetjmp>
#include <cstdio>
#include <cstdlib>

#include <jerror.h>
#include <jpeglib.h>

namespace krv::plugins::tif
{

namespace
{

using Bytes = JpegHeader::Bytes;
using Component = JpegHeader::Component;

constexpr int DEFAULT_QUALITY = 75;
constexpr unsigned int COEFFICIENTS = 64;
constexpr std::size_t CODE_LENGTHS = 16;
constexpr std::size_t FIRST_STREAM_BYTES = std::size_t{32} << 10;

// The i-th coefficient that a table names is so many places behind the first one of its rows.
constexpr unsigned char ZIGZAG[COEFFICIENTS] = {0,  1,  8,  16, 9,  2,  3,  10, 17, 24, 32, 25, 18, 11, 4,  5,
                                                12, 19, 26, 33, 40, 48, 41, 34, 27, 20, 13, 6,  7,  14, 21, 28,
                                                35, 42, 49, 56, 57, 50, 43, 36, 29, 22, 15, 23, 30, 37, 44, 51,
                                                58, 59, 52, 45, 38, 31, 39, 46, 53, 60, 61, 54, 47, 55, 62, 63};

// Whether a Huffman table has a code for everything that 8-bit pixels may come to.
bool IsComplete(Bytes oTable, bool bDc)
{
    const Bytes oSymbols = oTable.subspan(1 + CODE_LENGTHS);
    const auto HasSymbol = [&](unsigned int nSymbol)
    {
        return std::find(oSymbols.begin(), oSymbols.end(), nSymbol) != oSymbols.end();
    };
    for (unsigned int nSymbol = 0; nSymbol < (bDc ? 12U : 256U); ++nSymbol)
    {
        const unsigned int nBits = nSymbol & 15U;
        const bool bNeeded = bDc || nSymbol == 0 || nSymbol == 0xF0 || (nBits >= 1 && nBits <= 10);
        if (bNeeded && !HasSymbol(nSymbol))
            return false;
    }
    return oSymbols.size() <= 256;
}

// A run of the library, which leaves its functions by a jump when anything fails.
struct Compressor
{
    jpeg_compress_struct moState{};
    jpeg_error_mgr moErrors{};
    jpeg_destination_mgr moTarget{};
    std::jmp_buf moFailed{};
    char moMessage[JMSG_LENGTH_MAX] = {};
    unsigned char* mpStream = nullptr;
    std::size_t mnRoom = 0;

    Compressor() = default;
    ~Compressor()
    {
        jpeg_destroy_compress(&moState);
        std::free(mpStream);
    }
    Compressor(const Compressor&) = delete;
    Compressor& operator=(const Compressor&) = delete;

    std::size_t GetBytes() const { return mnRoom - moTarget.free_in_buffer; }

    static Compressor& From(j_common_ptr pState) { return *static_cast<Compressor*>(pState->client_data); }
    static void OnError(j_common_ptr pState)
    {
        Compressor& oRun = From(pState);
        pState->err->format_message(pState, oRun.moMessage);
        std::longjmp(oRun.moFailed, 1);
    }
    static void OnWarning(j_common_ptr, int) {}
    static boolean Grow(j_compress_ptr pState)
    {
        Compressor& oRun = From(reinterpret_cast<j_common_ptr>(pState));
        const std::size_t nBytes = oRun.mnRoom;
        auto* const pLarger = static_cast<unsigned char*>(std::realloc(oRun.mpStream, 2 * nBytes + FIRST_STREAM_BYTES));
        if (pLarger == nullptr)
            ERREXIT1(pState, JERR_OUT_OF_MEMORY, 0);
        oRun.mpStream = pLarger;
        oRun.mnRoom = 2 * nBytes + FIRST_STREAM_BYTES;
        oRun.moTarget.next_output_byte = oRun.mpStream + nBytes;
        oRun.moTarget.free_in_buffer = oRun.mnRoom - nBytes;
        return TRUE;
    }
    static void Start(j_compress_ptr pState) { Grow(pState); }
    static void End(j_compress_ptr) {}
};

} // namespace

// How a strip or tile is coded.
struct JpegPlan
{
    std::vector<Component> moComponents;
    std::array<Bytes, JpegHeader::TABLES> moTables;    // without bytes: of the asked quality
    std::array<bool, JpegHeader::TABLES> moRepeated{}; // written into the stream
    bool mbOwnCodes = false;                           // Huffman tables are made for the pixels
    std::string moObstacle;
};

namespace
{

// No object with a destructor may live in here: the library may jump out.
bool Run(Compressor& oRun, const JpegPlan& oPlan, bool bColours, int nQuality, const unsigned char* pPixels,
         std::uint32_t nWidth, std::uint32_t nRows)
{
    jpeg_compress_struct& oState = oRun.moState;
    oState.err = jpeg_std_error(&oRun.moErrors);
    oRun.moErrors.error_exit = &Compressor::OnError;
    oRun.moErrors.emit_message = &Compressor::OnWarning;
    oState.client_data = &oRun;
    if (setjmp(oRun.moFailed) != 0)
        return false;
    jpeg_create_compress(&oState);
    oState.client_data = &oRun;
    oRun.moTarget.init_destination = &Compressor::Start;
    oRun.moTarget.empty_output_buffer = &Compressor::Grow;
    oRun.moTarget.term_destination = &Compressor::End;
    oState.dest = &oRun.moTarget;
    oState.image_width = nWidth;
    oState.image_height = nRows;
    oState.input_components = static_cast<int>(oPlan.moComponents.size());
    oState.in_color_space = bColours ? JCS_RGB : JCS_UNKNOWN;
    jpeg_set_defaults(&oState);
    jpeg_set_colorspace(&oState, bColours ? JCS_YCbCr : JCS_UNKNOWN);
    jpeg_set_quality(&oState, nQuality, FALSE);
    oState.write_JFIF_header = FALSE;
    oState.write_Adobe_marker = FALSE;
    oState.optimize_coding = oPlan.mbOwnCodes ? TRUE : FALSE;
    for (unsigned int nAt = 0; nAt < oPlan.moComponents.size(); ++nAt)
    {
        const Component& oPlanned = oPlan.moComponents[nAt];
        jpeg_component_info& oComponent = oState.comp_info[nAt];
        oComponent.component_id = oPlanned.mnNumber;
        oComponent.h_samp_factor = oPlanned.mnAcross;
        oComponent.v_samp_factor = oPlanned.mnDown;
        oComponent.quant_tbl_no = oPlanned.mnQuantisation;
        oComponent.dc_tbl_no = oPlanned.mnDc;
        oComponent.ac_tbl_no = oPlanned.mnAc;
    }
    for (unsigned int nPlace = 0; nPlace < JpegHeader::PLACES; ++nPlace)
    {
        JQUANT_TBL*& pTable = oState.quant_tbl_ptrs[nPlace];
        const Bytes oBytes = oPlan.moTables[JpegHeader::eQuantisation + nPlace];
        if (pTable == nullptr)
            pTable = jpeg_alloc_quant_table(reinterpret_cast<j_common_ptr>(&oState));
        if (nPlace > 1)
            std::copy_n(oState.quant_tbl_ptrs[1]->quantval, COEFFICIENTS, pTable->quantval);
        for (unsigned int nAt = 0; !oBytes.empty() && nAt < COEFFICIENTS; ++nAt)
        {
            const bool bWide = oBytes[0] >> 4 != 0;
            const unsigned int nValue = bWide ? oBytes[1 + 2 * nAt] * 256U + oBytes[2 + 2 * nAt] : oBytes[1 + nAt];
            pTable->quantval[ZIGZAG[nAt]] = static_cast<UINT16>(std::max(1U, nValue));
        }
        pTable->sent_table = oPlan.moRepeated[JpegHeader::eQuantisation + nPlace] ? FALSE : TRUE;
    }
    for (unsigned int nTable = JpegHeader::eDc; nTable < JpegHeader::TABLES; ++nTable)
    {
        const Bytes oBytes = oPlan.moTables[nTable];
        JHUFF_TBL*& pTable = (nTable < JpegHeader::eAc ? oState.dc_huff_tbl_ptrs : oState.ac_huff_tbl_ptrs)[nTable % 4];
        if (oBytes.empty())
            continue;
        if (pTable == nullptr)
            pTable = jpeg_alloc_huff_table(reinterpret_cast<j_common_ptr>(&oState));
        std::copy_n(oBytes.begin(), 1 + CODE_LENGTHS, pTable->bits);
        std::copy(oBytes.begin() + 1 + CODE_LENGTHS, oBytes.end(), pTable->huffval);
        pTable->sent_table = oPlan.moRepeated[nTable] ? FALSE : TRUE;
    }
    jpeg_start_compress(&oState, FALSE);
    const std::size_t nPitch = std::size_t{nWidth} * oPlan.moComponents.size();
    while (oState.next_scanline < nRows)
    {
        auto* pRow = const_cast<unsigned char*>(pPixels + oState.next_scanline * nPitch);
        jpeg_write_scanlines(&oState, &pRow, 1);
    }
    jpeg_finish_compress(&oState);
    return true;
}

} // namespace

JpegEncoder::JpegEncoder(Page& oPage, std::optional<int> oLevel)
    : moPage(oPage), moForm(oPage.GetForm()), mnQuality(oLevel.value_or(DEFAULT_QUALITY))
{
    const Bytes oTables = oPage.GetJpegTables();
    std::uint16_t nAcross = 1;
    std::uint16_t nDown = 1;
    if (moForm.mnPhotometric == PHOTOMETRIC_YCBCR &&
        TIFFGetFieldDefaulted(oPage.GetTiff(), TIFFTAG_YCBCRSUBSAMPLING, &nAcross, &nDown) == 1)
    {
        mnAcross = static_cast<std::uint8_t>(nAcross);
        mnDown = static_cast<std::uint8_t>(nDown);
    }
    moSharedBytes.assign(oTables.begin(), oTables.end());
    moShared = JpegHeader::Read(moSharedBytes);
    moObstacle = MakePlan({}).moObstacle;
}

// Whether the page's table is to be used: those that the stream brought itself are brought again.
bool JpegEncoder::IsShared(unsigned int nTable, const JpegHeader& oLike) const
{
    return moShared.Has(nTable) && !oLike.Has(nTable);
}

void JpegEncoder::PlanComponents(JpegPlan& oPlan, const JpegHeader& oLike) const
{
    const auto IsUsual = [](const Component& oComponent)
    {
        const auto IsSampling = [](unsigned int nFactor)
        {
            return nFactor == 1 || nFactor == 2 || nFactor == 4;
        };
        return IsSampling(oComponent.mnAcross) && IsSampling(oComponent.mnDown);
    };
    const unsigned int nChannels = moForm.GetPlaneChannels();
    if (oLike.moComponents.size() == nChannels &&
        std::all_of(oLike.moComponents.begin(), oLike.moComponents.end(), IsUsual))
    {
        oPlan.moComponents = oLike.moComponents;
        return;
    }
    constexpr const char* NAMES[] = {"\1", "\1\2", "RGB", "CMYK"};
    const bool bColours = moForm.mnPhotometric == PHOTOMETRIC_YCBCR;
    for (unsigned int nAt = 0; nAt < nChannels; ++nAt)
    {
        const std::uint8_t nTable = bColours && nAt > 0 ? 1 : 0;
        const auto nName = bColours ? nAt + 1 : static_cast<unsigned char>(NAMES[nChannels - 1][nAt]);
        oPlan.moComponents.push_back({static_cast<std::uint8_t>(nName), 1, 1, nTable, nTable, nTable});
    }
    if (bColours)
    {
        oPlan.moComponents[0].mnAcross = mnAcross;
        oPlan.moComponents[0].mnDown = mnDown;
    }
}

// The page's Huffman tables, when they have all codes; else own ones, in places that no table of the page has.
void JpegEncoder::PlanCodes(JpegPlan& oPlan, const JpegHeader& oLike) const
{
    const auto Serves = [&](unsigned int nTable)
    {
        return IsShared(nTable, oLike) && IsComplete(moShared.moTables[nTable], nTable < JpegHeader::eAc);
    };
    const bool bShared =
        std::all_of(oPlan.moComponents.begin(), oPlan.moComponents.end(),
                    [&](const Component& oComponent)
                    { return Serves(JpegHeader::eDc + oComponent.mnDc) && Serves(JpegHeader::eAc + oComponent.mnAc); });
    bool bMoved = false;
    const auto Move = [&](unsigned int nKind, std::uint8_t& nPlace)
    {
        const unsigned int nTable = nKind + nPlace;
        if (!bShared && IsShared(nTable, oLike))
        {
            std::uint8_t nFree = 0;
            while (nFree < JpegHeader::PLACES && moShared.Has(nKind + nFree))
                ++nFree;
            if (nFree == JpegHeader::PLACES)
                oPlan.moObstacle = "shared JPEG tables that cannot code all pixels";
            nPlace = nFree % JpegHeader::PLACES;
            bMoved = true;
        }
        oPlan.moTables[nKind + nPlace] = bShared ? moShared.moTables[nTable] : GetStandardTable(nKind + nPlace % 2);
        oPlan.moRepeated[nKind + nPlace] = !bShared;
    };
    for (Component& oComponent : oPlan.moComponents)
    {
        Move(JpegHeader::eDc, oComponent.mnDc);
        Move(JpegHeader::eAc, oComponent.mnAc);
    }
    // Streams without any Huffman table go by the standard's; one of another kind would stay with a reader.
    const bool bBare =
        !oLike.moComponents.empty() &&
        std::all_of(oLike.moTables.begin() + JpegHeader::eDc, oLike.moTables.end(), [](Bytes o) { return o.empty(); });
    oPlan.mbOwnCodes = !bShared && (bMoved || !bBare);
}

JpegPlan JpegEncoder::MakePlan(const JpegHeader& oLike) const
{
    JpegPlan oPlan;
    if (moForm.GetPlaneChannels() > MAX_COMPS_IN_SCAN)
        oPlan.moObstacle = "JPEG of more than four channels";
    else if (!moSharedBytes.empty() && !moShared.mbWhole)
        oPlan.moObstacle = "shared JPEG tables (tag 347) that are damaged";
    if (!oPlan.moObstacle.empty())
        return oPlan;
    PlanComponents(oPlan, oLike);
    PlanCodes(oPlan, oLike);
    for (const Component& oComponent : oPlan.moComponents)
    {
        const unsigned int nTable = JpegHeader::eQuantisation + oComponent.mnQuantisation;
        const bool bShared = IsShared(nTable, oLike);
        oPlan.moTables[nTable] = bShared ? moShared.moTables[nTable] : oLike.moTables[nTable];
        oPlan.moRepeated[nTable] = !bShared;
    }
    return oPlan;
}

std::span<const unsigned char> JpegEncoder::Encode(const unsigned char* pPixels, std::uint32_t nRows, Bytes oLike)
{
    const JpegHeader oHeader = JpegHeader::Read(oLike);
    const JpegPlan oPlan = MakePlan(oHeader.mbWhole ? oHeader : JpegHeader());
    Compressor oRun;
    const bool bColours = moForm.mnPhotometric == PHOTOMETRIC_YCBCR;
    if (!oPlan.moObstacle.empty() || !Run(oRun, oPlan, bColours, mnQuality, pPixels, moForm.mnStrileWidth, nRows))
        throw IOException(moPage.GetFileName(), moPage.GetFileName() + ": encoding failed: " +
                                                    (oPlan.moObstacle.empty() ? oRun.moMessage : oPlan.moObstacle));
    moStream.assign(oRun.mpStream, oRun.mpStream + oRun.GetBytes());
    return moStream;
}

} // namespace krv::plugins::tif

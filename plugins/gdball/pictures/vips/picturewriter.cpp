#include "plugins/gdball/pictures/vips/picturewriter.h"

#include "plugins/gdball/pictures/vips/session.h"
#include "plugins/gdball/pictures/vips/streams.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <exception>
#include <mutex>
#include <set>

#include <unistd.h>

namespace krv::plugins::gdball
{

namespace
{

using krv::gobs::DataType;

// What libvips writes of each kind without changing pixels, but for what compression takes.
struct Limits
{
    PictureKind meKind;
    std::vector<krv::gobs::NativeDataTypeCode> moTypes;
    std::vector<std::size_t> moChannels;
    unsigned int mnMostSide;
};

const Limits& GetLimits(PictureKind eKind)
{
    using namespace krv::gobs;
    static const std::vector<Limits> LIMITS = {{PictureKind::ePng, {eDT_8U, eDT_16U}, {1, 2, 3, 4}, 1000000},
                                               {PictureKind::eJpeg, {eDT_8U}, {1, 3}, 65500},
                                               {PictureKind::eWebp, {eDT_8U}, {3, 4}, 16383},
                                               {PictureKind::ePnm, {eDT_8U, eDT_16U}, {1, 3}, 10000000}};
    return *std::find_if(LIMITS.begin(), LIMITS.end(), [eKind](const Limits& oOne) { return oOne.meKind == eKind; });
}

VipsBandFormat GetFormat(const DataType& oType)
{
    return oType.GetBits() == 8 ? VIPS_FORMAT_UCHAR : VIPS_FORMAT_USHORT;
}

// The waiting pixels as libvips asks for them, from several threads.
struct Waiting
{
    const support::File& moFile;
    std::mutex moMutex;         // guards moError
    std::exception_ptr moError; // the first

    static int OnGenerate(VipsRegion* pRegion, void*, void* pWaiting, void*, gboolean*)
    {
        auto& oWaiting = *static_cast<Waiting*>(pWaiting);
        try
        {
            const VipsRect& oRect = pRegion->valid;
            const std::uint64_t nPixel = VIPS_REGION_SIZEOF_PEL(pRegion);
            for (int nY = oRect.top; nY < oRect.top + oRect.height; ++nY)
                oWaiting.moFile.Read((static_cast<std::uint64_t>(nY) * static_cast<std::uint64_t>(pRegion->im->Xsize) +
                                      static_cast<std::uint64_t>(oRect.left)) *
                                         nPixel,
                                     VIPS_REGION_ADDR(pRegion, oRect.left, nY),
                                     static_cast<std::size_t>(oRect.width) * nPixel);
            return 0;
        }
        catch (...)
        {
            const std::lock_guard oLock(oWaiting.moMutex);
            if (!oWaiting.moError)
                oWaiting.moError = std::current_exception();
            return -1;
        }
    }
};

Owned<VipsOperation> NewSaver(PictureKind eKind, const PictureOptions& oOptions)
{
    const auto nQuality = static_cast<int>(oOptions.mnQuality);
    switch (eKind)
    {
    case PictureKind::ePng:
    {
        Owned<VipsOperation> poSaver(vips_operation_new("pngsave_target"));
        g_object_set(poSaver.get(), "compression", static_cast<int>(oOptions.mnCompression), nullptr);
        return poSaver;
    }
    case PictureKind::eJpeg:
    {
        Owned<VipsOperation> poSaver(vips_operation_new("jpegsave_target"));
        g_object_set(poSaver.get(), "Q", nQuality, "interlace", static_cast<gboolean>(oOptions.mbProgressive),
                     "optimize_coding", TRUE, nullptr);
        return poSaver;
    }
    case PictureKind::eWebp:
    {
        Owned<VipsOperation> poSaver(vips_operation_new("webpsave_target"));
        g_object_set(poSaver.get(), "Q", nQuality, "lossless", static_cast<gboolean>(oOptions.mbLossless), nullptr);
        return poSaver;
    }
    default:
        return Owned<VipsOperation>(vips_operation_new("ppmsave_target"));
    }
}

// A saver of libvips hands its work to threads that libvips keeps for a while. They do not follow into a forked
// process, where it would wait for them for good.
void CheckThreads(const std::string& fileName)
{
    static const pid_t snFirst = ::getpid();
    if (::getpid() != snFirst)
        throw DataException(fileName + ": a process that was forked from one that wrote pictures cannot write any");
}

} // namespace

PictureOptions PictureOptions::Parse(PictureKind eKind, const std::string& options)
{
    PictureOptions oOptions;
    support::Options oKeys;
    if (eKind == PictureKind::ePng)
        oKeys.AddNumber("COMPRESSION", oOptions.mnCompression, 0, 9);
    if (eKind == PictureKind::eJpeg)
        oKeys.AddFlag("PROGRESSIVE", oOptions.mbProgressive);
    if (eKind == PictureKind::eJpeg || eKind == PictureKind::eWebp)
        oKeys.AddNumber("QUALITY", oOptions.mnQuality, 1, 100);
    oKeys.Parse(options);
    oOptions.mbLossless = !oKeys.IsGiven("QUALITY");
    return oOptions;
}

PictureWriter::PictureWriter(const std::string& fileName, PictureKind eKind, const PictureOptions& oOptions)
    : FileWriter(fileName), meKind(eKind), moOptions(oOptions)
{
}

PictureWriter::~PictureWriter() = default;

void PictureWriter::Make(unsigned int nWidth, unsigned int nHeight, const std::vector<DataType>& oTypes,
                         const Place& oPlace)
{
    const std::string name = GetPictureName(meKind);
    const auto Refuse = [&](const std::string& what)
    {
        throw DataException(GetFileName() + ": " + what, oPlace);
    };
    const Limits& oLimits = GetLimits(meKind);
    const DataType& oType = oTypes.front();
    if (std::any_of(oTypes.begin(), oTypes.end(), [&oType](const DataType& oOne) { return oOne != oType; }))
        Refuse(name + " pictures have channels of one type");
    const auto IsType = [&oType](krv::gobs::NativeDataTypeCode eCode)
    {
        return oType == DataType(eCode);
    };
    if (std::none_of(oLimits.moTypes.begin(), oLimits.moTypes.end(), IsType))
    {
        std::string all;
        for (const auto eCode : oLimits.moTypes)
            all += (all.empty() ? "" : ", ") + DataType(eCode).Describe();
        Refuse(name + " pictures hold " + all + ", not " + oType.Describe());
    }
    const auto& oChannels = oLimits.moChannels;
    if (std::find(oChannels.begin(), oChannels.end(), oTypes.size()) == oChannels.end())
    {
        std::string all;
        for (const std::size_t nChannels : oChannels)
            all += (all.empty() ? "" : nChannels == oChannels.back() ? " or " : ", ") + std::to_string(nChannels);
        Refuse(name + " pictures have " + all + " channels, not " + std::to_string(oTypes.size()));
    }
    if (std::max(nWidth, nHeight) > oLimits.mnMostSide)
        Refuse(name + " pictures have sides of at most " + std::to_string(oLimits.mnMostSide) + " pixels");
    constexpr unsigned int BLOCK_SIZE = 256;
    support::ImageLayout oLayout(nWidth, nHeight, BLOCK_SIZE, BLOCK_SIZE,
                                 {support::Plane{oType, static_cast<unsigned int>(oTypes.size()), {}}});
    const std::uint64_t nBytes = support::PlainSource::CountBytes(oLayout);
    MakeScratch(oPlace);
    GetFile()->Write(nBytes - 1, "", 1);
    mpoPixels = std::make_shared<support::PlainSource>(GetFile(), 0, std::move(oLayout), [this] { Change(); });
    mbChanged = true;
}

bool PictureWriter::IsLossless() const
{
    return meKind != PictureKind::eJpeg && (meKind != PictureKind::eWebp || moOptions.mbLossless);
}

VipsInterpretation PictureWriter::GetMeaning() const
{
    const bool bColours = mpoPixels->GetLayout().GetChannelCount() > 2;
    if (GetFormat(mpoPixels->GetLayout().GetPlane(0).moType) == VIPS_FORMAT_USHORT)
        return bColours ? VIPS_INTERPRETATION_RGB16 : VIPS_INTERPRETATION_GREY16;
    return bColours ? VIPS_INTERPRETATION_sRGB : VIPS_INTERPRETATION_B_W;
}

void PictureWriter::Change()
{
    CheckWritable();
    mbChanged = true;
}

void PictureWriter::Store()
{
    if (!mbChanged && IsNamed())
        return;
    CheckThreads(GetFileName());
    StoreAnew([this](support::File& oFile) { Save(oFile); });
    mbChanged = false;
}

void PictureWriter::Save(support::File& oFile) const
{
    const support::ImageLayout& oLayout = mpoPixels->GetLayout();
    const VipsBandFormat eFormat = GetFormat(oLayout.GetPlane(0).moType);
    const unsigned int nChannels = oLayout.GetChannelCount();
    std::set<std::string> oSaid;
    std::exception_ptr oError;
    Waiting oWaiting{*GetFile(), {}, {}};
    Listener oListener(GetFileName(), oSaid);
    const Owned<VipsImage> poImage(vips_image_new());
    vips_image_init_fields(poImage.get(), static_cast<int>(oLayout.GetWidth()), static_cast<int>(oLayout.GetHeight()),
                           static_cast<int>(nChannels), eFormat, VIPS_CODING_NONE, GetMeaning(), 1.0, 1.0);
    vips_image_set_int(poImage.get(), VIPS_META_CONCURRENCY, 1);
    bool bDone = vips_image_pipelinev(poImage.get(), VIPS_DEMAND_STYLE_THINSTRIP, nullptr) == 0 &&
                 vips_image_generate(poImage.get(), nullptr, &Waiting::OnGenerate, nullptr, &oWaiting, nullptr) == 0;
    const Owned<VipsOperation> poSaver = NewSaver(meKind, moOptions);
    const Owned<VipsTarget> poTarget = MakeTarget(oFile, oError);
    g_object_set(poSaver.get(), "in", poImage.get(), "target", poTarget.get(), nullptr);
    bDone = bDone && vips_object_build(VIPS_OBJECT(poSaver.get())) == 0;
    vips_object_unref_outputs(VIPS_OBJECT(poSaver.get()));
    if (oError || oWaiting.moError)
        std::rethrow_exception(oError ? oError : oWaiting.moError);
    if (!bDone)
        oListener.Fail("the picture cannot be written");
}

} // namespace krv::plugins::gdball

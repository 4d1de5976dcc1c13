#include "plugins/gdball/pictures/vips/decoder.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <new>

namespace krv::plugins::gdball
{

namespace
{

// What a decoder may hold that needs all of a picture.
constexpr std::uint64_t MOST_WHOLE = std::uint64_t{384} << 20;
// Rows that libvips keeps of a picture in order.
constexpr std::uint64_t MOST_ROWS = std::uint64_t{64} << 20;
constexpr unsigned int KEPT_ROWS = 16;
constexpr unsigned int PASSED_ROWS = 64; // at once, over those that nobody wants

// The loader of pictures in WebP, which libvips runs over all of a picture in threads of its own unless it says that it
// goes from row to row, as it does.
VipsForeignFlags TellSequential(VipsForeignLoad*)
{
    return VIPS_FOREIGN_SEQUENTIAL;
}

void ChangeLoader(gpointer pClass, gpointer)
{
    VIPS_OBJECT_CLASS(pClass)->nickname = "krv_webpload";
    VIPS_FOREIGN_CLASS(pClass)->priority = -1000; // nobody else's choice
    VIPS_FOREIGN_LOAD_CLASS(pClass)->get_flags = &TellSequential;
}

GType GetWebpLoader()
{
    static const GType snType = []
    {
        const GType nLoader = vips_type_find("VipsOperation", "webpload_source");
        if (nLoader == 0)
            return nLoader;
        GTypeQuery oQuery = {};
        g_type_query(nLoader, &oQuery);
        return g_type_register_static_simple(nLoader, "KrvWebpLoad", oQuery.class_size, &ChangeLoader,
                                             oQuery.instance_size, nullptr, GTypeFlags{});
    }();
    return snType;
}

VipsOperation* NewLoader(PictureKind eKind)
{
    switch (eKind)
    {
    case PictureKind::ePng:
        return vips_operation_new("pngload_source");
    case PictureKind::eJpeg:
        return vips_operation_new("jpegload_source");
    case PictureKind::eWebp:
        return GetWebpLoader() != 0 ? VIPS_OPERATION(g_object_new(GetWebpLoader(), nullptr)) : nullptr;
    case PictureKind::eGif:
        return vips_operation_new("gifload_source");
    case PictureKind::ePnm:
        return vips_operation_new("ppmload_source");
    case PictureKind::eHeif:
        return vips_operation_new("heifload_source");
    case PictureKind::eRadiance:
        return vips_operation_new("radload_source");
    // Their libraries open files by name.
    case PictureKind::eFits:
        return vips_operation_new("fitsload");
    case PictureKind::eExr:
        return vips_operation_new("openexrload");
    }
    return nullptr;
}

bool HasPages(PictureKind eKind)
{
    return eKind == PictureKind::eGif || eKind == PictureKind::eWebp || eKind == PictureKind::eHeif;
}

} // namespace

Decoder::Decoder(Picture& oPicture) : moPicture(oPicture)
{
    // Their libraries want the file in memory.
    const bool bLoaded = oPicture.meKind == PictureKind::eGif || oPicture.meKind == PictureKind::eWebp;
    if (bLoaded && oPicture.mpoFile->GetSize() > MOST_WHOLE)
        throw FileFormatException(oPicture.mpoFile->GetName(),
                                  oPicture.mpoFile->GetName() + ": a " + GetPictureName(oPicture.meKind) +
                                      " file of more than " + std::to_string(MOST_WHOLE >> 20) + " MiB is not read");
    if (oPicture.mnPage != 1)
        CheckPage();
    Listener oListener(oPicture.mpoFile->GetName(), oPicture.moSaid);
    const std::string trouble = std::string("the ") + GetPictureName(oPicture.meKind) + " picture cannot be opened";
    mpoOperation.reset(NewLoader(oPicture.meKind));
    if (!mpoOperation)
        Fail(oListener, trouble);
    auto* const pOperation = mpoOperation.get();
    if (g_object_class_find_property(G_OBJECT_GET_CLASS(pOperation), "source") != nullptr)
    {
        mpoSource = MakeSource(oPicture.mpoFile, oPicture.moClaims.moHeader, oPicture.moClaims.mnSkipped, moError);
        g_object_set(pOperation, "source", mpoSource.get(), nullptr);
    }
    else
        g_object_set(pOperation, "filename", oPicture.mpoFile->GetName().c_str(), nullptr);
    const VipsFailOn eFail = oPicture.meKind == PictureKind::eJpeg ? VIPS_FAIL_ON_WARNING : VIPS_FAIL_ON_ERROR;
    g_object_set(pOperation, "access", VIPS_ACCESS_SEQUENTIAL, "fail_on", eFail, nullptr);
    if (HasPages(oPicture.meKind))
        g_object_set(pOperation, "page", static_cast<int>(oPicture.mnPage) - 1, nullptr);
    g_signal_connect(pOperation, "invalidate", G_CALLBACK(OnTrouble), this);
    // Not by the cache of operations, whoever set that up.
    const bool bBuilt = vips_object_build(VIPS_OBJECT(pOperation)) == 0;
    VipsImage* pImage = nullptr;
    if (bBuilt)
        g_object_get(pOperation, "out", &pImage, nullptr);
    mpoImage.reset(pImage);
    vips_object_unref_outputs(VIPS_OBJECT(pOperation));
    if (!bBuilt || moError || mbTrouble)
        Fail(oListener, trouble);
    if (pImage->Coding == VIPS_CODING_RAD)
    {
        VipsImage* pReal = nullptr;
        if (vips_rad2float(pImage, &pReal, nullptr) != 0)
            Fail(oListener, trouble);
        mpoImage.reset(pReal);
    }
    else if (pImage->Coding != VIPS_CODING_NONE)
        Fail(oListener, trouble);
    CheckMemory();
}

Decoder::~Decoder()
{
    g_signal_handlers_disconnect_by_data(mpoOperation.get(), this);
}

void Decoder::OnTrouble(VipsOperation*, void* pThis)
{
    static_cast<Decoder*>(pThis)->mbTrouble = true;
}

void Decoder::Fail(Listener& oListener, const std::string& what) const
{
    if (moError)
        std::rethrow_exception(moError);
    oListener.Fail(what);
}

void Decoder::CheckPage() const
{
    Picture oFirst = moPicture;
    oFirst.mnPage = 1;
    const std::string& name = moPicture.mpoFile->GetName();
    const Decoder oDecoder(oFirst);
    const int nPages = HasPages(moPicture.meKind) ? vips_image_get_n_pages(&oDecoder.GetImage()) : 1;
    if (static_cast<unsigned int>(nPages) < moPicture.mnPage)
        throw DataException(name + ": there is no page " + std::to_string(moPicture.mnPage) + "; the last one is " +
                            std::to_string(nPages));
}

void Decoder::CheckMemory() const
{
    const std::string& name = moPicture.mpoFile->GetName();
    const std::uint64_t nRow = VIPS_IMAGE_SIZEOF_LINE(mpoImage.get());
    const Claims& oClaims = moPicture.moClaims;
    const std::uint64_t nWhole = !oClaims.mbWhole              ? 0
                                 : oClaims.mnCoefficients != 0 ? oClaims.mnCoefficients
                                                               : nRow * static_cast<std::uint64_t>(mpoImage->Ysize);
    if (nWhole <= MOST_WHOLE && nRow * KEPT_ROWS <= MOST_ROWS)
        return;
    throw FileFormatException(
        name, name + ": " + std::to_string(mpoImage->Xsize) + " x " + std::to_string(mpoImage->Ysize) +
                  " pixels of such a " + GetPictureName(moPicture.meKind) + " picture take more than " +
                  std::to_string((nWhole > MOST_WHOLE ? MOST_WHOLE : MOST_ROWS) >> 20) + " MiB while they are decoded");
}

// A region belongs to the thread that made it; the decoder may be used by another one next time.
void Decoder::Prepare(unsigned int nRows, VipsRegion* pTarget)
{
    const VipsRect oRect = {0, static_cast<int>(mnNext), mpoImage->Xsize, static_cast<int>(nRows)};
    Listener oListener(moPicture.mpoFile->GetName(), moPicture.moSaid);
    const Owned<VipsRegion> poRegion(vips_region_new(mpoImage.get()));
    const int nFailed = pTarget != nullptr ? vips_region_prepare_to(poRegion.get(), pTarget, &oRect, 0, 0)
                                           : vips_region_prepare(poRegion.get(), &oRect);
    if (nFailed != 0 || moError || mbTrouble)
        Fail(oListener, "rows from " + std::to_string(mnNext) + " on cannot be decoded");
    mnNext += nRows;
}

void Decoder::Read(unsigned int nRows, unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nPixel = VIPS_IMAGE_SIZEOF_PEL(mpoImage.get());
    // What lies between the rows is pixels of the target to libvips.
    const bool bPixels = nPitch % nPixel == 0;
    const int nWidth = bPixels ? static_cast<int>(nPitch / nPixel) : mpoImage->Xsize;
    const unsigned int nStep = bPixels ? nRows : 1;
    for (const unsigned int nEnd = mnNext + nRows; mnNext < nEnd; pTarget += nStep * nPitch)
    {
        const Owned<VipsImage> poTarget(
            vips_image_new_from_memory(pTarget, std::size_t{nStep} * static_cast<std::size_t>(nWidth) * nPixel, nWidth,
                                       static_cast<int>(nStep), mpoImage->Bands, mpoImage->BandFmt));
        const Owned<VipsRegion> poRegion(poTarget ? vips_region_new(poTarget.get()) : nullptr);
        const VipsRect oRect = {0, 0, mpoImage->Xsize, static_cast<int>(nStep)};
        if (!poRegion || vips_region_image(poRegion.get(), &oRect) != 0)
            throw std::bad_alloc();
        Prepare(nStep, poRegion.get());
    }
}

void Decoder::Skip(unsigned int nRows)
{
    for (const unsigned int nEnd = mnNext + nRows; mnNext < nEnd;)
        Prepare(std::min(nEnd - mnNext, PASSED_ROWS), nullptr);
}

} // namespace krv::plugins::gdball

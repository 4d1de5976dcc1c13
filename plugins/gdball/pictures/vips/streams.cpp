#include "plugins/gdball/pictures/vips/streams.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <vector>

namespace krv::plugins::gdball
{

namespace
{

struct Reading
{
    std::shared_ptr<const support::File> mpoFile;
    std::string moBefore;
    std::uint64_t mnSkipped;
    std::exception_ptr& moError;
    std::uint64_t mnPlace = 0;
    // Decoders ask for a few bytes at a time: these are held.
    std::vector<unsigned char> moHeld;
    std::uint64_t mnHeldFrom = 0;

    std::int64_t GetSize() const { return static_cast<std::int64_t>(moBefore.size() + mpoFile->GetSize() - mnSkipped); }

    std::size_t ReadFile(std::uint64_t nFrom, unsigned char* pTarget, std::size_t nBytes)
    {
        constexpr std::size_t HELD_BYTES = std::size_t{1} << 16;
        if (nFrom < mnHeldFrom || nFrom >= mnHeldFrom + moHeld.size())
        {
            if (nBytes >= HELD_BYTES)
                return mpoFile->ReadUpTo(nFrom, pTarget, nBytes);
            moHeld.resize(HELD_BYTES);
            mnHeldFrom = nFrom;
            moHeld.resize(mpoFile->ReadUpTo(nFrom, moHeld.data(), moHeld.size()));
        }
        const auto nAt = static_cast<std::size_t>(nFrom - mnHeldFrom);
        const std::size_t nRead = std::min(nBytes, moHeld.size() - nAt);
        std::copy_n(moHeld.data() + nAt, nRead, pTarget);
        return nRead;
    }

    std::size_t Read(unsigned char* pTarget, std::size_t nBytes)
    {
        std::size_t nRead = 0;
        if (mnPlace < moBefore.size())
        {
            nRead = std::min<std::size_t>(nBytes, moBefore.size() - mnPlace);
            std::memcpy(pTarget, moBefore.data() + mnPlace, nRead);
        }
        else
            nRead = ReadFile(mnSkipped + mnPlace - moBefore.size(), pTarget, nBytes);
        mnPlace += nRead;
        return nRead;
    }
};

// A source of libvips. Its own class for such calls sends them as signals, which cost more than they carry.
struct FileSource
{
    VipsSource moParent;
    Reading* mpoReading;
};

gint64 OnRead(VipsSource* pSource, void* pTarget, std::size_t nBytes)
{
    Reading& oReading = *reinterpret_cast<FileSource*>(pSource)->mpoReading;
    try
    {
        return static_cast<gint64>(oReading.Read(static_cast<unsigned char*>(pTarget), nBytes));
    }
    catch (...)
    {
        oReading.moError = std::current_exception();
        return -1;
    }
}

gint64 OnSeek(VipsSource* pSource, gint64 nOffset, int nWhence)
{
    Reading& oReading = *reinterpret_cast<FileSource*>(pSource)->mpoReading;
    const std::int64_t nFrom = nWhence == SEEK_SET   ? 0
                               : nWhence == SEEK_CUR ? static_cast<std::int64_t>(oReading.mnPlace)
                                                     : oReading.GetSize();
    std::int64_t nPlace = 0;
    if (__builtin_add_overflow(nFrom, static_cast<std::int64_t>(nOffset), &nPlace) || nPlace < 0)
        return -1;
    oReading.mnPlace = static_cast<std::uint64_t>(nPlace);
    return nPlace;
}

gpointer spFileSourceParent = nullptr;

void OnFinalize(GObject* pObject)
{
    delete reinterpret_cast<FileSource*>(pObject)->mpoReading;
    G_OBJECT_CLASS(spFileSourceParent)->finalize(pObject);
}

void FillClass(gpointer pClass, gpointer)
{
    spFileSourceParent = g_type_class_peek_parent(pClass);
    G_OBJECT_CLASS(pClass)->finalize = &OnFinalize;
    VIPS_OBJECT_CLASS(pClass)->nickname = "krv_file";
    VIPS_SOURCE_CLASS(pClass)->read = &OnRead;
    VIPS_SOURCE_CLASS(pClass)->seek = &OnSeek;
}

GType GetFileSourceType()
{
    static const GType snType =
        g_type_register_static_simple(VIPS_TYPE_SOURCE, "KrvFileSource", sizeof(VipsSourceClass), &FillClass,
                                      sizeof(FileSource), nullptr, GTypeFlags{});
    return snType;
}

struct Writing
{
    support::File& moFile;
    std::exception_ptr& moError;
    std::uint64_t mnPlace = 0;
};

gint64 OnWrite(VipsTargetCustom*, const void* pBytes, gint64 nBytes, void* pWriting)
{
    auto& oWriting = *static_cast<Writing*>(pWriting);
    try
    {
        oWriting.moFile.Write(oWriting.mnPlace, pBytes, static_cast<std::size_t>(nBytes));
        oWriting.mnPlace += static_cast<std::uint64_t>(nBytes);
        return nBytes;
    }
    catch (...)
    {
        oWriting.moError = std::current_exception();
        return -1;
    }
}

void DropWriting(gpointer pWriting, GClosure*)
{
    delete static_cast<Writing*>(pWriting);
}

} // namespace

Owned<VipsSource> MakeSource(std::shared_ptr<const support::File> poFile, const std::string& before,
                             std::uint64_t nSkipped, std::exception_ptr& oError)
{
    auto poReading = std::make_unique<Reading>(Reading{std::move(poFile), before, nSkipped, oError, 0, {}, 0});
    Owned<VipsSource> poSource(VIPS_SOURCE(g_object_new(GetFileSourceType(), nullptr)));
    reinterpret_cast<FileSource*>(poSource.get())->mpoReading = poReading.release();
    vips_object_build(VIPS_OBJECT(poSource.get()));
    return poSource;
}

Owned<VipsTarget> MakeTarget(support::File& oFile, std::exception_ptr& oError)
{
    Owned<VipsTarget> poTarget(VIPS_TARGET(vips_target_custom_new()));
    auto* const poWriting = new Writing{oFile, oError};
    g_signal_connect_data(poTarget.get(), "write", G_CALLBACK(OnWrite), poWriting, &DropWriting, GConnectFlags{});
    return poTarget;
}

} // namespace krv::plugins::gdball

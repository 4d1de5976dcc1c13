#include "plugins/gdball/pictures/vips/streams.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

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
    std::int64_t mnPlace = 0;

    std::int64_t GetSize() const { return static_cast<std::int64_t>(moBefore.size() + mpoFile->GetSize() - mnSkipped); }
};

gint64 OnRead(VipsSourceCustom*, void* pTarget, gint64 nBytes, void* pReading)
{
    auto& oReading = *static_cast<Reading*>(pReading);
    try
    {
        const auto nPlace = static_cast<std::uint64_t>(oReading.mnPlace);
        std::size_t nRead = 0;
        if (nPlace < oReading.moBefore.size())
        {
            nRead = std::min<std::size_t>(static_cast<std::size_t>(nBytes), oReading.moBefore.size() - nPlace);
            std::memcpy(pTarget, oReading.moBefore.data() + nPlace, nRead);
        }
        else
            nRead = oReading.mpoFile->ReadUpTo(oReading.mnSkipped + nPlace - oReading.moBefore.size(), pTarget,
                                               static_cast<std::size_t>(nBytes));
        oReading.mnPlace += static_cast<gint64>(nRead);
        return static_cast<gint64>(nRead);
    }
    catch (...)
    {
        oReading.moError = std::current_exception();
        return -1;
    }
}

gint64 OnSeek(VipsSourceCustom*, gint64 nOffset, int nWhence, void* pReading)
{
    auto& oReading = *static_cast<Reading*>(pReading);
    const std::int64_t nFrom = nWhence == SEEK_SET ? 0 : nWhence == SEEK_CUR ? oReading.mnPlace : oReading.GetSize();
    std::int64_t nPlace = 0;
    if (__builtin_add_overflow(nFrom, static_cast<std::int64_t>(nOffset), &nPlace) || nPlace < 0)
        return -1;
    oReading.mnPlace = nPlace;
    return nPlace;
}

void DropReading(gpointer pReading, GClosure*)
{
    delete static_cast<Reading*>(pReading);
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
    Owned<VipsSource> poSource(VIPS_SOURCE(vips_source_custom_new()));
    auto* const poReading = new Reading{std::move(poFile), before, nSkipped, oError};
    g_signal_connect_data(poSource.get(), "read", G_CALLBACK(OnRead), poReading, &DropReading, GConnectFlags{});
    g_signal_connect(poSource.get(), "seek", G_CALLBACK(OnSeek), poReading);
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

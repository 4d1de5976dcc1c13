#include "tests/plugins/krvdsk/disk.h"

#include <algorithm>
#include <stdexcept>

#include <sys/syscall.h>
#include <unistd.h>

namespace
{

std::vector<krv::test::DiskCall>* spoCalls = nullptr;

void Note(krv::test::DiskCall oCall)
{
    if (spoCalls != nullptr)
        spoCalls->push_back(std::move(oCall));
}

} // namespace

extern "C" ssize_t pwrite(int nDescriptor, const void* pBytes, std::size_t nBytes, off_t nOffset)
{
    const ssize_t nDone = ::syscall(SYS_pwrite64, nDescriptor, pBytes, nBytes, nOffset);
    if (nDone > 0)
        Note({krv::test::DiskCall::Kind::eWrite, static_cast<std::uint64_t>(nOffset),
              std::string(static_cast<const char*>(pBytes), static_cast<std::size_t>(nDone))});
    return nDone;
}

extern "C" int fdatasync(int nDescriptor)
{
    Note({krv::test::DiskCall::Kind::eSync, 0, {}});
    // What is recorded is not read from this disk.
    return spoCalls != nullptr ? 0 : static_cast<int>(::syscall(SYS_fdatasync, nDescriptor));
}

extern "C" int ftruncate(int nDescriptor, off_t nBytes) noexcept
{
    Note({krv::test::DiskCall::Kind::eCut, static_cast<std::uint64_t>(nBytes), {}});
    return static_cast<int>(::syscall(SYS_ftruncate, nDescriptor, nBytes));
}

namespace krv::test
{

Recording::Recording()
{
    if (spoCalls != nullptr)
        throw std::logic_error("one recording at a time");
    spoCalls = new std::vector<DiskCall>;
}

Recording::~Recording()
{
    delete spoCalls;
    spoCalls = nullptr;
}

const std::vector<DiskCall>& Recording::GetCalls() const
{
    return *spoCalls;
}

namespace
{

void Apply(std::string& disk, const DiskCall& oCall, std::mt19937* poTear)
{
    constexpr std::size_t SECTOR = 512;
    if (oCall.meKind == DiskCall::Kind::eCut)
        return disk.resize(oCall.mnOffset);
    for (std::size_t nAt = 0, nPart = 0; nAt < oCall.moBytes.size(); nAt += nPart)
    {
        const std::size_t nTo = oCall.mnOffset + nAt;
        nPart = std::min(SECTOR - nTo % SECTOR, oCall.moBytes.size() - nAt);
        if (poTear != nullptr && (*poTear)() % 2 == 0)
            continue;
        disk.resize(std::max(disk.size(), nTo + nPart));
        disk.replace(nTo, nPart, oCall.moBytes, nAt, nPart);
    }
}

} // namespace

std::string Crash(const std::string& before, const std::vector<DiskCall>& oCalls, std::size_t nCalls,
                  std::mt19937& oRandom)
{
    std::string disk = before;
    std::vector<const DiskCall*> oPending;
    for (std::size_t nAt = 0; nAt < nCalls; ++nAt)
    {
        if (oCalls[nAt].meKind != DiskCall::Kind::eSync)
        {
            oPending.push_back(&oCalls[nAt]);
            continue;
        }
        for (const DiskCall* const pCall : oPending)
            Apply(disk, *pCall, nullptr);
        oPending.clear();
    }
    // All of it, in order, as often as none: a program that dies alone loses nothing.
    const unsigned int nWay = oRandom() % 8;
    if (nWay == 0)
        return disk;
    if (nWay > 1)
        std::shuffle(oPending.begin(), oPending.end(), oRandom);
    for (const DiskCall* const pCall : oPending)
    {
        const unsigned int nFate = nWay == 1 ? 0 : oRandom() % 3;
        if (nFate < 2)
            Apply(disk, *pCall, nFate == 0 ? nullptr : &oRandom);
    }
    return disk;
}

} // namespace krv::test

#include "benchmarks/overviews/byhand.h"

#include <fcntl.h>
#include <immintrin.h>
#include <tiffio.h>
#include <unistd.h>

#include <cstdint>
#include <cstring>
#include <stdexcept>
#include <vector>

namespace krv::benchmarks
{

namespace
{

constexpr unsigned int TILE = 256;
constexpr unsigned int LEVELS = 5;
constexpr std::size_t TILE_BYTES = std::size_t{TILE} * TILE * 3;
constexpr unsigned long long FIRST_TILE = 16384; // not a multiple of the size of a tile

__m128i Load(const void* p)
{
    return _mm_loadu_si128(static_cast<const __m128i*>(p));
}

// Four pixels of two rows to two sums; the last two words are spare.
void AddBytes(const std::uint8_t* a, const std::uint8_t* b, unsigned int nPixels, std::uint16_t* s)
{
    const __m128i oOrder = _mm_setr_epi8(0, 3, 1, 4, 2, 5, 6, 9, 7, 10, 8, 11, -1, -1, -1, -1);
    const __m128i oOnes = _mm_set1_epi8(1);
    for (unsigned int n = 0; n < nPixels; n += 4, a += 12, b += 12, s += 6)
        _mm_storeu_si128(reinterpret_cast<__m128i*>(s),
                         _mm_add_epi16(_mm_maddubs_epi16(_mm_shuffle_epi8(Load(a), oOrder), oOnes),
                                       _mm_maddubs_epi16(_mm_shuffle_epi8(Load(b), oOrder), oOnes)));
}

void AddWords(const std::uint16_t* a, const std::uint16_t* b, unsigned int nPixels, std::uint16_t* s)
{
    for (unsigned int n = 0; n < nPixels; n += 2, a += 6, b += 6, s += 3)
    {
        const __m128i o = _mm_add_epi16(Load(a), Load(b));
        _mm_storel_epi64(reinterpret_cast<__m128i*>(s), _mm_add_epi16(o, _mm_srli_si128(o, 6)));
    }
}

void Means(const std::uint16_t* s, unsigned int nCount, unsigned int nShift, std::uint8_t* t)
{
    const __m128i oShift = _mm_cvtsi32_si128(static_cast<int>(nShift));
    const __m128i oHalf = _mm_set1_epi16(static_cast<short>((1 << (nShift - 1)) - 1));
    const __m128i oOne = _mm_set1_epi16(1);
    for (unsigned int n = 0; n < nCount; n += 8)
    {
        const __m128i o = Load(s + n);
        const __m128i oOdd = _mm_and_si128(_mm_srl_epi16(o, oShift), oOne);
        const __m128i oMean = _mm_srl_epi16(_mm_add_epi16(_mm_add_epi16(o, oHalf), oOdd), oShift);
        _mm_storel_epi64(reinterpret_cast<__m128i*>(t + n), _mm_packus_epi16(oMean, oMean));
    }
}

// What level 32 is made of goes beyond 16 bits.
void LastMeans(const std::uint16_t* a, const std::uint16_t* b, unsigned int nPixels, std::uint8_t* t)
{
    for (unsigned int n = 0; n < nPixels; ++n)
        for (unsigned int c = 0; c < 3; ++c)
        {
            const std::uint32_t nSum = std::uint32_t{a[6 * n + c]} + a[6 * n + 3 + c] + b[6 * n + c] + b[6 * n + 3 + c];
            t[3 * n + c] = static_cast<std::uint8_t>((nSum + 511 + (nSum >> 10 & 1)) >> 10);
        }
}

struct LevelRow
{
    std::vector<std::uint8_t> moTiles; // a row of tiles beside each other
    unsigned int mnRow = 0;
};

} // namespace

unsigned long long GetTileOffset(const SceneFile& oScene, unsigned int nLevel, unsigned int nColumn, unsigned int nRow)
{
    unsigned long long nTiles = 0;
    for (unsigned int k = 2; k < nLevel; k *= 2)
        nTiles += 1ull * (oScene.mnSize / k / TILE) * (oScene.mnSize / k / TILE);
    return FIRST_TILE + (nTiles + 1ull * nRow * (oScene.mnSize / nLevel / TILE) + nColumn) * TILE_BYTES;
}

void BuildByHand(const SceneFile& oScene, const std::string& file, const std::string& target, bool bSync)
{
    TIFF* const poTiff = TIFFOpen(file.c_str(), "rm");
    const int nFile = open(target.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0644);
    if (poTiff == nullptr || nFile < 0)
        throw std::runtime_error("cannot open the files of the loop by hand");
    const unsigned int nAcross = oScene.mnSize / TILE;
    std::vector<std::uint8_t> oSource(TILE_BYTES + 16);
    std::vector<std::uint8_t> aLevels[LEVELS + 1];
    for (unsigned int k = 1; k <= LEVELS; ++k)
        aLevels[k].resize((nAcross >> k) * TILE_BYTES + 16);
    alignas(64) std::uint16_t aSums[LEVELS][2][TILE * 3 / 2 + 16];
    for (unsigned int nTileRow = 0; nTileRow < nAcross; ++nTileRow)
    {
        for (unsigned int nTile = 0; nTile < nAcross; ++nTile)
        {
            if (TIFFReadEncodedTile(poTiff, nTileRow * nAcross + nTile, oSource.data(), TILE_BYTES) < 0)
                throw std::runtime_error("libtiff cannot read");
            const auto Target = [&](unsigned int k, unsigned int nY)
            {
                const unsigned int nRow = ((nTileRow * TILE) >> k) + nY;
                const unsigned int nX = (nTile * TILE) >> k;
                return aLevels[k].data() + (nX / TILE) * TILE_BYTES + ((nRow % TILE) * TILE + nX % TILE) * 3;
            };
            for (unsigned int y = 0; y < TILE / 2; ++y)
            {
                const std::uint8_t* const pRow = oSource.data() + std::size_t{y} * 2 * TILE * 3;
                AddBytes(pRow, pRow + TILE * 3, TILE, aSums[1][y % 2]);
                Means(aSums[1][y % 2], TILE / 2 * 3, 2, Target(1, y));
                unsigned int nY = y;
                for (unsigned int k = 2; k <= LEVELS && nY % 2 != 0; ++k)
                {
                    nY /= 2;
                    if (k == LEVELS)
                    {
                        LastMeans(aSums[k - 1][0], aSums[k - 1][1], TILE >> k, Target(k, nY));
                        break;
                    }
                    AddWords(aSums[k - 1][0], aSums[k - 1][1], TILE >> (k - 1), aSums[k][nY % 2]);
                    Means(aSums[k][nY % 2], (TILE >> k) * 3, 2 * k, Target(k, nY));
                }
            }
        }
        for (unsigned int k = 1; k <= LEVELS; ++k)
        {
            if (((nTileRow + 1) & ((1u << k) - 1)) != 0)
                break;
            for (unsigned int n = 0; n < nAcross >> k; ++n)
                if (pwrite(nFile, aLevels[k].data() + n * TILE_BYTES, TILE_BYTES,
                           static_cast<off_t>(GetTileOffset(oScene, 1u << k, n, nTileRow >> k))) !=
                    static_cast<ssize_t>(TILE_BYTES))
                    throw std::runtime_error("short write");
        }
    }
    if (bSync)
        fdatasync(nFile);
    close(nFile);
    TIFFClose(poTiff);
}

} // namespace krv::benchmarks

#include "operations/picture/pngwriter.h"

#include "toolkit/exceptions/exceptions.h"

#include <png.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace krv::operations
{

namespace
{

constexpr int COLOUR_TYPES[] = {PNG_COLOR_TYPE_GRAY, PNG_COLOR_TYPE_GRAY_ALPHA, PNG_COLOR_TYPE_RGB,
                                PNG_COLOR_TYPE_RGB_ALPHA};

// The file under its temporary name: removed unless it was put in place.
class NewFile
{
public:
    explicit NewFile(const std::string& name) : moName(name), moPart(name + "." + std::to_string(getpid()) + ".part")
    {
        // Renaming would replace a device.
        struct stat oStatus = {};
        if (stat(name.c_str(), &oStatus) == 0 && !S_ISREG(oStatus.st_mode))
            throw krv::IOException(name, "it cannot be written: it is not a regular file");
        mpFile = std::fopen(moPart.c_str(), "wb");
        if (mpFile == nullptr && (errno == ENOENT || errno == ENOTDIR))
            throw krv::FileNotFoundException(name, "there is no folder to write it in");
        if (mpFile == nullptr)
            Fail("it cannot be written");
    }
    ~NewFile()
    {
        if (mpFile != nullptr)
            std::fclose(mpFile);
        if (!mbDone)
            std::remove(moPart.c_str());
    }
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    std::FILE* Get() const { return mpFile; }

    void PutInPlace()
    {
        std::FILE* const pFile = mpFile;
        mpFile = nullptr;
        if (std::fclose(pFile) != 0 || std::rename(moPart.c_str(), moName.c_str()) != 0)
            Fail("it cannot be written");
        mbDone = true;
    }

private:
    [[noreturn]] void Fail(const char* what) const
    {
        throw krv::IOException(moName, std::string(what) + ": " + std::strerror(errno));
    }

    std::string moName;
    std::string moPart;
    std::FILE* mpFile = nullptr;
    bool mbDone = false;
};

void IgnoreWarning(png_structp, png_const_charp) {}

// The caller tells what failed, by the system's error number.
[[noreturn]] void LeaveQuietly(png_structp pPng, png_const_charp)
{
    png_longjmp(pPng, 1);
}

struct PngWriteStruct
{
    png_structp mpPng = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, &LeaveQuietly, &IgnoreWarning);
    png_infop mpInfo = mpPng != nullptr ? png_create_info_struct(mpPng) : nullptr;

    PngWriteStruct() = default;
    PngWriteStruct(const PngWriteStruct&) = delete;
    PngWriteStruct& operator=(const PngWriteStruct&) = delete;
    ~PngWriteStruct() { png_destroy_write_struct(&mpPng, &mpInfo); }
};

// False when libpng gave up, which it does by a long jump: nothing with a destructor lives in this frame.
bool WriteRows(const PngWriteStruct& oPng, const Picture& oPicture, std::FILE* pFile)
{
    if (setjmp(png_jmpbuf(oPng.mpPng)) != 0)
        return false;
    png_init_io(oPng.mpPng, pFile);
    png_set_IHDR(oPng.mpPng, oPng.mpInfo, oPicture.width, oPicture.height, 8, COLOUR_TYPES[oPicture.samples - 1],
                 PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
    png_set_compression_level(oPng.mpPng, 4);
    png_write_info(oPng.mpPng, oPng.mpInfo);
    const std::size_t nPitch = static_cast<std::size_t>(oPicture.width) * oPicture.samples;
    for (unsigned int y = 0; y < oPicture.height; ++y)
        png_write_row(oPng.mpPng, oPicture.pixels.data() + y * nPitch);
    png_write_end(oPng.mpPng, oPng.mpInfo);
    return true;
}

} // namespace

void WritePng(const Picture& oPicture, const std::string& fileName)
{
    NewFile oFile(fileName);
    PngWriteStruct oPng;
    if (oPng.mpInfo == nullptr || !WriteRows(oPng, oPicture, oFile.Get()))
        throw krv::IOException(fileName, std::string("it cannot be written: ") + std::strerror(errno));
    oFile.PutInPlace();
}

} // namespace krv::operations

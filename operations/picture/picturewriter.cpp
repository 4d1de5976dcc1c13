#include "operations/picture/picturewriter.h"

#include "operations/job/exceptions.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstdio> // before jpeglib.h, which wants FILE

#include <jpeglib.h>
#include <png.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csetjmp>
#include <cstring>
#include <filesystem>
#include <memory>
#include <vector>

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

// The picture on its way into a file.
struct Writing
{
    const Picture& picture;
    std::FILE* file;
    const Progress& progress;

    std::size_t GetPitch() const { return static_cast<std::size_t>(picture.width) * picture.samples; }
    const std::uint8_t* GetRow(unsigned int y) const
    {
        Report(progress, {"picture", y * GetPitch(), picture.height * GetPitch()});
        return picture.pixels.data() + y * GetPitch();
    }
};

// False when libpng gave up, which it does by a long jump: nothing with a destructor lives in this frame.
bool WriteRows(const PngWriteStruct& oPng, const Writing& oWriting)
{
    if (setjmp(png_jmpbuf(oPng.mpPng)) != 0)
        return false;
    const Picture& oPicture = oWriting.picture;
    png_init_io(oPng.mpPng, oWriting.file);
    png_set_IHDR(oPng.mpPng, oPng.mpInfo, oPicture.width, oPicture.height, 8, COLOUR_TYPES[oPicture.samples - 1],
                 PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
    png_set_compression_level(oPng.mpPng, 4);
    png_write_info(oPng.mpPng, oPng.mpInfo);
    for (unsigned int y = 0; y < oPicture.height; ++y)
        png_write_row(oPng.mpPng, oWriting.GetRow(y));
    png_write_end(oPng.mpPng, oPng.mpInfo);
    return true;
}

bool WritePngRows(const Writing& oWriting)
{
    const PngWriteStruct oPng;
    return oPng.mpInfo != nullptr && WriteRows(oPng, oWriting);
}

struct JpegStruct
{
    jpeg_error_mgr moErrors{};
    std::jmp_buf moJump{};
    jpeg_compress_struct moJpeg{};

    JpegStruct()
    {
        moJpeg.err = jpeg_std_error(&moErrors);
        moErrors.error_exit = [](j_common_ptr pJpeg)
        {
            std::longjmp(static_cast<JpegStruct*>(pJpeg->client_data)->moJump, 1);
        };
        moErrors.output_message = [](j_common_ptr) {
        };
        moJpeg.client_data = this;
    }
    JpegStruct(const JpegStruct&) = delete;
    JpegStruct& operator=(const JpegStruct&) = delete;
    ~JpegStruct() { jpeg_destroy_compress(&moJpeg); }
};

// A row without its alpha, over white.
void Flatten(const std::uint8_t* pRow, const Picture& oPicture, std::vector<std::uint8_t>& oRow)
{
    const unsigned int nColours = oPicture.samples < 3 ? 1 : 3;
    for (std::size_t x = 0; x < oPicture.width; ++x)
    {
        const std::uint8_t* const pPixel = pRow + x * oPicture.samples;
        const unsigned int nAlpha = oPicture.samples % 2 == 0 ? pPixel[oPicture.samples - 1] : 255;
        for (unsigned int c = 0; c < nColours; ++c)
            oRow[x * nColours + c] = static_cast<std::uint8_t>((pPixel[c] * nAlpha + 255 * (255 - nAlpha) + 127) / 255);
    }
}

// False when libjpeg gave up by a long jump; what has a destructor lives with the caller.
bool WriteJpegRows(JpegStruct& oJpeg, std::vector<std::uint8_t>& oRow, const Writing& oWriting)
{
    constexpr int QUALITY = 90;
    const Picture& oPicture = oWriting.picture;
    if (setjmp(oJpeg.moJump) != 0)
        return false;
    jpeg_create_compress(&oJpeg.moJpeg);
    jpeg_stdio_dest(&oJpeg.moJpeg, oWriting.file);
    oJpeg.moJpeg.image_width = oPicture.width;
    oJpeg.moJpeg.image_height = oPicture.height;
    oJpeg.moJpeg.input_components = oPicture.samples < 3 ? 1 : 3;
    oJpeg.moJpeg.in_color_space = oPicture.samples < 3 ? JCS_GRAYSCALE : JCS_RGB;
    jpeg_set_defaults(&oJpeg.moJpeg);
    jpeg_set_quality(&oJpeg.moJpeg, QUALITY, TRUE);
    jpeg_start_compress(&oJpeg.moJpeg, TRUE);
    for (unsigned int y = 0; y < oPicture.height; ++y)
    {
        Flatten(oWriting.GetRow(y), oPicture, oRow);
        JSAMPROW pRow = oRow.data();
        jpeg_write_scanlines(&oJpeg.moJpeg, &pRow, 1);
    }
    jpeg_finish_compress(&oJpeg.moJpeg);
    return true;
}

bool WriteJpeg(const Writing& oWriting)
{
    JpegStruct oJpeg;
    std::vector<std::uint8_t> oRow(std::size_t{oWriting.picture.width} * 3);
    return WriteJpegRows(oJpeg, oRow, oWriting);
}

using RowWriter = bool (*)(const Writing&);

// What writes files of that name; null for names that say nothing known.
RowWriter KindOf(const std::string& fileName)
{
    const std::string extension = krv::ToUpper(std::filesystem::path(fileName).extension().string());
    if (extension == ".PNG")
        return &WritePngRows;
    return extension == ".JPG" || extension == ".JPEG" ? &WriteJpeg : nullptr;
}

void WriteBy(RowWriter pRows, const Writing& oWriting, const std::string& name)
{
    if (!pRows(oWriting))
        throw krv::IOException(name, std::string("it cannot be written: ") + std::strerror(errno));
}

} // namespace

void WritePng(const Picture& oPicture, const std::string& fileName, const Progress& oProgress)
{
    NewFile oFile(fileName);
    WriteBy(&WritePngRows, {oPicture, oFile.Get(), oProgress}, fileName);
    oFile.PutInPlace();
}

bool IsPictureName(const std::string& fileName)
{
    return fileName == "-" || KindOf(fileName) != nullptr;
}

void WritePicture(const Picture& oPicture, const std::string& fileName, const Progress& oProgress)
{
    if (fileName == "-")
    {
        WriteBy(&WritePngRows, {oPicture, stdout, oProgress}, "the standard output");
        if (std::fflush(stdout) != 0)
            throw krv::IOException("the standard output", std::string("it cannot be written: ") + std::strerror(errno));
        return;
    }
    const auto pRows = KindOf(fileName);
    if (pRows == nullptr)
        throw RequestException(fileName + ": pictures are written as .png or .jpg");
    NewFile oFile(fileName);
    WriteBy(pRows, {oPicture, oFile.Get(), oProgress}, fileName);
    oFile.PutInPlace();
}

} // namespace krv::operations

#pragma once

#include <cstring>
#include <string>

#include <openjpeg.h>

namespace krv::plugins::jp2
{

// What OpenJPEG has to say of a codec that fails. The first error counts; the others follow from it. Nothing is
// printed. Outlives the codec's use.
class Messages
{
public:
    void Watch(opj_codec_t* pCodec)
    {
        opj_set_error_handler(pCodec, &OnError, this);
        opj_set_warning_handler(pCodec, &Ignore, nullptr);
        opj_set_info_handler(pCodec, &Ignore, nullptr);
    }

    bool HasError() const { return moError[0] != '\0'; }
    std::string Get() const { return HasError() ? moError : "OpenJPEG does not say why"; }

private:
    static void OnError(const char* pText, void* pThis)
    {
        auto& oThis = *static_cast<Messages*>(pThis);
        if (oThis.HasError() || pText == nullptr)
            return;
        std::strncpy(oThis.moError, pText, sizeof(oThis.moError) - 1);
        oThis.moError[std::strcspn(oThis.moError, "\n")] = '\0';
    }

    static void Ignore(const char*, void*) {}

    char moError[256] = {};
};

} // namespace krv::plugins::jp2

// Any bytes as the texts beside an image: ".aux.xml", a world file, both texts of a sensor model. What is written is
// read as it was.
#include "plugins/support/sidecar/auxxml.h"
#include "plugins/support/sidecar/rpctext.h"
#include "plugins/support/sidecar/worldfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstdint>
#include <cstdlib>
#include <string>

using namespace krv::plugins::support;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    const std::string text(reinterpret_cast<const char*>(poBytes), nBytes);
    ParseWorldFile(text);
    for (const auto pParse : {&ParseRpcText, &ParseRpb})
        try
        {
            const std::string written = WriteRpcText(pParse(text, "x"));
            if (WriteRpcText(ParseRpcText(written, "x")) != written)
                std::abort();
        }
        catch (const krv::FileFormatException&)
        {
        }
    try
    {
        const AuxXml oFirst(text, "x", 3);
        const AuxXml oSecond(oFirst.Write(), "x", 3);
        if (oSecond.GetTags().GetFileMetadata() != oFirst.GetTags().GetFileMetadata() ||
            oSecond.GetGeocoding() != oFirst.GetGeocoding() || oSecond.GetCRS() != oFirst.GetCRS())
            std::abort();
    }
    catch (const krv::DataException&)
    {
    }
    return 0;
}

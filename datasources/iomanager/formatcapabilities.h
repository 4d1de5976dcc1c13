#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::datasources
{

// What a format's description file says that the format can do. An XPath that finds a node is a yes, whatever the node
// holds, and so is an empty element: a description leaves out what the format cannot do, intended. Every query reads
// the file again, so that an edited description counts at once.
// Any thread. Example: oManager.GetCapabilities("TIF").IsSupported(CAPABILITY_CREATE).
class KRV_DATASOURCES_API FormatCapabilities
{
public:
    // xmlPath: the description file; it is not opened here.
    // Programs get objects from the manager instead (DatasetManager::GetCapabilities).
    explicit FormatCapabilities(const std::string& xmlPath);
    FormatCapabilities(const FormatCapabilities& oOther);
    FormatCapabilities& operator=(const FormatCapabilities& oOther);
    ~FormatCapabilities();

    // Never throws: a file that is missing or broken supports nothing.
    bool IsSupported(const std::string& xpath) const;

    // The number in the node's text. No node, a text that is no unsigned 64-bit decimal number, or a file that is
    // missing or broken: 18446744073709551615, no limit. Never throws.
    // For limits such as the most channels of a format.
    unsigned long long GetLimit(const std::string& xpath) const;

private:
    void Copy(const FormatCapabilities& oOther);

    std::string moXmlPath;
};

// The queries that the library itself makes. "Georeferecing" is the spelling of the description files, intended.
inline constexpr char CAPABILITY_CREATE[] = "/Format/Capabilities/Dataset/SupportsCreate";
inline constexpr char CAPABILITY_METADATA[] = "/Format/Capabilities/Dataset/SupportsMetadata";
inline constexpr char CAPABILITY_GEOREFERENCING[] = "/Format/Capabilities/Dataset/SupportsGeoreferecing";
// The levels of a new file come with its pixels: they cannot be made apart, and are there when it is opened again.
inline constexpr char CAPABILITY_MAKES_LEVELS[] = "/Format/Capabilities/Dataset/MakesLevels";

// What a file of the format can get and lose after it was made; a file that is only read has none of it.
inline constexpr char CAPABILITY_BITMAP_CREATE[] = "/Format/Capabilities/Bitmap/CanCreate";
inline constexpr char CAPABILITY_BITMAP_DELETE[] = "/Format/Capabilities/Bitmap/CanDelete";
inline constexpr char CAPABILITY_CONTROL_POINT_CREATE[] = "/Format/Capabilities/ControlPoint/CanCreate";
inline constexpr char CAPABILITY_CONTROL_POINT_DELETE[] = "/Format/Capabilities/ControlPoint/CanDelete";

// Asked by krv convert: the option NBITS=n of a new file stores samples of n bits, less than their type has.
inline constexpr char CAPABILITY_UPDATE[] = "/Format/Capabilities/Dataset/SupportsUpdate";
inline constexpr char CAPABILITY_NARROW_SAMPLES[] = "/Format/Capabilities/Dataset/SupportsNarrowSamples";

} // namespace krv::datasources

#include "datasources/metadata/nodatavalue.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/detail/metadatakeys.h"
#include "datasources/reader/irasterreader.h"
#include "toolkit/exceptions/exceptions.h"

#include <boost/algorithm/string/trim.hpp>

#include <locale>
#include <sstream>

namespace
{

using krv::datasources::detail::NO_DATA_VALUE;

template <class Number>
bool Extract(const std::string& text, Number& nValue)
{
    std::istringstream oText(text);
    oText.imbue(std::locale::classic());
    oText >> nValue;
    return !oText.fail();
}

} // namespace

namespace krv::qrfutils
{

bool GetNoDataValue(const krv::datasources::IRasterReader& oReader, float& nValue, unsigned int nChannel)
{
    const krv::datasources::AuxiliaryData oMetadata = oReader.GetAuxiliaryData();
    std::string text = oMetadata.GetChanMetadataValue(NO_DATA_VALUE, nChannel);
    boost::algorithm::trim_right(text);
    boost::algorithm::trim_left(text);
    if (text.empty())
        text = oMetadata.GetFileMetadataValue(NO_DATA_VALUE);
    if (text.empty())
        return false;
    Extract(text, nValue);
    return true;
}

} // namespace krv::qrfutils

namespace krv::datasources
{

krv::gobs::IMaskBuilder* GetNoDataMaskBuilder(const AuxiliaryData& oMetadata, krv::gobs::BkgdRule eRule)
{
    const std::string fileText = oMetadata.GetFileMetadataValue(NO_DATA_VALUE);
    std::vector<unsigned int> oChannels;
    std::vector<double> oValues;
    for (unsigned int nChannel = 1; nChannel <= oMetadata.GetChannelCount(); ++nChannel)
    {
        std::string text = oMetadata.GetChanMetadataValue(NO_DATA_VALUE, nChannel);
        if (text.empty())
            text = fileText;
        if (text.empty())
            continue;
        oChannels.push_back(nChannel);
        double nValue = 0;
        if (!Extract(text, nValue))
            throw krv::Exception("Could not parse nodata value \"" + text + "\"", krv::Place::None());
        oValues.push_back(nValue);
    }
    const krv::gobs::MaskDecision oDecision(eRule, oValues, oChannels);
    return new krv::gobs::MaskDecisionBuilder(&oDecision);
}

} // namespace krv::datasources

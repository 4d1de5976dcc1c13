// Edits a file in place: a tag, a channel's description and no-data value, the reference system and the geocoding of a
// file that has lost them. Pixels stay as they are.
#include <krv/krv.h>

#include "toolkit/core/numbertext.h"

#include <exception>
#include <iostream>
#include <stdexcept>
#include <string>

int main(int nArguments, char** pArguments)
try
{
    const auto oNoData = krv::ParseNumber<double>(nArguments == 3 ? pArguments[2] : "");
    if (!oNoData)
        throw std::invalid_argument("usage: editmetadata FILE NO-DATA");
    // Opens no pixel; an image in a format that cannot be updated is refused here.
    const auto poWriter = krv::OpenWriter(pArguments[1]);

    // The record is a plain value: it is read, changed, and written as a whole.
    krv::AuxiliaryData oRecord = poWriter->GetAuxiliaryData();
    oRecord.SetFileMetadataValue("OPERATOR", "me");
    oRecord.SetChannelDescription("edited channel", 1);
    krv::SetNoData(oRecord, *oNoData, 1); // NaN and 64-bit integers are exact
    poWriter->SetAuxiliaryData(oRecord);

    if (!krv::GetCRS(*poWriter))
        poWriter->SetCRS(krv::CreateCRSFromEPSG(32719).get());
    const auto oPlace = krv::GetGeocoding(*poWriter);
    if (!oPlace || oPlace->IsIdentity()) // how a format says that it knows none
        poWriter->SetGeocodingInfo(krv::GeocodingInfo(500000, 10, 0, 7100000, 0, -10));
    poWriter->Synchronize(); // until here every reader sees the file as it was

    // Read again, as others see it now.
    const auto poReader = krv::OpenReader(pArguments[1], {1});
    const krv::AuxiliaryData oStored = poReader->GetAuxiliaryData();
    for (const auto& [key, value] : oStored.GetFileMetadata())
        std::cout << key << " = " << value << "\n";
    std::cout << oStored.GetChannelDescription(1) << ", no-data " << krv::GetNoData<double>(oStored, 1).value()
              << ", in " << krv::GetCRS(*poReader)->GetName() << "\n";
}
catch (const std::exception& oError)
{
    std::cerr << "editmetadata: " << oError.what() << "\n";
    return 1;
}

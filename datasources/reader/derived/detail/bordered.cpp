#include "datasources/reader/derived/detail/bordered.h"

#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

#include <algorithm>

namespace krv::datasources::detail
{

// The validity of a reader as one 8-bit channel: 1 where it is valid.
class Bordered::ValidityChannel : public DerivedReader
{
public:
    explicit ValidityChannel(IRasterReader& oReader) : moValidity(oReader) { SetSource({&oReader, {false}}); }

    unsigned int GetChansCount() const override { return 1; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }
    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override
    {
        const IRasterReader& oSource = GetSource();
        krv::gobs::Raster oPixels(
            {poRaster->GetWidth(), poRaster->GetHeight(), oSource.GetChansCount(), oSource.GetDataType()},
            poRaster->GetContext());
        const auto poMask = moValidity.Read(oPixels);
        if (poMask != nullptr)
            poMask->RetrieveRaster(*poRaster);
        else
            std::fill_n(poRaster->GetBuffer(), poRaster->GetBufferSize(), static_cast<unsigned char>(1));
    }

private:
    krv::gobs::DataType moType = krv::gobs::eDT_8U;
    ReaderValidity moValidity;
};

Bordered::Bordered(IRasterReader& oReader) : moReader(oReader), moPixels(&oReader, false) {}

Bordered::~Bordered() = default;

bool Bordered::IsInside(const IRasterReader& oReader, const krv::gobs::Raster& oRaster)
{
    const auto IsIn = [](int nPosition, unsigned int nMargin, std::uint64_t nCount, unsigned int nLength)
    {
        const std::int64_t nBegin = std::int64_t{nPosition} - nMargin;
        return nBegin >= 0 && nBegin + static_cast<std::int64_t>(nCount) <= nLength;
    };
    return IsIn(oRaster.GetX(), oRaster.GetXMargin(), oRaster.GetFullWidth(), oReader.GetWidth()) &&
           IsIn(oRaster.GetY(), oRaster.GetYMargin(), oRaster.GetFullHeight(), oReader.GetHeight());
}

void Bordered::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    moPixels.SetMargins(nXMargin, nYMargin, eBehaviour);
}

void Bordered::Read(krv::gobs::Raster& oRaster)
{
    moPixels.ReadRaster(&oRaster);
}

std::unique_ptr<krv::gobs::Mask> Bordered::ReadValid(krv::gobs::Raster& oRaster)
{
    if (mpoValidity == nullptr)
    {
        mpoChannel = std::make_unique<ValidityChannel>(moReader);
        mpoValidity = std::make_unique<ExactHaloReader>(mpoChannel.get(), false);
    }
    // What is not made of pixels is not valid.
    const eMarginBehaviour eBehaviour = moPixels.GetMarginBehaviour();
    mpoValidity->SetMargins(0, 0, eBehaviour == eNoData ? eConstant : eBehaviour);
    Read(oRaster);
    krv::gobs::Raster oValid({oRaster.GetWidth(), oRaster.GetHeight(), 1, krv::gobs::eDT_8U}, oRaster.GetContext());
    mpoValidity->ReadRaster(&oValid);
    return std::make_unique<krv::gobs::Mask>(oValid.GetInfo(), oValid.GetContext(), oValid.GetBuffer(), false);
}

} // namespace krv::datasources::detail
